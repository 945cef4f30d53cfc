#include "keld/TrashNotes.h"

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <string_view>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/FolderReading.h"
#include "keld/contents/PromiseFile.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVTrashInfo.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kMostLeft = 100'000;
constexpr std::time_t kDay = 24 * 60 * 60;
constexpr int kMostNumbers = 100'000;

OwnedDescriptor openFolder(const std::string &path) {
  return OwnedDescriptor(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

bool exists(int folder, const std::string &name) {
  struct stat status {};
  return ::fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0 || errno != ENOENT;
}

bool isOlderThanADay(int folder, const std::string &name) {
  struct stat status {};
  if (::fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0 || !S_ISREG(status.st_mode))
    return false;
  return status.st_mtim.tv_sec < std::time(nullptr) - kDay;
}

int moveToFreeName(int from, int to, const std::string &name) {
  for (int number = 1; number < kMostNumbers; ++number) {
    const std::string free = number == 1 ? name : name + " " + std::to_string(number);
    if (::renameat2(from, name.c_str(), to, free.c_str(), RENAME_NOREPLACE) == 0) return 0;
    if (errno != EEXIST) return errno;
  }
  return EEXIST;
}

}  // namespace

TrashNotes::TrashNotes(const std::string &replicaPath)
    : folder_(replicaPath + "/" + QVUbiquitousTrashContainerID) {}

void TrashNotes::itemsLeft(const std::vector<std::string> &names) {
  for (const std::string &name : names)
    if (left_.size() < kMostLeft) left_.insert(name);
}

bool TrashNotes::isInTrash(int files, const std::string &name) const {
  return exists(files, name) || exists(files, PromiseNameFor(name));
}

void TrashNotes::removeThose() {
  if (left_.empty()) return;
  const OwnedDescriptor files =
      openFolder(folder_ + "/" + QVDocumentsFolderName(QVUbiquitousTrashContainerID));
  const OwnedDescriptor info = openFolder(folder_ + "/" + QVTrashInfoFolderName);
  if (!info || !files) return left_.clear();
  // Whoever holds it is about to move something in, which brings the keeper here again.
  if (::flock(info.get(), LOCK_EX | LOCK_NB) != 0) return;
  for (const std::string &name : left_)
    if (!isInTrash(files.get(), name)) ::unlinkat(info.get(), (name + QVTrashInfoSuffix).c_str(), 0);
  left_.clear();
}

void TrashNotes::removeOrphans() const {
  const OwnedDescriptor files =
      openFolder(folder_ + "/" + QVDocumentsFolderName(QVUbiquitousTrashContainerID));
  const OwnedDescriptor info = openFolder(folder_ + "/" + QVTrashInfoFolderName);
  if (!info || !files || ::flock(info.get(), LOCK_EX | LOCK_NB) != 0) return;
  NameList names;
  if (ReadFolderNames(info.get(), &names) != 0) return;
  constexpr std::string_view kSuffix = QVTrashInfoSuffix;
  for (std::size_t index = 0; index < names.size(); ++index) {
    const std::string note(names[index]);
    if (note.size() <= kSuffix.size() || note.substr(note.size() - kSuffix.size()) != kSuffix) continue;
    const std::string item = note.substr(0, note.size() - kSuffix.size());
    if (isInTrash(files.get(), item) || !isOlderThanADay(info.get(), note)) continue;
    os_log_info(qvc_default_log(), "[INFO] removing the note of %s, which isn't in the trash any more", item);
    ::unlinkat(info.get(), note.c_str(), 0);
  }
}

std::string MoveTrashOfOldLayout(const std::string &replicaPath) {
  const std::string trash = replicaPath + "/" + QVUbiquitousTrashContainerID;
  const std::string before = trash + "/Documents";
  const std::string now = trash + "/" + QVDocumentsFolderName(QVUbiquitousTrashContainerID);
  const auto failed = [&](const std::string &path, int error) {
    return path + ": can't move the trash to " + now + ": " + std::strerror(error);
  };
  const OwnedDescriptor from = openFolder(before);
  if (!from) return errno == ENOENT || errno == ENOTDIR ? "" : failed(before, errno);
  if (::renameat2(AT_FDCWD, before.c_str(), AT_FDCWD, now.c_str(), RENAME_NOREPLACE) == 0) return "";
  if (errno != EEXIST) return failed(before, errno);
  const OwnedDescriptor to = openFolder(now);
  if (!to) return failed(now, errno);
  NameList names;
  if (const int error = ReadFolderNames(from.get(), &names); error != 0) return failed(before, error);
  for (std::size_t index = 0; index < names.size(); ++index) {
    const std::string name(names[index]);
    const int error = moveToFreeName(from.get(), to.get(), name);
    if (error != 0) return failed(before + "/" + name, error);
  }
  return ::rmdir(before.c_str()) == 0 ? "" : failed(before, errno);
}

}  // namespace droxa::keld
