#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ItemText.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {

bool isMissing(const NSError &error) {
  return error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
}

// Always a path: something new has no identifier.
std::string asPath(const std::string &argument) {
  return argument.find('/') == std::string::npos ? "./" + argument : argument;
}

FPDActionRequest creation(const std::string &parent, const std::string &name) {
  FPDActionRequest request;
  request.kind = FPDActionRequest::Kind::createDirectory;
  request.parentIdentifier = parent;
  request.name = name;
  return request;
}

int makeFolder(CommandContext &context, const std::string &path, bool json) {
  const NewPlace place = newPlaceOf(asPath(path));
  const auto parent = resolveFolder(context, place.folder);
  if (parent.error) return reportError(context, place.folder, parent.error);
  return actAndReport(context, path, creation(parent.value, place.name), json);
}

// The identifier of the folder at `path`, which is made with those above it where there are none. Each that
// is made is printed.
CallResult<std::string> makeFolders(CommandContext &context, const std::string &path, bool json,
                                    int *exitStatus) {
  auto found = resolveFolder(context, path);
  const NewPlace place = newPlaceOf(path);
  if (!isMissing(found.error) || place.name.empty()) {
    if (found.error) *exitStatus = reportError(context, path, found.error);
    return found;
  }
  const auto parent = makeFolders(context, place.folder, json, exitStatus);
  if (parent.error) return parent;
  const FPDActionRequest request = creation(parent.value, place.name);
  const ActionEnd end = act(context, path, request);
  if (end.error.is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision)) {
    // Somebody was quicker, or what is there is no folder.
    found = resolveFolder(context, path);
    if (!found.error) return found;
  }
  *exitStatus = reportAction(context, path, request, end, json);
  if (end.error) return {{}, end.error};
  return {end.item->itemIdentifier(), NSError()};
}

int makeFolderWithParents(CommandContext &context, const std::string &path, bool json) {
  if (const auto there = resolveFolder(context, asPath(path)); !there.error) {
    const auto item = context.host->item(there.value);
    if (!item.value) return reportError(context, path, item.error);
    context.out << (json ? itemJSON(item.value->fields()) : longLine(item.value->fields())) << std::endl;
    return kExitSuccess;
  }
  int exitStatus = kExitSuccess;
  (void)makeFolders(context, asPath(path), json, &exitStatus);
  return exitStatus;
}

}  // namespace

int runMkdir(CommandContext &context, const std::vector<std::string> &paths, bool withParents, bool json) {
  return forEachArgument(context, paths, [&](const std::string &path) {
    return withParents ? makeFolderWithParents(context, path, json) : makeFolder(context, path, json);
  });
}

}  // namespace droxa
