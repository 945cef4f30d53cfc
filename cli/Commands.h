#pragma once

#include <cstddef>
#include <optional>
#include <string>

#include "cli/CommandContext.h"

namespace droxa {

// The commands of `droxa` that ask a running system. Each gives its exit status; errors name what was asked.

struct LsOptions {
  std::string argument;  // "" and "/": the root
  bool isLong = false;
  bool byDate = false;
  bool allFolders = false;
  bool workingSet = false;
  bool json = false;
  bool nulls = false;  // raw names, each ended by a NUL byte
};
int runLs(CommandContext &context, const LsOptions &options);

int runStat(CommandContext &context, const std::string &argument, bool json);
int runId(CommandContext &context, const std::string &path);
int runUrl(CommandContext &context, const std::string &argument);

struct TreeOptions {
  std::string argument;
  std::optional<std::size_t> depth;
  bool json = false;
};
int runTree(CommandContext &context, const TreeOptions &options);

int runWatch(CommandContext &context, const std::string &argument, bool json);

int runStatus(CommandContext &context, bool json);

int runAccountShow(CommandContext &context, bool json);
int runAccountSignIn(CommandContext &context, const std::string &name);
int runAccountSignOut(CommandContext &context);

}  // namespace droxa
