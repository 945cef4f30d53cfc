#include "cli/ContentsText.h"

#include <array>
#include <cstdio>
#include <nlohmann/json.hpp>

#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

namespace {

using Json = nlohmann::ordered_json;

constexpr std::size_t kLabelWidth = 15;

std::string line(const char *label, const std::string &text) {
  std::string start = label;
  start.resize(kLabelWidth, ' ');
  return start + text + "\n";
}

const char *contentsWord(QVContentsState state) {
  switch (state) {
    case QVContentsState::present:
      return "present";
    case QVContentsState::dataless:
      return "dataless";
    case QVContentsState::downloading:
      return "downloading";
  }
  return "present";
}

const char *uploadWord(QVUploadState state) {
  switch (state) {
    case QVUploadState::local:
      return "local";
    case QVUploadState::queued:
      return "queued";
    case QVUploadState::uploading:
      return "uploading";
    case QVUploadState::inCloud:
      return "inCloud";
    case QVUploadState::failed:
      return "failed";
  }
  return "local";
}

std::string progressText(const QVContentsStatus &status) {
  return bytesText(status.transferred) + " of " + bytesText(status.size) + " (" +
         shareText(status.transferred, status.size) + ")";
}

std::string documentContents(const QVContentsStatus &status) {
  switch (status.contents) {
    case QVContentsState::dataless:
      return "dataless: " + bytesText(status.size) + " in the cloud alone";
    case QVContentsState::downloading:
      return "downloading: " + progressText(status);
    case QVContentsState::present:
      break;
  }
  return "present: " + bytesText(status.size);
}

std::string uploadText(const QVContentsStatus &status) {
  switch (status.upload) {
    case QVUploadState::local:
      return "local: kept on this machine alone";
    case QVUploadState::queued:
      return "queued: the cloud doesn't have it yet";
    case QVUploadState::uploading:
      return "uploading: " + progressText(status);
    case QVUploadState::failed:
      return "failed: tried again later";
    case QVUploadState::inCloud:
      break;
  }
  return "in the cloud";
}

std::string folderContents(const QVContentsStatus &status) {
  std::string text = countText(status.documents, "document") + ", " + bytesText(status.size);
  if (status.dataless > 0) text += "; " + std::to_string(status.dataless) + " in the cloud alone";
  if (status.unsent > 0) text += "; " + std::to_string(status.unsent) + " not yet in the cloud";
  if (status.failed > 0) text += "; " + std::to_string(status.failed) + " failed";
  return text;
}

std::string countsText(const QVTransferCounts &counts) {
  std::string text =
      std::to_string(counts.active) + " in flight, " + std::to_string(counts.queued) + " queued";
  if (counts.bytesLeft > 0) text += " (" + bytesText(counts.bytesLeft) + " left)";
  if (counts.bytesPerSecond > 0) text += ", " + bytesText(counts.bytesPerSecond) + "/s";
  return text + "; " + std::to_string(counts.done) + " done (" + bytesText(counts.bytesDone) + "), " +
         std::to_string(counts.failed) + " failed";
}

Json countsJSON(const QVTransferCounts &counts) {
  return {{"active", counts.active},
          {"queued", counts.queued},
          {"done", counts.done},
          {"failed", counts.failed},
          {"bytesDone", counts.bytesDone},
          {"bytesLeft", counts.bytesLeft},
          {"bytesPerSecond", counts.bytesPerSecond}};
}

std::string dumped(const Json &json) {
  return json.dump(-1, ' ', false, Json::error_handler_t::replace);
}

}  // namespace

std::string bytesText(std::uint64_t bytes) {
  static constexpr std::array<const char *, 6> kUnits{"kB", "MB", "GB", "TB", "PB", "EB"};
  if (bytes < 1000) return countText(bytes, "byte");
  double number = static_cast<double>(bytes) / 1000;
  std::size_t unit = 0;
  for (; number >= 999.5 && unit + 1 < kUnits.size(); ++unit) number /= 1000;
  std::array<char, 32> text{};
  // NOLINTNEXTLINE(cert-err33-c): it fits
  std::snprintf(text.data(), text.size(), number < 9.95 ? "%.1f %s" : "%.0f %s", number, kUnits.at(unit));
  return text.data();
}

std::string shareText(std::uint64_t part, std::uint64_t whole) {
  if (whole == 0) return "100%";
  const double share = static_cast<double>(part) / static_cast<double>(whole);
  return std::to_string(static_cast<int>(std::min(share, 1.0) * 100)) + "%";
}

std::string contentsLines(const ContentsArgument &contents, const QVContentsStatus &status) {
  std::string text = escapedText(contents.argument) + "\n";
  if (contents.isFolder) {
    text += line("  documents:", folderContents(status));
  } else {
    text += line("  contents:", documentContents(status)) + line("  upload:", uploadText(status));
    if (!status.checksum.empty()) text += line("  checksum:", status.checksum);
  }
  text += line("  pinned:", status.isPinned ? "yes" : "no");
  if (status.error) text += line("  error:", escapedText(explanationOfError(status.error)));
  return text;
}

std::string contentsJSON(const ContentsArgument &contents, const QVContentsStatus &status,
                         const std::string &state) {
  Json json;
  json["path"] = contents.argument;
  json["identifier"] = contents.identifier;
  json["kind"] = contents.isFolder ? "folder" : "document";
  if (!state.empty()) json["state"] = state;
  json["contents"] = contentsWord(status.contents);
  json["upload"] = uploadWord(status.upload);
  json["pinned"] = status.isPinned;
  json["size"] = status.size;
  json["transferred"] = status.transferred;
  json["checksum"] = status.checksum.empty() ? Json(nullptr) : Json(status.checksum);
  json["error"] = status.error ? Json(explanationOfError(status.error)) : Json(nullptr);
  if (contents.isFolder) {
    json["documents"] = status.documents;
    json["dataless"] = status.dataless;
    json["unsent"] = status.unsent;
    json["failed"] = status.failed;
  }
  return dumped(json);
}

std::string transferLines(const QVTransferStatus &status) {
  std::string cloud = escapedText(status.cloud.empty() ? "none yet" : status.cloud);
  if (!status.isCloudReachable) cloud += "; can't be reached: " + escapedText(status.cloudProblem);
  std::string text = line("cloud", cloud) + line("downloads", countsText(status.downloads)) +
                     line("uploads", countsText(status.uploads));
  if (status.heldDeletions > 0)
    text += line("deletions", std::to_string(status.heldDeletions) +
                                  " held: many at once may be an accident; `droxa deletions` answers them");
  if (status.conflicts > 0)
    text += line("conflicts", std::to_string(status.conflicts) +
                                  (status.conflicts == 1 ? " conflict copy" : " conflict copies") +
                                  " made since keld started; `droxa ls` shows them beside the documents");
  return text;
}

std::string transferJSON(const QVTransferStatus &status) {
  Json json;
  json["cloud"] = status.cloud;
  json["reachable"] = status.isCloudReachable;
  json["problem"] = status.isCloudReachable ? Json(nullptr) : Json(status.cloudProblem);
  json["downloads"] = countsJSON(status.downloads);
  json["uploads"] = countsJSON(status.uploads);
  json["heldDeletions"] = status.heldDeletions;
  json["conflicts"] = status.conflicts;
  return dumped(json);
}

}  // namespace droxa
