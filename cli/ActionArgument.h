#pragma once

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "cli/CommandContext.h"

// What the arguments of the commands that change items stand for.

namespace droxa {

// The item; null after it was said on the error output why not, with the status in `exitStatus`.
ControlClient::Item resolveForAction(CommandContext &context, const std::string &argument, int *exitStatus);
// The same, but refuses the root and the folders of the drive's containers, which have to stay.
ControlClient::Item resolveMovable(CommandContext &context, const std::string &argument, int *exitStatus);

// The identifier of the folder; ENOTDIR (NSPOSIXErrorDomain) for what is no folder.
CallResult<std::string> resolveFolder(CommandContext &context, const std::string &argument);

// Where something new is to be: the last component of a path, and what leads there ("/" for the root).
struct NewPlace {
  std::string folder;
  std::string name;  // "" for the root itself
};
NewPlace newPlaceOf(const std::string &path);

// Runs `command` for each, to the last one; the status is that of the first that failed. An interrupted one
// ends it all.
int forEachArgument(CommandContext &context, const std::vector<std::string> &arguments,
                    const std::function<int(const std::string &argument)> &command);

}  // namespace droxa
