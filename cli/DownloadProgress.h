#pragma once

#include <cstdint>

#include "cli/ContentsArgument.h"
#include "cli/ProgressLine.h"

namespace droxa {

// Shows how far a download is: a bar in one line on a terminal, a line a second elsewhere, or JSON objects.
// Thread contract: one thread.
class DownloadProgress {
 public:
  // `before`: what there was to fetch.
  DownloadProgress(CommandContext &context, const ContentsArgument &contents, const QVContentsStatus &before,
                   bool json);
  void show(const QVContentsStatus &status);
  void clear();  // removes the bar

 private:
  std::string text(const QVContentsStatus &status) const;
  double share(const QVContentsStatus &status) const;

  CommandContext &context_;
  const ContentsArgument &contents_;
  const std::uint64_t wanted_;  // documents
  const bool json_;
  ProgressLine line_;
};

}  // namespace droxa
