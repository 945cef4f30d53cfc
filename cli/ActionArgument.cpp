#include "cli/ActionArgument.h"

#include <cerrno>

#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/Paths.h"

namespace droxa {

namespace {

// The root, and what the root shows as folders of its own: each lies beside the others in the replica.
bool isContainer(CommandContext &context, const NSFileProviderItemFields &item) {
  if (item.kind != NSFileProviderItemKind::folder) return false;
  const NSURL url = context.host->url(item.itemIdentifier).value;
  const NSURL replica = NSURL::fileURLWithPath(DroxaProcessHome().replica());
  return url && url.URLByDeletingLastPathComponent().URLByDeletingLastPathComponent() == replica;
}

}  // namespace

ControlClient::Item resolveForAction(CommandContext &context, const std::string &argument, int *exitStatus) {
  const auto found = resolveItem(*context.host, argument);
  if (!found.value) {
    const NSError missing = fileProviderErrorForNonExistentItemWithIdentifier(argument);
    *exitStatus = reportError(context, argument, found.error ? found.error : missing);
  }
  return found.value;
}

ControlClient::Item resolveMovable(CommandContext &context, const std::string &argument, int *exitStatus) {
  auto item = resolveForAction(context, argument, exitStatus);
  if (!item || !isContainer(context, item->fields())) return item;
  context.err << "droxa: " << escapedText(argument)
              << ": it is one of the drive's own folders, which have to stay; name what is in it"
              << std::endl;
  *exitStatus = kExitFailure;
  return nullptr;
}

CallResult<std::string> resolveFolder(CommandContext &context, const std::string &argument) {
  const auto found = resolveContainer(*context.host, argument);
  if (found.error) return {{}, found.error};
  const auto &item = found.value.item;
  if (item && item->fields().kind != NSFileProviderItemKind::folder) {
    return {
        {},
        NSError::errorWithPOSIXCode(ENOTDIR, "it is a " + kindText(item->fields().kind) + ", not a folder")};
  }
  return {found.value.identifier, NSError()};
}

NewPlace newPlaceOf(const std::string &path) {
  std::string trimmed = path;
  while (!trimmed.empty() && trimmed.back() == '/') trimmed.pop_back();
  const std::size_t slash = trimmed.rfind('/');
  if (slash == std::string::npos) return {"/", trimmed};
  return {slash == 0 ? "/" : trimmed.substr(0, slash), trimmed.substr(slash + 1)};
}

int forEachArgument(CommandContext &context, const std::vector<std::string> &arguments,
                    const std::function<int(const std::string &argument)> &command) {
  int first = kExitSuccess;
  for (const std::string &argument : arguments) {
    const int status = command(argument);
    if (status == kExitInterrupted || !context.out.good()) return status;
    if (first == kExitSuccess) first = status;
  }
  return first;
}

}  // namespace droxa
