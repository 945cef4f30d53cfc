#include "keld/contents/PromiseFile.h"

#include <algorithm>
#include <charconv>

#include "keld/contents/ContentsDigest.h"
#include "keld/contents/FileSteps.h"

namespace droxa::keld {

namespace {

constexpr std::string_view kPrefix = ".";
constexpr std::string_view kSuffix = ".droxafault";
constexpr char kFirstLine[] = "droxa promise 1\n";
constexpr std::size_t kMostNameBytes = 255;
constexpr std::size_t kMostPromiseBytes = 4096;
constexpr std::size_t kHashDigits = 16;
constexpr std::size_t kRoom = kMostNameBytes - kPrefix.size() - kSuffix.size();
// Between the beginning of a shortened name and its hash.
constexpr char kShortened = '~';

bool isDocumentName(std::string_view name) {
  return !name.empty() && name.size() <= kMostNameBytes && name != "." && name != ".." &&
         name.find('/') == std::string_view::npos && name.find('\0') == std::string_view::npos;
}

// The name without prefix and suffix, shortened or not; empty when it isn't a promise's.
std::string_view middleOf(std::string_view name) {
  if (name.size() <= kPrefix.size() + kSuffix.size() || name.size() > kMostNameBytes) return {};
  if (name.substr(0, kPrefix.size()) != kPrefix || name.substr(name.size() - kSuffix.size()) != kSuffix)
    return {};
  return name.substr(kPrefix.size(), name.size() - kPrefix.size() - kSuffix.size());
}

bool isShortened(std::string_view middle) {
  if (middle.size() <= kHashDigits || middle[middle.size() - kHashDigits - 1] != kShortened) return false;
  return middle.find_first_not_of("0123456789abcdef", middle.size() - kHashDigits) == std::string_view::npos;
}

std::string shortened(std::string_view name) {
  std::size_t length = std::min(name.size(), kRoom - kHashDigits - 1);
  // Not within a character: what follows the cut would begin with a continuation byte.
  while (length > 0 && length < name.size() && (static_cast<unsigned char>(name[length]) & 0xc0) == 0x80)
    --length;
  return std::string(name.substr(0, length)) + kShortened + ContentsDigest::of(name).substr(0, kHashDigits);
}

bool takeNumberLine(std::string_view *rest, std::int64_t *number) {
  const std::size_t end = rest->find('\n');
  if (end == std::string_view::npos) return false;
  const auto [stop, error] = std::from_chars(rest->data(), rest->data() + end, *number);
  if (error != std::errc() || stop != rest->data() + end) return false;
  rest->remove_prefix(end + 1);
  return true;
}

}  // namespace

bool IsPromiseName(std::string_view name) {
  return !middleOf(name).empty();
}

std::string PromiseNameFor(std::string_view documentName) {
  // A document that is called like a shortened name is treated as one, so that its promise's name is its own.
  const bool fits = documentName.size() <= kRoom && !isShortened(documentName);
  std::string name(kPrefix);
  name += fits ? std::string(documentName) : shortened(documentName);
  name += kSuffix;
  return name;
}

std::optional<std::string> NameOfPromise(std::string_view promiseName) {
  const std::string_view middle = middleOf(promiseName);
  if (!isDocumentName(middle) || isShortened(middle)) return std::nullopt;
  return std::string(middle);
}

// The marker's line can't hold a line break, and the name comes last, so that it may hold anything.
std::string EncodePromise(const PromiseFile &promise) {
  return kFirstLine + std::to_string(promise.mode) + '\n' + std::to_string(promise.modified) + '\n' +
         EncodeMarker(promise.marker) + '\n' + promise.name;
}

std::optional<PromiseFile> ParsePromise(std::string_view bytes) {
  std::string_view rest = bytes;
  if (rest.substr(0, sizeof kFirstLine - 1) != kFirstLine) return std::nullopt;
  rest.remove_prefix(sizeof kFirstLine - 1);
  PromiseFile promise;
  std::int64_t mode = 0;
  if (!takeNumberLine(&rest, &mode) || mode < 0 || mode > 07777) return std::nullopt;
  if (!takeNumberLine(&rest, &promise.modified)) return std::nullopt;
  promise.mode = static_cast<std::uint32_t>(mode);
  const std::size_t end = rest.find('\n');
  if (end == std::string_view::npos) return std::nullopt;
  const auto marker = ParseMarker(rest.substr(0, end));
  if (!marker || marker->state != MarkerState::dataless) return std::nullopt;
  promise.marker = *marker;
  promise.name = rest.substr(end + 1);
  if (!isDocumentName(promise.name) || EncodePromise(promise) != bytes) return std::nullopt;
  return promise;
}

std::optional<PromiseFile> ReadPromise(int folder, const std::string &promiseName) {
  std::string bytes;
  if (ReadSmallFile(folder, promiseName, kMostPromiseBytes, &bytes) != 0) return std::nullopt;
  auto promise = ParsePromise(bytes);
  if (!promise) return std::nullopt;
  // Who renames a document that isn't here renames its promise.
  if (const auto name = NameOfPromise(promiseName)) promise->name = *name;
  if (PromiseNameFor(promise->name) != promiseName) return std::nullopt;
  return promise;
}

}  // namespace droxa::keld
