#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "cli/CommandContext.h"

namespace droxa {

// The commands of `droxa` that change items, each through the extension's action of that kind. Each gives its
// exit status, prints the items that came back, and goes on with the next argument after one that failed.

// `files` are of this machine.
int runImport(CommandContext &context, const std::vector<std::string> &files, const std::string &folder,
              bool json);
int runMkdir(CommandContext &context, const std::vector<std::string> &paths, bool withParents, bool json);
int runRename(CommandContext &context, const std::string &argument, const std::string &name, bool json);
int runMv(CommandContext &context, const std::vector<std::string> &arguments, const std::string &destination,
          bool json);
int runTrash(CommandContext &context, const std::vector<std::string> &arguments, bool json);
int runRestore(CommandContext &context, const std::vector<std::string> &arguments,
               const std::optional<std::string> &folder, bool json);
int runRm(CommandContext &context, const std::vector<std::string> &arguments, bool withContents, bool json);

// Without names: shows the tags.
int runTag(CommandContext &context, const std::string &argument, const std::vector<std::string> &names,
           bool json);
// Without names: removes all.
int runUntag(CommandContext &context, const std::string &argument, const std::vector<std::string> &names,
             bool json);
// No rank: no favourite any more.
int runFavorite(CommandContext &context, const std::string &argument, std::optional<std::uint64_t> rank,
                bool json);

struct UsedOptions {
  std::string argument;
  std::string date;  // "": now
  bool never = false;
  bool json = false;
};
int runUsed(CommandContext &context, const UsedOptions &options);

}  // namespace droxa
