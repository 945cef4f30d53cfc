#include "cli/ContentsArgument.h"

#include <algorithm>

#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVContainer.h"

namespace droxa {

namespace {

// From the least safe to the safest.
int dangerOf(QVUploadState state) {
  switch (state) {
    case QVUploadState::failed:
      return 4;
    case QVUploadState::queued:
      return 3;
    case QVUploadState::uploading:
      return 2;
    case QVUploadState::local:
      return 1;
    case QVUploadState::inCloud:
      break;
  }
  return 0;
}

void addTo(QVContentsStatus &sum, const QVContentsStatus &part) {
  sum.isPinned = sum.isPinned && part.isPinned;
  sum.size += part.size;
  sum.transferred += part.transferred;
  sum.documents += part.documents;
  sum.dataless += part.dataless;
  sum.unsent += part.unsent;
  sum.failed += part.failed;
  if (!sum.error) sum.error = part.error;
  if (dangerOf(part.upload) > dangerOf(sum.upload)) sum.upload = part.upload;
  if (sum.contents != QVContentsState::downloading && part.contents != QVContentsState::present)
    sum.contents = part.contents;
}

CallResult<std::vector<NSURL>> urlsOf(CommandContext &context, const std::string &identifier) {
  const auto own = context.host->url(identifier);
  if (own.error) return {{}, own.error};
  if (!own.value) {
    // The answer doesn't say why there is none; the item's does.
    const NSError reason = context.host->item(identifier).error;
    return {{}, reason ? reason : fileProviderErrorForNonExistentItemWithIdentifier(identifier)};
  }
  std::vector<NSURL> urls{own.value};
  if (identifier != NSFileProviderRootContainerItemIdentifier) return {urls, NSError()};
  const auto containers = DaemonClient(context.daemon, context.timeout).containers();
  if (containers.error) return {{}, containers.error};
  for (const QVContainerDescription &container : containers.value) {
    if (container.containerID != QVUbiquitousDefaultContainerID &&
        container.containerID != QVUbiquitousTrashContainerID)
      urls.push_back(container.documentsURL);
  }
  return {urls, NSError()};
}

}  // namespace

std::optional<ContentsArgument> resolveContents(CommandContext &context, const std::string &argument,
                                                int *exitStatus) {
  const auto found = resolveContainer(*context.host, argument);
  if (found.error) {
    *exitStatus = reportError(context, argument, found.error);
    return std::nullopt;
  }
  ContentsArgument contents{argument.empty() ? "/" : argument, found.value.identifier, true, {}};
  if (const auto &item = found.value.item) {
    const NSFileProviderItemKind kind = item->fields().kind;
    contents.isFolder = kind == NSFileProviderItemKind::folder;
    if (!contents.isFolder && kind != NSFileProviderItemKind::document) {
      context.err << "droxa: " << escapedText(argument) << ": it is a " << kindText(kind)
                  << ", which has no contents of its own; name the document that it leads to" << std::endl;
      *exitStatus = kExitFailure;
      return std::nullopt;
    }
  }
  auto urls = urlsOf(context, contents.identifier);
  if (urls.error) {
    *exitStatus = reportError(context, argument, urls.error);
    return std::nullopt;
  }
  contents.urls = std::move(urls.value);
  return contents;
}

int forEachContents(CommandContext &context, const std::vector<std::string> &arguments,
                    const std::function<int(const ContentsArgument &)> &command) {
  int first = kExitSuccess;
  for (const std::string &argument : arguments) {
    int status = kExitSuccess;
    if (const auto contents = resolveContents(context, argument, &status)) status = command(*contents);
    if (status == kExitInterrupted || !context.out.good()) return status;
    if (first == kExitSuccess) first = status;
  }
  return first;
}

CallResult<QVContentsStatus> contentsStatus(CommandContext &context, const ContentsArgument &contents,
                                            std::optional<std::chrono::milliseconds> patience) {
  DaemonClient daemon(context.daemon, patience.value_or(context.timeout));
  CallResult<QVContentsStatus> sum;
  for (std::size_t index = 0; index < contents.urls.size(); ++index) {
    const auto part = daemon.contentsStatus(contents.urls[index]);
    if (part.error) return part;
    if (index == 0)
      sum = part;
    else
      addTo(sum.value, part.value);
  }
  return sum;
}

}  // namespace droxa
