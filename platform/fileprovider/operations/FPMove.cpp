#include "platform/fileprovider/operations/FPMove.h"

#include <cerrno>
#include <cstdio>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/UUID.h"

namespace droxa {
namespace {

bool Exists(int folder, const std::string &path) {
  struct stat status {};
  return fstatat(folder, path.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0;
}

// For file systems that can't rename without replacing. A folder's rename replaces at most an empty folder;
// any other item gets its second name before it loses the first, which fails where the name is taken.
int MoveWithoutTheKernelsHelp(int fromFolder, const std::string &from, int toFolder, const std::string &to) {
  struct stat status {};
  if (fstatat(fromFolder, from.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return errno;
  if (!S_ISDIR(status.st_mode)) {
    if (linkat(fromFolder, from.c_str(), toFolder, to.c_str(), 0) == 0) {
      return unlinkat(fromFolder, from.c_str(), 0) == 0 ? 0 : errno;
    }
    const bool hasNoLinks = errno == EPERM || errno == EOPNOTSUPP || errno == ENOSYS || errno == EMLINK;
    if (!hasNoLinks) return errno;
  }
  if (Exists(toFolder, to)) return EEXIST;
  return renameat(fromFolder, from.c_str(), toFolder, to.c_str()) == 0 ? 0 : errno;
}

bool FolderHasEntry(const std::string &folder, const std::string &name) {
  DIR *const entries = opendir(folder.c_str());
  if (!entries) return true;
  bool found = false;
  while (const dirent *entry = readdir(entries)) found = found || name == entry->d_name;
  closedir(entries);
  return found;
}

// Whether `to` is the item at `from` itself, seen through a file system that doesn't tell case apart.
bool IsSameEntry(const std::string &from, const std::string &to) {
  struct stat a {};
  struct stat b {};
  if (lstat(from.c_str(), &a) != 0 || lstat(to.c_str(), &b) != 0) return false;
  if (a.st_dev != b.st_dev || a.st_ino != b.st_ino) return false;
  const std::size_t slash = to.rfind('/');
  return !FolderHasEntry(to.substr(0, slash + 1), to.substr(slash + 1));
}

// Over a name that stands between, since a file system may take the two names for one and do nothing.
int MoveToOtherCase(const std::string &from, const std::string &to) {
  const std::string between =
      from.substr(0, from.rfind('/') + 1) + ".droxa-case-" + UUID::generate().description();
  if (const int error = FPMoveAt(AT_FDCWD, from, AT_FDCWD, between)) return error;
  const int error = FPMoveAt(AT_FDCWD, between, AT_FDCWD, to);
  if (error) (void)FPMoveAt(AT_FDCWD, between, AT_FDCWD, from);
  return error;
}

}  // namespace

int FPMoveAt(int fromFolder, const std::string &from, int toFolder, const std::string &to) {
  if (renameat2(fromFolder, from.c_str(), toFolder, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  // EINVAL is also the answer for a folder moved below itself, which the second try repeats.
  if (errno != EINVAL && errno != ENOSYS) return errno;
  return MoveWithoutTheKernelsHelp(fromFolder, from, toFolder, to);
}

int FPMove(const std::string &from, const std::string &to) {
  const int error = FPMoveAt(AT_FDCWD, from, AT_FDCWD, to);
  return error == EEXIST && IsSameEntry(from, to) ? MoveToOtherCase(from, to) : error;
}

}  // namespace droxa
