#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <vector>

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
// Of each item, instead of the system.
int runItemStatus(CommandContext &context, const std::vector<std::string> &arguments, bool json);

// The commands about contents; each takes folders too, but for the first two.
int runCat(CommandContext &context, const std::vector<std::string> &arguments);
int runOpen(CommandContext &context, const std::vector<std::string> &arguments, bool json);
int runDownload(CommandContext &context, const std::vector<std::string> &arguments, bool json);
int runEvict(CommandContext &context, const std::vector<std::string> &arguments, bool json);
int runPin(CommandContext &context, const std::vector<std::string> &arguments, bool isPinned, bool json);

struct ThumbnailOptions {
  std::vector<std::string> arguments;
  std::uint32_t size = 256;  // the longest side, in pixels
  std::string folder = ".";  // where the pictures go
  bool fillsCache = false;   // into the desktop's cache instead, those of folders
  bool json = false;
};
int runThumbnail(CommandContext &context, const ThumbnailOptions &options);

// Without an application: the folder of everybody's documents.
int runDefaultFolder(CommandContext &context, const std::optional<std::string> &application, bool json);

struct WaitOptions {
  std::vector<std::string> arguments;  // none: the whole drive
  std::optional<std::chrono::milliseconds> timeout;
  bool json = false;
};
int runWait(CommandContext &context, const WaitOptions &options);

enum class DeletionsAnswer { none, carryOut, restore };
int runDeletions(CommandContext &context, DeletionsAnswer answer, bool json);

// What the process would be granted when it connects; without one, all that the files grant.
int runEntitlements(CommandContext &context, std::optional<std::int32_t> process, bool json);

// `path` absolute, or "" for where the drive is mounted by default.
int runMount(CommandContext &context, const std::string &path);
int runUnmount(CommandContext &context);

int runAccountShow(CommandContext &context, bool json);
int runAccountSignIn(CommandContext &context, const std::string &name);
int runAccountSignOut(CommandContext &context);

}  // namespace droxa
