#pragma once

#include <optional>
#include <string>
#include <vector>

#include "cli/CommandContext.h"
#include "platform/cloudkit/CKShare.h"

namespace droxa {

// `droxa share`: who an item is shared with, and changes of that. Each gives its exit status and, where it
// changed the share, prints the share as it is then.

struct ShareArguments {
  std::string item;
  bool json = false;
};

int runShareShow(CommandContext &context, const ShareArguments &arguments);
int runShareCreate(CommandContext &context, const ShareArguments &arguments);
int runShareAdd(CommandContext &context, const ShareArguments &arguments,
                const std::vector<std::string> &names, CKShareParticipantPermission permission);
// Without a name: everybody's who has the link.
int runSharePermission(CommandContext &context, const ShareArguments &arguments,
                       const std::optional<std::string> &name, CKShareParticipantPermission permission);
int runShareLink(CommandContext &context, const ShareArguments &arguments);
int runShareSave(CommandContext &context, const ShareArguments &arguments, const std::string &title);
// Without a name: withdraws the share.
int runShareRemove(CommandContext &context, const ShareArguments &arguments,
                   const std::optional<std::string> &name);
int runShareParticipants(CommandContext &context, const ShareArguments &arguments);
// Takes what somebody shares, by the share's URL; prints where it is.
int runShareAccept(CommandContext &context, const std::string &url, bool json);

}  // namespace droxa
