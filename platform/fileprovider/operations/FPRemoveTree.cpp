#include "platform/fileprovider/operations/FPRemoveTree.h"

#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/UUID.h"

namespace droxa {
namespace {

// A folder this deep is moved up to the top before it is looked into, so that no tree is too deep for the
// stack and the descriptors of this process.
constexpr int kDeepest = 64;

int OpenForRemoval(int folder, const std::string &name) {
  constexpr int kFlags = O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC;
  int opened = openat(folder, name.c_str(), kFlags);
  if (opened < 0 && errno == EACCES && fchmodat(folder, name.c_str(), S_IRWXU, 0) == 0) {
    opened = openat(folder, name.c_str(), kFlags);
  }
  struct stat status {};
  if (opened >= 0 && fstat(opened, &status) == 0 && (status.st_mode & S_IRWXU) != S_IRWXU) {
    (void)fchmod(opened, S_IRWXU);
  }
  return opened;
}

// Thread contract: for one thread.
class TreeRemoval {
 public:
  explicit TreeRemoval(int root) : root_(root) {}

  int removeAll() {
    // Until nothing is moved up any more.
    do {
      movedUp_ = false;
      removeAllIn(root_, 0);
    } while (movedUp_ && error_ == 0);
    return error_;
  }

 private:
  void removeAllIn(int folder, int depth) {
    int error = 0;
    for (const std::string &name : FPNamesInFolder(folder, &error)) remove(folder, name, depth);
    note(error);
  }
  void remove(int folder, const std::string &name, int depth) {
    if (unlinkat(folder, name.c_str(), 0) == 0 || errno == ENOENT) return;
    if (errno != EISDIR) return note(errno);
    if (depth == kDeepest && moveUp(folder, name)) return;
    const int opened = OpenForRemoval(folder, name);
    if (opened < 0) return note(errno);
    removeAllIn(opened, depth + 1);
    close(opened);
    if (unlinkat(folder, name.c_str(), AT_REMOVEDIR) != 0) note(errno);
  }
  bool moveUp(int folder, const std::string &name) {
    const bool moved = renameat(folder, name.c_str(), root_, UUID::generate().description().c_str()) == 0;
    movedUp_ = movedUp_ || moved;
    return moved;
  }
  void note(int error) {
    if (error_ == 0) error_ = error;
  }

  const int root_;
  bool movedUp_ = false;
  int error_ = 0;
};

}  // namespace

std::vector<std::string> FPNamesInFolder(int folder, int *error) {
  std::vector<std::string> names;
  const int own = openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  DIR *const entries = own < 0 ? nullptr : fdopendir(own);
  if (!entries) {
    *error = errno;
    if (own >= 0) close(own);
    return names;
  }
  errno = 0;
  while (const dirent *entry = readdir(entries)) {
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") names.emplace_back(name);
  }
  *error = errno;
  closedir(entries);
  return names;
}

int FPRemoveAllIn(int folder) {
  return TreeRemoval(folder).removeAll();
}

}  // namespace droxa
