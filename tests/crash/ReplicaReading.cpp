#include "tests/crash/ReplicaReading.h"

#include <array>
#include <dirent.h>
#include <fcntl.h>
#include <sstream>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>

namespace droxa::crash {

std::optional<Mark> ReadMark(int descriptor) {
  std::array<char, 1024> bytes{};
  const ssize_t count = ::fgetxattr(descriptor, "user.droxa.document", bytes.data(), bytes.size());
  if (count <= 0) return std::nullopt;
  std::istringstream fields(std::string(bytes.data(), static_cast<std::size_t>(count)));
  Mark mark;
  std::string version, state, ignored;
  if (!(fields >> version >> state) || version != "1" || state.size() != 1) return std::nullopt;
  mark.state = state[0];
  if (mark.state != 'f') fields >> mark.size >> ignored >> ignored >> mark.digest >> ignored;
  fields >> mark.record;
  return fields ? std::optional(mark) : std::nullopt;
}

namespace {

void readFolder(const std::string &path, const std::string &below, Tree *tree) {
  DIR *folder = ::opendir(path.c_str());
  if (!folder) return;
  while (const dirent *entry = ::readdir(folder)) {
    const std::string name = entry->d_name;
    if (name == "." || name == "..") continue;
    const int file = ::openat(::dirfd(folder), name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
    if (file < 0) continue;
    struct stat status = {};
    ::fstat(file, &status);
    Entry found;
    found.isFolder = S_ISDIR(status.st_mode);
    found.size = found.isFolder ? 0 : static_cast<std::uint64_t>(status.st_size);
    found.inode = status.st_ino;
    found.mark = ReadMark(file);
    ::close(file);
    const std::string own = below.empty() ? name : below + "/" + name;
    (*tree)[own] = found;
    if (found.isFolder) readFolder(path + "/" + name, own, tree);
  }
  ::closedir(folder);
}

}  // namespace

Tree ReadTree(const std::string &folder) {
  Tree tree;
  readFolder(folder, "", &tree);
  return tree;
}

std::optional<std::string> ReadAll(int descriptor) {
  std::string text;
  std::array<char, 65536> buffer{};
  for (off_t offset = 0;; offset = static_cast<off_t>(text.size())) {
    const ssize_t count = ::pread(descriptor, buffer.data(), buffer.size(), offset);
    if (count < 0) return std::nullopt;
    if (count == 0) return text;
    text.append(buffer.data(), static_cast<std::size_t>(count));
  }
}

std::optional<std::string> ReadAll(const std::string &path) {
  const int file = ::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC);
  if (file < 0) return std::nullopt;
  auto text = ReadAll(file);
  ::close(file);
  return text;
}

}  // namespace droxa::crash
