#include "cli/Commands.h"
#include "cli/ContentsText.h"
#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/Text.h"

namespace droxa {

namespace {

int pin(CommandContext &context, const ContentsArgument &contents, bool isPinned, bool json) {
  DaemonClient daemon(context.daemon, context.timeout);
  for (const NSURL &url : contents.urls)
    if (const NSError error = daemon.setPinned(url, isPinned))
      return reportError(context, contents.argument, error);
  const auto status = contentsStatus(context, contents);
  if (status.error) return reportError(context, contents.argument, status.error);
  if (json) context.out << contentsJSON(contents, status.value) << std::endl;
  if (!isPinned && status.value.isPinned) {
    context.err << "droxa: " << escapedText(contents.argument)
                << ": it is still pinned by a folder that it is in; unpin that one" << std::endl;
    return kExitFailure;
  }
  if (json) return kExitSuccess;
  context.out << escapedText(contents.argument) << ": " << (isPinned ? "pinned" : "unpinned");
  const bool isMissing = status.value.contents != QVContentsState::present;
  if (isPinned && isMissing) {
    context.out << "; "
                << (contents.isFolder ? countText(status.value.dataless, "document") : std::string("it"))
                << " will be fetched, which `droxa download` waits for";
  }
  context.out << std::endl;
  return kExitSuccess;
}

}  // namespace

int runPin(CommandContext &context, const std::vector<std::string> &arguments, bool isPinned, bool json) {
  return forEachContents(context, arguments, [&](const ContentsArgument &contents) {
    return pin(context, contents, isPinned, json);
  });
}

}  // namespace droxa
