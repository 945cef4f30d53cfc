#include "platform/fileprovider/operations/FPCopy.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/fileprovider/operations/FPDescriptor.h"
#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPRemoveTree.h"
#include "platform/foundation/NSFileManager.h"

namespace droxa {
namespace {

// Two descriptors a level; deeper trees aren't met, and are refused rather than cut off.
constexpr int kDeepest = 200;

bool IsSameTime(const timespec &a, const timespec &b) {
  return a.tv_sec == b.tv_sec && a.tv_nsec == b.tv_nsec;
}

bool IsUnchanged(const struct stat &before, const struct stat &after) {
  return before.st_ino == after.st_ino && before.st_size == after.st_size &&
         IsSameTime(before.st_mtim, after.st_mtim) && IsSameTime(before.st_ctim, after.st_ctim);
}

// An item in its folder, and how it is called in errors.
struct Source {
  int folder;
  std::string name;
  std::string path;
};

struct Destination {
  int folder;
  std::string name;
};

NSError Changed(const Source &source) {
  return FPErrorFromPOSIX(ESTALE, source.path + " changed while it was read; try again when it is at rest");
}

NSError Refused(const Source &source, const std::string &reason) {
  return FPErrorFromPOSIX(EOPNOTSUPP, source.path + " can't be copied, since " + reason);
}

// Sums the sizes of the documents of a tree. What can't be read counts nothing; the copy will name it.
std::int64_t Measure(int folder, const std::string &name, int depth, const FPCopyMeter &meter) {
  struct stat status {};
  if (meter.isCancelled() || fstatat(folder, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return 0;
  if (S_ISREG(status.st_mode)) return status.st_size;
  if (!S_ISDIR(status.st_mode) || depth > kDeepest) return 0;
  const FPDescriptor opened(openat(folder, name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  int error = 0;
  std::int64_t sum = 0;
  for (const std::string &child : FPNamesInFolder(opened.get(), &error)) {
    sum += Measure(opened.get(), child, depth + 1, meter);
  }
  return sum;
}

// Thread contract: for one thread.
class TreeCopy {
 public:
  TreeCopy(FPCopyPurpose purpose, const FPProgress &progress)
      : purpose_(purpose),
        meter_(progress),
        provider_(NSFileManager::defaultManager()->ubiquitousItemProvider()) {}

  NSError copy(const Source &source, const Destination &destination, int depth) {
    if (meter_.isCancelled()) return FPCancelledError(NSURL::fileURLWithPath(source.path));
    struct stat status {};
    if (fstatat(source.folder, source.name.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) {
      return failure(errno, source);
    }
    switch (status.st_mode & S_IFMT) {
      case S_IFREG:
        return copyDocument(source, destination);
      case S_IFDIR:
        return copyFolder(source, destination, depth);
      case S_IFLNK:
        return copyLink(source, status, destination);
      case S_IFSOCK:
        return Refused(source, "it is a socket");
      case S_IFIFO:
        return Refused(source, "it is a pipe");
      default:
        return Refused(source, "it is a device");
    }
  }
  const FPCopyMeter &meter() const { return meter_; }

 private:
  NSError copyDocument(const Source &source, const Destination &destination) {
    if (provider_ && provider_->isDataless(NSURL::fileURLWithPath(source.path))) {
      return Refused(source, "its contents aren't here; download it first");
    }
    // Never waits for a pipe that took the document's place.
    const FPDescriptor from(
        openat(source.folder, source.name.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
    struct stat before {};
    if (from.get() < 0 || fstat(from.get(), &before) != 0) return failure(errno, source);
    if (!S_ISREG(before.st_mode)) return Changed(source);
    const FPDescriptor to(
        openat(destination.folder, destination.name.c_str(), O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
    if (to.get() < 0) return failure(errno, source);
    const int error = FPCopyContents(from.get(), to.get(), before.st_size, meter_);
    if (error == ESTALE) return Changed(source);
    if (error != 0) return failure(error, source);
    meter_.finishFile(before.st_size);
    return finish(source, before, from.get(), to.get());
  }

  NSError copyFolder(const Source &source, const Destination &destination, int depth) {
    if (depth > kDeepest) return Refused(source, "it lies more than 200 folders deep");
    const FPDescriptor from(
        openat(source.folder, source.name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    struct stat before {};
    if (from.get() < 0 || fstat(from.get(), &before) != 0) return failure(errno, source);
    if (mkdirat(destination.folder, destination.name.c_str(), S_IRWXU) != 0) return failure(errno, source);
    const FPDescriptor to(openat(destination.folder, destination.name.c_str(),
                                 O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (to.get() < 0) return failure(errno, source);
    int error = 0;
    const auto names = FPNamesInFolder(from.get(), &error);
    if (error != 0) return failure(error, source);
    for (const std::string &name : names) {
      const NSError problem = copy({from.get(), name, source.path + "/" + name}, {to.get(), name}, depth + 1);
      if (problem) return problem;
    }
    if (depth == 0) before.st_mode |= S_IWUSR;
    return finish(source, before, from.get(), to.get());
  }

  NSError copyLink(const Source &source, const struct stat &status, const Destination &destination) {
    std::string target(static_cast<std::size_t>(status.st_size) + 4096, '\0');
    const ssize_t length = readlinkat(source.folder, source.name.c_str(), target.data(), target.size());
    if (length < 0) return failure(errno, source);
    target.resize(static_cast<std::size_t>(length));
    if (symlinkat(target.c_str(), destination.folder, destination.name.c_str()) != 0)
      return failure(errno, source);
    const timespec times[2] = {status.st_atim, status.st_mtim};
    (void)utimensat(destination.folder, destination.name.c_str(), times, AT_SYMLINK_NOFOLLOW);
    if (purpose_ == FPCopyPurpose::move) {
      (void)!fchownat(destination.folder, destination.name.c_str(), status.st_uid, status.st_gid,
                      AT_SYMLINK_NOFOLLOW);
    }
    return {};
  }

  // What describes an open item, once its contents are there; then looks whether the source is as it was.
  NSError finish(const Source &source, const struct stat &before, int from, int to) {
    std::string attribute;
    if (const int error = FPCopyAttributes(from, to, purpose_, &attribute)) {
      return FPErrorFromPOSIX(error, "the attribute " + attribute + " of " + source.path + " can't be kept");
    }
    const bool keepsOwner = purpose_ == FPCopyPurpose::move && fchown(to, before.st_uid, before.st_gid) == 0;
    // Rights that are given with a file's owner aren't given to another.
    const mode_t mode = before.st_mode & (keepsOwner ? 07777U : 0777U);
    const timespec times[2] = {before.st_atim, before.st_mtim};
    if (fchmod(to, mode) != 0 || futimens(to, times) != 0) return failure(errno, source);
    if (purpose_ == FPCopyPurpose::move && fsync(to) != 0) return failure(errno, source);
    struct stat after {};
    if (fstat(from, &after) != 0) return failure(errno, source);
    return IsUnchanged(before, after) ? NSError() : Changed(source);
  }

  NSError failure(int code, const Source &source) const {
    const NSURL url = NSURL::fileURLWithPath(source.path);
    return code == ECANCELED ? FPCancelledError(url)
                             : FPErrorFromPOSIX(code, source.path + " can't be copied");
  }

  const FPCopyPurpose purpose_;
  FPCopyMeter meter_;
  const std::shared_ptr<NSUbiquitousItemProviding> provider_;
};

}  // namespace

NSError FPCopyItem(const NSURL &source, int folder, const std::string &name, FPCopyPurpose purpose,
                   const FPProgress &progress) {
  TreeCopy tree(purpose, progress);
  if (progress) progress->setTotalUnitCount(Measure(AT_FDCWD, source.path(), 0, tree.meter()));
  return tree.copy({AT_FDCWD, source.path(), source.path()}, {folder, name}, 0);
}

void FPFinishCopiedMode(const NSURL &source, const NSURL &copy) {
  struct stat status {};
  if (lstat(source.path().c_str(), &status) != 0 || !S_ISDIR(status.st_mode) ||
      (status.st_mode & S_IWUSR) != 0)
    return;
  struct stat copied {};
  if (lstat(copy.path().c_str(), &copied) != 0 || !S_ISDIR(copied.st_mode)) return;
  (void)chmod(copy.path().c_str(), copied.st_mode & 07777U & ~static_cast<mode_t>(S_IWUSR));
}

}  // namespace droxa
