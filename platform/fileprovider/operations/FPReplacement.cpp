#include "platform/fileprovider/operations/FPReplacement.h"

#include <cerrno>
#include <fcntl.h>
#include <iterator>
#include <string_view>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/fileprovider/FPReplacements.h"
#include "platform/fileprovider/operations/FPDescriptor.h"
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

std::string NewName() {
  return kPrefix + UUID::generate().description();
}

int OpenFolder(const std::string &path) {
  return open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
}

// Whether NewName() may have made the name; nothing else is ever removed.
bool IsOfAnOperation(std::string_view name) {
  if (!name.starts_with(kPrefix)) return false;
  name.remove_prefix(std::size(kPrefix) - 1);
  return name.size() == UUID().description().size() &&
         name.find_first_not_of("0123456789ABCDEF-") == std::string_view::npos;
}

// The folder, open and locked; -1 with errno set where there is none, or EWOULDBLOCK where another holds it.
int OpenLocked(int parent, const std::string &name) {
  const int folder = openat(parent, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
  if (folder < 0) return -1;
  if (flock(folder, LOCK_EX | LOCK_NB) == 0) return folder;
  const int error = errno;
  close(folder);
  errno = error;
  return -1;
}

// Whether the open folder is the one of that name still.
bool IsStill(int folder, int parent, const std::string &name) {
  struct stat opened {};
  struct stat named {};
  return fstat(folder, &opened) == 0 && fstatat(parent, name.c_str(), &named, AT_SYMLINK_NOFOLLOW) == 0 &&
         opened.st_dev == named.st_dev && opened.st_ino == named.st_ino;
}

bool RemoveLocked(int folder, int parent, const std::string &name) {
  int error = FPRemoveAllIn(folder);
  if (error == 0 && unlinkat(parent, name.c_str(), AT_REMOVEDIR) != 0 && errno != ENOENT) error = errno;
  if (error == 0) return true;
  os_log_error(Log(), "[ERROR] %s can't be removed, and is left for later: %@", name.c_str(),
               NSError::errorWithPOSIXCode(error));
  return false;
}

bool AreOnOneFileSystem(const std::string &a, const std::string &b) {
  struct stat first {};
  struct stat second {};
  return stat(a.c_str(), &first) == 0 && stat(b.c_str(), &second) == 0 && first.st_dev == second.st_dev;
}

}  // namespace

std::unique_ptr<FPReplacement> FPReplacement::makeIn(const std::string &parentPath, int *error) {
  const int parent = OpenFolder(parentPath);
  *error = parent < 0 ? errno : EAGAIN;
  // The cleaner may come between the folder's making and its lock, and remove it.
  for (int attempt = 0; parent >= 0 && attempt < 16; ++attempt) {
    const std::string name = NewName();
    if (mkdirat(parent, name.c_str(), S_IRWXU) != 0) {
      *error = errno;
      break;
    }
    const int folder = OpenLocked(parent, name);
    if (folder >= 0 && IsStill(folder, parent, name)) {
      return std::unique_ptr<FPReplacement>(new FPReplacement(parent, name, folder));
    }
    if (folder >= 0) close(folder);
  }
  if (parent >= 0) close(parent);
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
  const int parent = OpenFolder(url.URLByDeletingLastPathComponent().path());
  const std::string old = url.lastPathComponent();
  const std::string name = NewName();
  const int folder = parent < 0 ? -1 : OpenLocked(parent, old);
  const int code = folder < 0 ? errno : FPMoveAt(parent, old, parent, name);
  if (code == 0) return std::unique_ptr<FPReplacement>(new FPReplacement(parent, name, folder));
  if (folder >= 0) close(folder);
  if (parent >= 0) close(parent);
  *error = FPErrorFromPOSIX(code, url.path() + " can't be moved out of sight");
  return nullptr;
}

FPReplacement::~FPReplacement() {
  (void)RemoveLocked(folder_, parent_, name_);
  close(folder_);
  close(parent_);
}

std::size_t FPRemoveAbandonedReplacements(const NSURL &directory) {
  const FPDescriptor parent(OpenFolder(directory.path()));
  if (parent.get() < 0) return 0;
  int error = 0;
  std::size_t removed = 0;
  for (const std::string &name : FPNamesInFolder(parent.get(), &error)) {
    if (!IsOfAnOperation(name)) continue;
    const FPDescriptor folder(OpenLocked(parent.get(), name));
    if (folder.get() < 0 || !IsStill(folder.get(), parent.get(), name)) continue;
    if (RemoveLocked(folder.get(), parent.get(), name)) ++removed;
  }
  return removed;
}

}  // namespace droxa
