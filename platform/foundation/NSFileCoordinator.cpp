#include "platform/foundation/NSFileCoordinator.h"

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <fcntl.h>
#include <functional>
#include <unistd.h>
#include <utility>

#include "platform/foundation/FileCoordinationFile.h"
#include "platform/foundation/FileLocks.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

using Clock = std::chrono::steady_clock;

// Wakes the waiters of this process when an access of this process is given back. Those of other processes
// are looked for again after a moment, as is a wake that was missed.
struct Releases {
  Mutex mutex;
  std::condition_variable_any released;
};

Releases &AllReleases() {
  static Releases &releases = *new Releases;
  return releases;
}

void WaitForRelease(std::chrono::milliseconds moment) {
  Releases &releases = AllReleases();
  Lock lock(releases.mutex);
  releases.released.wait_for(lock, moment);
}

NSError Failure(std::int64_t code, int posixCode, const std::string &description) {
  return {NSCocoaErrorDomain,
          code,
          {{NSLocalizedDescriptionKey, description},
           {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(posixCode)}}};
}

// The path by which everybody knows the item: its folder as the kernel names it. A folder that isn't there
// is known by its text.
std::string CoordinatedPath(const NSURL &url) {
  const NSURL parent = url.URLByDeletingLastPathComponent();
  const int folder = open(parent.path().c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
  if (folder < 0) return url.path();
  std::string path(4096, '\0');
  const std::string link = "/proc/self/fd/" + std::to_string(folder);
  const ssize_t length = readlink(link.c_str(), path.data(), path.size());
  close(folder);
  if (length <= 0 || path[0] != '/' || static_cast<std::size_t>(length) == path.size()) return url.path();
  path.resize(static_cast<std::size_t>(length));
  return (path == "/" ? "" : path) + "/" + url.lastPathComponent();
}

// One attempt to take the locks of a plan. Beside each lock is its turnstile, which one who has to wait
// holds while it waits: whoever comes later finds it held, and queues there instead of overtaking.
// Thread contract: for one thread.
class Taking {
 public:
  Taking(int descriptor, std::shared_ptr<NSProgress> progress, std::chrono::milliseconds patience)
      : descriptor_(descriptor), progress_(std::move(progress)), patience_(patience) {}

  NSError takeAll(const FileLockPlan &plan) {
    for (const auto &[offset, entry] : plan.entries()) {
      if (const NSError error = take(offset, entry)) return error;
    }
    return {};
  }

 private:
  NSError take(off_t offset, const FileLockPlan::Entry &entry) {
    int code = FileLockTestFree(descriptor_, offset + 1);
    if (code == 0) code = FileLockTry(descriptor_, offset, entry.isWriting);
    if (code != EAGAIN) return failure(code, entry.path);
    NSError error = wait(entry.path, [&] { return FileLockTry(descriptor_, offset + 1, true); });
    if (error) return error;
    error = wait(entry.path, [&] { return FileLockTry(descriptor_, offset, entry.isWriting); });
    FileLockRelease(descriptor_, offset + 1);
    return error;
  }

  NSError wait(const std::string &path, const std::function<int()> &attempt) {
    std::chrono::milliseconds moment{1};
    while (true) {
      const int code = attempt();
      if (code != EAGAIN) return failure(code, path);
      if (progress_ && progress_->isCancelled()) return failure(ECANCELED, path);
      if (Clock::now() - start_ > patience_) return failure(ETIMEDOUT, path);
      WaitForRelease(moment);
      moment = std::min(moment * 2, std::chrono::milliseconds(16));
    }
  }

  NSError failure(int code, const std::string &path) const {
    if (code == 0) return {};
    if (code == ECANCELED) {
      return Failure(NSUserCancelledError, code, "waiting for " + path + " was cancelled");
    }
    if (code == ETIMEDOUT) {
      const auto seconds = std::to_string(patience_.count() / 1000);
      return Failure(NSFileWriteUnknownError, code,
                     path + " is being worked on by somebody else, and wasn't free within " + seconds +
                         " s; try again later");
    }
    return Failure(NSFileWriteUnknownError, code, path + " can't be coordinated");
  }

  const int descriptor_;
  const std::shared_ptr<NSProgress> progress_;
  const std::chrono::milliseconds patience_;
  const Clock::time_point start_ = Clock::now();
};

struct Default {
  Mutex mutex;
  std::shared_ptr<const NSFileCoordinator> coordinator GUARDED_BY(mutex);
};

Default &TheDefault() {
  static Default &shared = *new Default;
  return shared;
}

}  // namespace

NSFileAccess::~NSFileAccess() {
  close(descriptor_);
  AllReleases().released.notify_all();
}

NSFileCoordinator::NSFileCoordinator(std::string lockFile, std::chrono::milliseconds patience)
    : lockFile_(std::move(lockFile)), patience_(patience) {}

std::shared_ptr<const NSFileCoordinator> NSFileCoordinator::defaultCoordinator() {
  Default &shared = TheDefault();
  const Lock lock(shared.mutex);
  if (!shared.coordinator) shared.coordinator = std::make_shared<NSFileCoordinator>(FileCoordinationFile());
  return shared.coordinator;
}

void NSFileCoordinator::setDefaultForTesting(std::shared_ptr<const NSFileCoordinator> coordinator) {
  Default &shared = TheDefault();
  const Lock lock(shared.mutex);
  shared.coordinator.swap(coordinator);
}

std::unique_ptr<NSFileAccess> NSFileCoordinator::coordinateAccess(
    const std::vector<NSFileAccessIntent> &intents, const std::shared_ptr<NSProgress> &progress,
    NSError *error) const {
  FileLockPlan plan;
  for (const NSFileAccessIntent &intent : intents) plan.add(CoordinatedPath(intent.url), intent.isWriting);
  const int descriptor = open(lockFile_.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600);
  if (descriptor < 0) {
    const int code = errno;
    const std::string file = lockFile_.empty() ? "/tmp/droxa-" + std::to_string(geteuid()) : lockFile_;
    *error = Failure(NSFileWriteUnknownError, code,
                     "files can't be coordinated: " + file + " can't be used; it must be this user's own");
    return nullptr;
  }
  std::unique_ptr<NSFileAccess> access(new NSFileAccess(descriptor));
  const NSError failure = Taking(descriptor, progress, patience_).takeAll(plan);
  if (!failure) return access;
  *error = failure;
  return nullptr;
}

}  // namespace droxa
