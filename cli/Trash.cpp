#include <nlohmann/json.hpp>

#include "cli/Acting.h"
#include "cli/ActionArgument.h"
#include "cli/Actions.h"
#include "cli/ExitStatus.h"
#include "cli/ItemText.h"
#include "cli/Text.h"

namespace droxa {

namespace {

using Kind = FPDActionRequest::Kind;

int refuse(CommandContext &context, const std::string &asked, const char *why) {
  context.err << "droxa: " << escapedText(asked) << ": " << why << std::endl;
  return kExitFailure;
}

FPDActionRequest requestFor(Kind kind, const ControlClient::Item &item) {
  FPDActionRequest request;
  request.kind = kind;
  request.identifier = item->itemIdentifier();
  return request;
}

int trash(CommandContext &context, const std::string &argument, bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveMovable(context, argument, &exitStatus);
  if (!item) return exitStatus;
  if (item->fields().isTrashed) {
    return refuse(context, argument, "it is in the trash already; `droxa rm` deletes it for good");
  }
  return actAndReport(context, argument, requestFor(Kind::trash, item), json);
}

int restore(CommandContext &context, const std::string &argument, const std::optional<std::string> &folder,
            bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveMovable(context, argument, &exitStatus);
  if (!item) return exitStatus;
  if (!item->fields().isTrashed) {
    return refuse(context, argument, "it isn't in the trash; `droxa ls .Trash` shows what is");
  }
  FPDActionRequest request = requestFor(Kind::untrash, item);
  request.parentIdentifier = folder;
  const ActionEnd end = act(context, argument, request);
  const int status = reportAction(context, argument, request, end, json);
  if (!end.item || !end.item->fields().isTrashed) return status;
  return refuse(context, argument,
                "it is still in the trash, since nobody knows where it was; --to FOLDER says where to");
}

int remove(CommandContext &context, const std::string &argument, bool withContents, bool json) {
  int exitStatus = kExitSuccess;
  const auto item = resolveMovable(context, argument, &exitStatus);
  if (!item) return exitStatus;
  if (item->fields().kind == NSFileProviderItemKind::folder && !withContents) {
    return refuse(context, argument, "it is a folder; -r deletes it with everything below it");
  }
  const FPDActionRequest request = requestFor(Kind::deleteItem, item);
  const ActionEnd end = act(context, argument, request, ActionPatience::untilStopped);
  if (!end.error) {
    if (json) {
      auto object = nlohmann::ordered_json::parse(itemJSON(item->fields()));
      object["deleted"] = true;
      context.out << object.dump(-1, ' ', false, nlohmann::ordered_json::error_handler_t::replace)
                  << std::endl;
    } else {
      context.out << escapedText(argument) << ": deleted (" << item->itemIdentifier() << ")" << std::endl;
    }
  }
  return reportAction(context, argument, request, end, json);
}

}  // namespace

int runTrash(CommandContext &context, const std::vector<std::string> &arguments, bool json) {
  return forEachArgument(context, arguments,
                         [&](const std::string &argument) { return trash(context, argument, json); });
}

int runRestore(CommandContext &context, const std::vector<std::string> &arguments,
               const std::optional<std::string> &folder, bool json) {
  std::optional<std::string> identifier;
  if (folder) {
    const auto found = resolveFolder(context, *folder);
    if (found.error) return reportError(context, *folder, found.error);
    identifier = found.value;
  }
  return forEachArgument(context, arguments, [&](const std::string &argument) {
    return restore(context, argument, identifier, json);
  });
}

int runRm(CommandContext &context, const std::vector<std::string> &arguments, bool withContents, bool json) {
  return forEachArgument(context, arguments, [&](const std::string &argument) {
    return remove(context, argument, withContents, json);
  });
}

}  // namespace droxa
