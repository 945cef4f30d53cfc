#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "cli/CommandContext.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVContents.h"

namespace droxa {

// What an argument of a command about contents stands for, and where it is.
struct ContentsArgument {
  std::string argument;  // as it was typed
  std::string identifier;
  bool isFolder = false;
  // Of the item; the root has one for each of the drive's containers, since they lie side by side on disk.
  std::vector<NSURL> urls;
};

// An argument that stands for nothing, or for something without contents (a symbolic link), is said on the
// error output, with the status in `exitStatus`.
std::optional<ContentsArgument> resolveContents(CommandContext &context, const std::string &argument,
                                                int *exitStatus);

// Runs `command` for each argument, to the last one; the status is that of the first that failed. An
// interrupted one ends it all.
int forEachContents(CommandContext &context, const std::vector<std::string> &arguments,
                    const std::function<int(const ContentsArgument &)> &command);

// Takes everything below the root's URLs together. Waits for each answer as long as any question may take, or
// for `patience`: where somebody may press Ctrl-C meanwhile.
CallResult<QVContentsStatus> contentsStatus(CommandContext &context, const ContentsArgument &contents,
                                            std::optional<std::chrono::milliseconds> patience = {});

}  // namespace droxa
