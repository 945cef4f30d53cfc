#include <string_view>

#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {

using Kind = FPDActionRequest::Kind;

// Where the items go.
struct Destination {
  std::string folder;               // an identifier
  std::optional<std::string> name;  // of the one item that gets a new one
};

// The trash itself, however it is written. What goes there is to be found again, so that it is trashed, not
// moved.
bool isTrash(std::string_view path) {
  while (path.starts_with('/')) path.remove_prefix(1);
  while (path.ends_with('/')) path.remove_suffix(1);
  return path == ".Trash";
}

int refuse(CommandContext &context, const std::string &asked, const std::string &why) {
  context.err << "droxa: " << escapedText(asked) << ": " << why << std::endl;
  return kExitFailure;
}

// A folder that there is, or for a single item also a new name in one.
std::optional<Destination> destinationOf(CommandContext &context, const std::string &path, bool isForOne,
                                         int *exitStatus) {
  const auto found = resolveContainer(*context.host, path);
  const bool isNew = found.error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
  if (!found.error) {
    const auto &item = found.value.item;
    if (!item || item->fields().kind == NSFileProviderItemKind::folder) {
      return Destination{found.value.identifier, std::nullopt};
    }
    *exitStatus = refuse(context, path,
                         "it is a " + kindText(item->fields().kind) + ", not a folder, and nothing is " +
                             "overwritten; choose another name");
    return std::nullopt;
  }
  if (!isNew || !isForOne || path.ends_with('/')) {
    *exitStatus = reportError(context, path, found.error);
    return std::nullopt;
  }
  const NewPlace place = newPlaceOf(path);
  const auto parent = resolveFolder(context, place.folder);
  if (parent.error) {
    *exitStatus = reportError(context, place.folder, parent.error);
    return std::nullopt;
  }
  return Destination{parent.value, place.name};
}

int move(CommandContext &context, const std::string &argument, const Destination &destination, bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveMovable(context, argument, &exitStatus);
  if (!item) return exitStatus;
  const bool isThere = item->fields().parentItemIdentifier == destination.folder;
  if (isThere && !destination.name) return refuse(context, argument, "it is in that folder already");
  FPDActionRequest request;
  // In its own folder a folder can only be renamed: a move would be into itself. Renaming an alias is
  // renaming its target.
  const bool isRename = isThere && item->fields().kind != NSFileProviderItemKind::alias;
  request.kind = isRename ? Kind::rename : Kind::reparent;
  request.identifier = item->itemIdentifier();
  if (!isRename) request.parentIdentifier = destination.folder;
  request.name = destination.name;
  const auto patience = json ? ActionPatience::untilStopped : ActionPatience::showingProgress;
  return reportAction(context, argument, request, act(context, argument, request, patience), json);
}

}  // namespace

int runMv(CommandContext &context, const std::vector<std::string> &arguments, const std::string &destination,
          bool json) {
  if (isTrash(destination)) return runTrash(context, arguments, json);
  int exitStatus = kExitSuccess;
  const auto to = destinationOf(context, destination, arguments.size() == 1, &exitStatus);
  if (!to) return exitStatus;
  return forEachArgument(context, arguments,
                         [&](const std::string &argument) { return move(context, argument, *to, json); });
}

int runRename(CommandContext &context, const std::string &argument, const std::string &name, bool json) {
  if (name.find('/') != std::string::npos) {
    return refuse(context, name, "a name has no '/'; `droxa mv` moves an item to another folder");
  }
  int exitStatus = kExitSuccess;
  const auto item = resolveMovable(context, argument, &exitStatus);
  if (!item) return exitStatus;
  FPDActionRequest request;
  request.kind = Kind::rename;
  request.identifier = item->itemIdentifier();
  request.name = name;
  return actAndReport(context, argument, request, json);
}

}  // namespace droxa
