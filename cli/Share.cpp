#include "cli/Share.h"

#include <algorithm>

#include "cli/DaemonClient.h"
#include "cli/ExitStatus.h"
#include "cli/ItemArgument.h"
#include "cli/ShareClient.h"
#include "cli/ShareText.h"
#include "cli/Text.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {

int reportShareError(const CommandContext &context, const std::string &item, const NSError &error) {
  const std::string advice = privilegeAdvice(error);
  if (advice.empty()) return reportError(context, item, error);
  context.err << "droxa: " << escapedText(item) << ": " << advice << std::endl;
  return exitStatusForError(error);
}

int refuse(const CommandContext &context, const std::string &item, const std::string &why) {
  context.err << "droxa: " << escapedText(item) << ": " << why << std::endl;
  return kExitFailure;
}

// An item, and the way to its share.
struct SharedItem {
  std::string identifier;
  std::unique_ptr<ShareClient> client;  // null: there is none
};

// That of the item that the argument stands for; without a client, the exit status is set.
SharedItem sharedItem(CommandContext &context, const std::string &argument, int *status) {
  const auto found = resolveItem(*context.host, argument);
  NSError error = found.error;
  if (!error) {
    const NSFileProviderItemFields &fields = found.value->fields();
    const bool isFolder = fields.kind == NSFileProviderItemKind::folder;
    if (!isFolder && fields.kind != NSFileProviderItemKind::document) {
      *status = refuse(context, argument, "a link isn't shared; share what it leads to");
      return {};
    }
    const auto url = isFolder ? context.host->url(fields.itemIdentifier) : CallResult<NSURL>();
    error = url.error;
    if (!error && isFolder && !url.value)
      error = fileProviderErrorForNonExistentItemWithIdentifier(fields.itemIdentifier);
    if (!error) {
      auto made = isFolder ? folderShare(context, fields.itemIdentifier, url.value)
                           : documentShare(context, fields.itemIdentifier);
      if (made.value) return {fields.itemIdentifier, std::move(made.value)};
      error = made.error;
    }
  }
  *status = reportShareError(context, argument, error);
  return {};
}

void print(const CommandContext &context, const ShareArguments &arguments, const CKShare &share,
           const std::optional<std::string> &folder = std::nullopt) {
  context.out << (arguments.json ? shareJSON(arguments.item, share, folder)
                                 : shareLines(arguments.item, share, folder))
              << std::flush;
}

// The shared folder above the item by way of which it is shared; nullopt: it is shared by itself, or isn't,
// or nobody can tell.
std::optional<std::string> folderSharing(const CommandContext &context, const std::string &identifier) {
  const auto options = DaemonClient(context.daemon, context.timeout).shareOptions(identifier);
  if (options.error || !options.value.isShared || options.value.isSharedByItself) return std::nullopt;
  return options.value.folder.value_or("above it");
}

enum class Want { toLook, toChange };

// Runs `command` with the item's share, whichever there is, and the folder by way of which it is shared. What
// is shared by way of a folder is changed there.
template <class Command>
int withShareAndFolder(CommandContext &context, const ShareArguments &arguments, Want want,
                       const Command &command) {
  int status = kExitSuccess;
  const SharedItem item = sharedItem(context, arguments.item, &status);
  if (!item.client) return status;
  const auto share = item.client->fetch();
  if (share.error) return reportShareError(context, arguments.item, share.error);
  const auto folder = share.value.isKnownToServer() ? folderSharing(context, item.identifier) : std::nullopt;
  if (folder && want == Want::toChange)
    return refuse(context, arguments.item,
                  "it is shared with the folder " + escapedText(*folder) +
                      " that it is in; change that folder's share");
  return command(*item.client, share.value, folder);
}

template <class Command>
int withShare(CommandContext &context, const ShareArguments &arguments, Want want, const Command &command) {
  return withShareAndFolder(
      context, arguments, want,
      [&](ShareClient &client, const CKShare &share, const auto &) { return command(client, share); });
}

// The same for what has to be shared already.
template <class Command>
int withExistingShare(CommandContext &context, const ShareArguments &arguments, Want want,
                      const Command &command) {
  return withShare(context, arguments, want, [&](ShareClient &client, const CKShare &share) {
    if (share.isKnownToServer()) return command(client, share);
    return refuse(context, arguments.item, "it isn't shared; `droxa share create` shares it");
  });
}

int saveAndPrint(CommandContext &context, const ShareArguments &arguments, ShareClient &client,
                 const CKShare &share) {
  const auto saved = client.save(share);
  if (saved.error) return reportShareError(context, arguments.item, saved.error);
  print(context, arguments, saved.value);
  return kExitSuccess;
}

bool isNamed(const CKShareParticipant &participant, const std::string &name) {
  const CKUserIdentity &who = participant.userIdentity;
  return name == who.accountName || (!who.handle.empty() && name == who.handle);
}

std::vector<CKShareParticipant>::iterator participantNamed(CKShare &share, const std::string &name) {
  return std::find_if(share.participants.begin(), share.participants.end(),
                      [&](const CKShareParticipant &one) { return isNamed(one, name); });
}

int refuseUnknown(const CommandContext &context, const ShareArguments &arguments, const std::string &name) {
  return refuse(context, arguments.item,
                escapedText(name) +
                    " is none of its participants; `droxa share "
                    "participants` shows them");
}

}  // namespace

int runShareShow(CommandContext &context, const ShareArguments &arguments) {
  return withShareAndFolder(
      context, arguments, Want::toLook,
      [&](ShareClient &, const CKShare &share, const std::optional<std::string> &folder) {
        print(context, arguments, share, folder);
        return kExitSuccess;
      });
}

int runShareCreate(CommandContext &context, const ShareArguments &arguments) {
  return withShare(context, arguments, Want::toChange, [&](ShareClient &client, const CKShare &share) {
    if (!share.isKnownToServer()) return saveAndPrint(context, arguments, client, share);
    print(context, arguments, share);  // it is shared already, which is what was asked for
    return kExitSuccess;
  });
}

int runShareAdd(CommandContext &context, const ShareArguments &arguments,
                const std::vector<std::string> &names, CKShareParticipantPermission permission) {
  return withShare(context, arguments, Want::toChange, [&](ShareClient &client, CKShare share) {
    for (const std::string &name : names) {
      auto known = participantNamed(share, name);
      if (known == share.participants.end()) {
        const auto found = client.lookUp(name);
        if (found.error) return reportShareError(context, name, found.error);
        share.participants.push_back(found.value);
        known = share.participants.end() - 1;
      }
      if (known->role == CKShareParticipantRole::owner)
        return refuse(context, arguments.item, escapedText(name) + " is its owner");
      known->permission = permission;
    }
    return saveAndPrint(context, arguments, client, share);
  });
}

int runSharePermission(CommandContext &context, const ShareArguments &arguments,
                       const std::optional<std::string> &name, CKShareParticipantPermission permission) {
  return withExistingShare(context, arguments, Want::toChange, [&](ShareClient &client, CKShare share) {
    if (!name) {
      share.publicPermission = permission;
      return saveAndPrint(context, arguments, client, share);
    }
    const auto known = participantNamed(share, *name);
    if (known == share.participants.end()) return refuseUnknown(context, arguments, *name);
    if (known->role == CKShareParticipantRole::owner)
      return refuse(context, arguments.item, escapedText(*name) + " is its owner");
    known->permission = permission;
    return saveAndPrint(context, arguments, client, share);
  });
}

int runShareLink(CommandContext &context, const ShareArguments &arguments) {
  return withExistingShare(context, arguments, Want::toLook, [&](ShareClient &client, const CKShare &share) {
    const auto link = client.link(share);
    if (link.error) return reportShareError(context, arguments.item, link.error);
    context.out << linkText(arguments.item, link.value, arguments.json) << std::flush;
    return kExitSuccess;
  });
}

int runShareSave(CommandContext &context, const ShareArguments &arguments, const std::string &title) {
  return withExistingShare(context, arguments, Want::toChange, [&](ShareClient &client, CKShare share) {
    share.fields[CKShareTitleKey] = title;
    return saveAndPrint(context, arguments, client, share);
  });
}

int runShareRemove(CommandContext &context, const ShareArguments &arguments,
                   const std::optional<std::string> &name) {
  return withExistingShare(context, arguments, Want::toChange, [&](ShareClient &client, CKShare share) {
    if (!name) {
      const NSError error = client.withdraw(share);
      if (error) return reportShareError(context, arguments.item, error);
      print(context, arguments, CKShare());
      return kExitSuccess;
    }
    const auto known = participantNamed(share, *name);
    if (known == share.participants.end()) return refuseUnknown(context, arguments, *name);
    if (known->role == CKShareParticipantRole::owner)
      return refuse(context, arguments.item,
                    escapedText(*name) +
                        " is its owner; `droxa share remove` without "
                        "a name withdraws the share");
    share.participants.erase(known);
    return saveAndPrint(context, arguments, client, share);
  });
}

int runShareParticipants(CommandContext &context, const ShareArguments &arguments) {
  return withExistingShare(context, arguments, Want::toLook, [&](ShareClient &, const CKShare &share) {
    if (arguments.json) {
      print(context, arguments, share);
      return kExitSuccess;
    }
    for (const CKShareParticipant &one : share.participants) context.out << participantLine(one);
    context.out.flush();
    return kExitSuccess;
  });
}

}  // namespace droxa
