#include "cli/DownloadProgress.h"

#include <algorithm>

#include "cli/ContentsText.h"
#include "cli/Text.h"

namespace droxa {

DownloadProgress::DownloadProgress(CommandContext &context, const ContentsArgument &contents,
                                   const QVContentsStatus &before, bool json)
    : context_(context),
      contents_(contents),
      wanted_(before.dataless),
      json_(json),
      line_(context, contents.argument) {}

void DownloadProgress::show(const QVContentsStatus &status) {
  if (json_) {
    context_.out << contentsJSON(contents_, status, "downloading") << std::endl;
  } else {
    line_.show(share(status), text(status));
  }
}

void DownloadProgress::clear() {
  line_.clear();
}

std::string DownloadProgress::text(const QVContentsStatus &status) const {
  if (!contents_.isFolder) {
    return bytesText(status.transferred) + " of " + bytesText(status.size) + " (" +
           shareText(status.transferred, status.size) + ")";
  }
  const std::uint64_t fetched = wanted_ - std::min(wanted_, status.dataless);
  std::string text = std::to_string(fetched) + " of " + countText(wanted_, "document");
  if (status.transferred > 0) text += ", " + bytesText(status.transferred) + " of those under way";
  return text;
}

double DownloadProgress::share(const QVContentsStatus &status) const {
  const auto ratio = [](std::uint64_t part, std::uint64_t whole) {
    return whole == 0 ? 0.0 : std::min(1.0, static_cast<double>(part) / static_cast<double>(whole));
  };
  if (!contents_.isFolder) return ratio(status.transferred, status.size);
  return ratio(wanted_ - std::min(wanted_, status.dataless), wanted_);
}

}  // namespace droxa
