#include "cli/Commands.h"
#include "cli/ContentsText.h"
#include "cli/DownloadProgress.h"
#include "cli/ExitStatus.h"
#include "cli/Materialising.h"
#include "cli/Text.h"

namespace droxa {

namespace {

// What there is to fetch; of a document 0 or 1.
std::uint64_t missing(const ContentsArgument &contents, const QVContentsStatus &status) {
  if (contents.isFolder) return status.dataless;
  return status.contents == QVContentsState::present ? 0 : 1;
}

void printEnd(CommandContext &context, const ContentsArgument &contents, const QVContentsStatus &before,
              const QVContentsStatus &after) {
  context.out << escapedText(contents.argument) << ": ";
  if (missing(contents, before) == 0)
    context.out << "here already";
  else if (contents.isFolder)
    context.out << countText(before.dataless - std::min(before.dataless, after.dataless), "document")
                << " fetched";
  else
    context.out << "fetched";
  context.out << ", " << bytesText(after.size) << std::endl;
}

int download(CommandContext &context, const ContentsArgument &contents, bool json) {
  const auto before = contentsStatus(context, contents);
  if (before.error) return reportError(context, contents.argument, before.error);
  DownloadProgress progress(context, contents, before.value, json);
  if (missing(contents, before.value) > 0) progress.show(before.value);
  const Materialised end =
      materialise(context, contents,
                  {true, true, [&progress](const QVContentsStatus &status) { progress.show(status); }});
  progress.clear();
  if (end.wasStopped) {
    if (json) context.out << contentsJSON(contents, before.value, "cancelled") << std::endl;
    context.err << "droxa: " << escapedText(contents.argument)
                << ": cancelled; documents that are here stay, and the same command goes on" << std::endl;
    return kExitInterrupted;
  }
  const auto after = contentsStatus(context, contents);
  const QVContentsStatus &status = after.error ? before.value : after.value;
  if (end.error) {
    if (json) context.out << contentsJSON(contents, status, "failed") << std::endl;
    const int exitStatus = reportError(context, contents.argument, end.error);
    if (contents.isFolder)
      context.err << "droxa: " << escapedText(contents.argument) << ": "
                  << countText(missing(contents, status), "document") << " of " << status.documents
                  << (missing(contents, status) == 1 ? " isn't here" : " aren't here") << std::endl;
    return exitStatus;
  }
  if (json) {
    context.out << contentsJSON(contents, status, "done") << std::endl;
  } else {
    printEnd(context, contents, before.value, status);
  }
  return kExitSuccess;
}

}  // namespace

int runDownload(CommandContext &context, const std::vector<std::string> &arguments, bool json) {
  return forEachContents(context, arguments,
                         [&](const ContentsArgument &contents) { return download(context, contents, json); });
}

}  // namespace droxa
