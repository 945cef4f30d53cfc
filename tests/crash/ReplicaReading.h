#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>

namespace droxa::crash {

// What a file's mark says, read without the daemon's code.
struct Mark {
  char state = 0;  // p present, e being evicted, d dataless, f folder
  std::uint64_t size = 0;
  std::string digest;
  std::string record;
};
std::optional<Mark> ReadMark(int descriptor);

struct Entry {
  bool isFolder = false;
  std::uint64_t size = 0;
  std::uint64_t inode = 0;
  std::optional<Mark> mark;
  bool isDataless() const { return mark && (mark->state == 'd' || mark->state == 'e') && size > 0; }
};

// All that is below a folder, by the path below it. What goes away meanwhile is left out.
using Tree = std::map<std::string, Entry>;
Tree ReadTree(const std::string &folder);

// The whole file; nullopt when it can't be read.
std::optional<std::string> ReadAll(int descriptor);
std::optional<std::string> ReadAll(const std::string &path);

}  // namespace droxa::crash
