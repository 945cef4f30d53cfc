#include "platform/fileprovider/operations/FPReplacement.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "platform/fileprovider/FPReplacements.h"
#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPRemoveTree.h"
#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/UUID.h"
#include "platform/oslog/os_log.h"

namespace droxa {
namespace {

constexpr char kPrefix[] = ".droxa-replacement-";

os_log_t Log() {
  static const os_log_t log = os_log_create("com.droxa.fileprovider", "operations");
  return log;
}

std::string NewPath(const std::string &parent) {
  return (parent == "/" ? "" : parent) + "/" + kPrefix + UUID::generate().description();
}

// The folder, open and locked; -1 with errno set where there is none, or EWOULDBLOCK where another holds it.
int OpenLocked(const std::string &path) {
  const int folder = open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (folder < 0) return -1;
  if (flock(folder, LOCK_EX | LOCK_NB) == 0) return folder;
  const int error = errno;
  close(folder);
  errno = error;
  return -1;
}

// Whether the open folder is the one at the path still.
bool IsAt(int folder, const std::string &path) {
  struct stat opened {};
  struct stat named {};
  return fstat(folder, &opened) == 0 && lstat(path.c_str(), &named) == 0 && opened.st_dev == named.st_dev &&
         opened.st_ino == named.st_ino;
}

void RemoveLocked(int folder, const std::string &path) {
  int error = FPRemoveAllIn(folder);
  if (error == 0 && rmdir(path.c_str()) != 0 && errno != ENOENT) error = errno;
  if (error == 0) return;
  os_log_error(Log(), "[ERROR] %s can't be removed, and is left for later: %@", path.c_str(),
               NSError::errorWithPOSIXCode(error));
}

bool AreOnOneFileSystem(const std::string &a, const std::string &b) {
  struct stat first {};
  struct stat second {};
  return stat(a.c_str(), &first) == 0 && stat(b.c_str(), &second) == 0 && first.st_dev == second.st_dev;
}

}  // namespace

std::unique_ptr<FPReplacement> FPReplacement::makeIn(const std::string &parent, int *error) {
  // The cleaner may come between the folder's making and its lock, and remove it.
  for (int attempt = 0; attempt < 16; ++attempt) {
    const std::string path = NewPath(parent);
    if (mkdir(path.c_str(), S_IRWXU) != 0) {
      *error = errno;
      return nullptr;
    }
    const int folder = OpenLocked(path);
    if (folder < 0) continue;
    std::unique_ptr<FPReplacement> replacement(new FPReplacement(path, folder));
    if (IsAt(folder, path)) return replacement;
  }
  *error = EAGAIN;
  return nullptr;
}

std::unique_ptr<FPReplacement> FPReplacement::make(const NSURL &url, NSError *error) {
  const std::string beside = url.URLByDeletingLastPathComponent().path();
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  const NSURL provided = provider ? provider->itemReplacementDirectoryForURL(url) : NSURL();
  int code = 0;
  if (provided && AreOnOneFileSystem(provided.path(), beside)) {
    if (auto replacement = makeIn(provided.path(), &code)) return replacement;
  }
  auto replacement = makeIn(beside, &code);
  if (!replacement) *error = FPErrorFromPOSIX(code, "the work on " + url.path() + " can't be prepared");
  return replacement;
}

std::unique_ptr<FPReplacement> FPReplacement::makeOfFolderAtURL(const NSURL &url, NSError *error) {
  const std::string path = NewPath(url.URLByDeletingLastPathComponent().path());
  const int folder = OpenLocked(url.path());
  const int code = folder < 0 ? errno : FPMove(url.path(), path);
  if (code == 0) return std::unique_ptr<FPReplacement>(new FPReplacement(path, folder));
  if (folder >= 0) close(folder);
  *error = FPErrorFromPOSIX(code, url.path() + " can't be moved out of sight");
  return nullptr;
}

FPReplacement::~FPReplacement() {
  RemoveLocked(folder_, path_);
  close(folder_);
}

std::size_t FPRemoveAbandonedReplacements(const NSURL &directory) {
  const int parent = open(directory.path().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (parent < 0) return 0;
  int error = 0;
  const std::vector<std::string> names = FPNamesInFolder(parent, &error);
  close(parent);
  std::size_t removed = 0;
  for (const std::string &name : names) {
    if (!name.starts_with(kPrefix)) continue;
    const std::string path = directory.URLByAppendingPathComponent(name).path();
    const int folder = OpenLocked(path);
    if (folder < 0) continue;
    if (IsAt(folder, path)) RemoveLocked(folder, path);
    struct stat status {};
    if (lstat(path.c_str(), &status) != 0) ++removed;
    close(folder);
  }
  return removed;
}

}  // namespace droxa
