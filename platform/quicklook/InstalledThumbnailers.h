#pragma once

#include <filesystem>
#include <map>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// How one installed program makes thumbnails: its command, word by word, with %i (the file's path), %u (its
// URL), %o (the thumbnail's path), %s (the size in pixels) and %% still in it.
struct InstalledThumbnailer {
  std::vector<std::string> command;
};

// The `*.thumbnailer` files in the folders `thumbnailers` of the user's and the system's data folders
// (XDG_DATA_HOME, XDG_DATA_DIRS). A file of a name that an earlier folder has isn't looked at; one that is
// malformed, or whose program isn't there, is none. They are read again when one of the folders or files has
// changed. Thread contract: any thread.
class InstalledThumbnailers {
 public:
  static InstalledThumbnailers &shared();

  std::optional<InstalledThumbnailer> forType(const std::string &mimeType) EXCLUDES(mutex_);

 private:
  using Stamp = std::vector<std::pair<std::string, std::filesystem::file_time_type>>;
  bool isCurrent(const std::vector<std::string> &folders) const REQUIRES(mutex_);
  void read(const std::vector<std::string> &folders) REQUIRES(mutex_);
  void stamp(const std::string &path) REQUIRES(mutex_);

  Mutex mutex_;
  std::vector<std::string> folders_ GUARDED_BY(mutex_);  // that were read
  Stamp stamp_ GUARDED_BY(mutex_);                       // of them and of their files
  std::map<std::string, InstalledThumbnailer> byType_ GUARDED_BY(mutex_);
};

// The thumbnailer that such a file describes and the types that it is for; nullopt when it isn't one.
std::optional<std::pair<InstalledThumbnailer, std::vector<std::string>>> ReadThumbnailerFile(
    const std::string &path);

}  // namespace droxa
