#include "keld/contents/ContentsStorage.h"

#include <algorithm>
#include <cerrno>
#include <ctime>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/statvfs.h>
#include <unistd.h>

#include "keld/contents/FileSteps.h"
#include "keld/contents/StorageNames.h"

namespace droxa::keld {

namespace {

// Opens a folder of the storage, made where it isn't there.
int makeFolder(int parent, const char *name, OwnedDescriptor *folder) {
  if (::mkdirat(parent, name, 0700) != 0 && errno != EEXIST) return errno;
  *folder = OwnedDescriptor(::openat(parent, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  return *folder ? 0 : errno;
}

bool isStillNamed(int folder, const std::string &name, int file) {
  struct stat named;
  struct stat open;
  return ::fstatat(folder, name.c_str(), &named, AT_SYMLINK_NOFOLLOW) == 0 && ::fstat(file, &open) == 0 &&
         named.st_ino == open.st_ino && named.st_dev == open.st_dev;
}

// Opens and locks the file of a part. Whoever had the lock before may have removed or renamed it.
int openLocked(int folder, const std::string &name, int flags, OwnedDescriptor *file) {
  OwnedDescriptor opened = OpenFileIn(folder, name, O_RDWR | flags);
  if (!opened) return errno;
  if (::flock(opened.get(), LOCK_EX | LOCK_NB) != 0) return errno;
  if (!isStillNamed(folder, name, opened.get())) return EWOULDBLOCK;
  *file = std::move(opened);
  return 0;
}

PartResult failedPart(int error) {
  if (error == EWOULDBLOCK) return {ContentsResult::failed(ContentsOutcome::busy, error), nullptr};
  return {ContentsResult::failedWith(error), nullptr};
}

}  // namespace

std::unique_ptr<ContentsStorage> ContentsStorage::open(const std::string &replicaPath,
                                                       ContentsSettings settings, int *error) {
  std::unique_ptr<ContentsStorage> storage(new ContentsStorage(std::move(settings)));
  *error = storage->openFolders(replicaPath);
  return *error == 0 ? std::move(storage) : nullptr;
}

ContentsStorage::~ContentsStorage() = default;

int ContentsStorage::openFolders(const std::string &replicaPath) {
  replica_ = OwnedDescriptor(::open(replicaPath.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!replica_) return errno;
  const auto facts = ReadFolderFacts(replica_.get(), 0);
  if (!facts) return errno;
  device_ = facts->device;
  OwnedDescriptor root;
  int error = makeFolder(replica_.get(), kContentsStorageName, &root);
  if (error == 0) error = makeFolder(root.get(), "parts", &parts_);
  if (error == 0) error = makeFolder(root.get(), "temporary", &temporaries_);
  if (error == 0) error = makeFolder(root.get(), "rescued", &rescued_);
  if (error != 0) return error;
  if (::fchmod(root.get(), 0700) != 0) return errno;
  if ((error = ProbeContentsCapabilities(root.get(), &capabilities_)) != 0) return error;
  if (settings_.assume) capabilities_ = *settings_.assume;
  if ((error = SyncFolder(root.get())) != 0) return error;
  return SyncFolder(replica_.get());
}

// ENOSPC early, before anything is downloaded for nothing. 0 also where the file system doesn't tell.
int ContentsStorage::hasNoRoomFor(std::uint64_t bytes) const {
  struct statvfs status;
  if (::fstatvfs(parts_.get(), &status) != 0 || status.f_blocks == 0) return 0;
  const std::uint64_t room = static_cast<std::uint64_t>(status.f_bavail) * status.f_frsize;
  const std::uint64_t leave = settings_.spaceToLeave;
  return room < leave || room - leave < bytes ? ENOSPC : 0;
}

PartResult ContentsStorage::openPart(const std::string &digest, std::uint64_t size) const {
  if (!IsContentsDigest(digest)) return failedPart(EINVAL);
  if (size > static_cast<std::uint64_t>(INT64_MAX)) return failedPart(EFBIG);
  OwnedDescriptor file;
  int error = openLocked(parts_.get(), WholePartName(digest), 0, &file);
  if (error == 0) {
    const auto facts = ReadFolderFacts(file.get(), device_);
    const bool isWhole = facts && facts->size == size;
    // What has another size was asked for under a wrong one; the digest decides again.
    if (isWhole)
      return {{}, std::unique_ptr<PartFile>(new PartFile(parts_.get(), std::move(file), digest, size, true))};
    ::unlinkat(parts_.get(), WholePartName(digest).c_str(), 0);
  } else if (error != ENOENT) {
    return failedPart(error);
  }
  const std::string name = UnfinishedPartName(digest);
  if ((error = openLocked(parts_.get(), name, O_CREAT, &file)) != 0) return failedPart(error);
  auto facts = ReadFolderFacts(file.get(), device_);
  if (!facts) return failedPart(errno);
  if (facts->size > size) {
    if (::ftruncate(file.get(), 0) != 0) return failedPart(errno);
    facts->size = 0;
  }
  if ((error = hasNoRoomFor(size - facts->size)) != 0) {
    if (facts->size == 0) ::unlinkat(parts_.get(), name.c_str(), 0);
    return failedPart(error);
  }
  std::unique_ptr<PartFile> part(new PartFile(parts_.get(), std::move(file), digest, size, false));
  if ((error = part->goOn()) != 0) return failedPart(error);
  return {{}, std::move(part)};
}

ContentsResult ContentsStorage::forgetPart(const std::string &digest) const {
  if (!IsContentsDigest(digest)) return ContentsResult::failedWith(EINVAL);
  for (const std::string &name : {WholePartName(digest), UnfinishedPartName(digest)}) {
    OwnedDescriptor file;
    const int error = openLocked(parts_.get(), name, 0, &file);
    if (error == ENOENT) continue;
    if (error == EWOULDBLOCK) return ContentsResult::failed(ContentsOutcome::busy, error);
    if (error != 0) return ContentsResult::failedWith(error);
    if (::unlinkat(parts_.get(), name.c_str(), 0) != 0) return ContentsResult::failedWith(errno);
  }
  return {};
}

void ContentsStorage::removeStaleParts() const {
  NameList names;
  struct timespec now;
  if (ReadFolderNames(parts_.get(), &names) != 0 || ::clock_gettime(CLOCK_REALTIME, &now) != 0) return;
  for (std::size_t i = 0; i < names.size(); ++i) {
    const std::string name(names[i]);
    OwnedDescriptor file;
    struct stat status;
    if (openLocked(parts_.get(), name, 0, &file) != 0 || ::fstat(file.get(), &status) != 0) continue;
    // A whole part bears the document's date once it was made ready for it; its time of change tells more.
    const auto age =
        std::chrono::seconds(now.tv_sec - std::max(status.st_mtim.tv_sec, status.st_ctim.tv_sec));
    if (age > settings_.partLifetime) ::unlinkat(parts_.get(), name.c_str(), 0);
  }
}

}  // namespace droxa::keld
