// Watches each folder of the replica on its own. Needs no privileges; the number of watches is limited, and
// when they run out the rest is found by scanning.

#include <atomic>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/inotify.h>
#include <thread>
#include <unistd.h>
#include <unordered_map>

#include "keld/FolderReading.h"
#include "keld/ReplicaWatcher.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::uint32_t kEvents =
    IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_MODIFY | IN_ATTRIB | IN_CLOSE_WRITE | IN_ONLYDIR;

// Thread contract: folderAppeared and folderVanished on the keeper's thread; the watcher's own thread reads
// events.
class InotifyWatcher final : public ReplicaWatcher {
 public:
  InotifyWatcher(OwnedDescriptor events, ReplicaWatcherSink &sink)
      : events_(std::move(events)),
        stop_(::eventfd(0, EFD_CLOEXEC)),
        sink_(sink),
        thread_([this] { run(); }) {}

  ~InotifyWatcher() override {
    const std::uint64_t one = 1;
    (void)!::write(stop_.get(), &one, sizeof one);
    thread_.join();
  }

  void folderAppeared(ItemNumber folder, int descriptor) override;
  void folderVanished(ItemNumber folder) override;
  bool needsScanning() const override { return ranOut_; }
  std::string description() const override {
    return ranOut_ ? "scanning, because the inotify watches ran out (raise fs.inotify.max_user_watches)"
                   : "inotify";
  }

 private:
  void run();
  void handle(const inotify_event &event);

  const OwnedDescriptor events_, stop_;
  ReplicaWatcherSink &sink_;
  std::atomic<bool> ranOut_{false};
  Mutex mutex_;
  std::unordered_map<int, ItemNumber> folders_ GUARDED_BY(mutex_);  // by watch
  std::unordered_map<ItemNumber, int> watches_ GUARDED_BY(mutex_);
  std::thread thread_;
};

void InotifyWatcher::folderAppeared(ItemNumber folder, int descriptor) {
  if (ranOut_) return;
  const std::string path = "/proc/self/fd/" + std::to_string(descriptor);
  const Lock lock(mutex_);
  const int watch = ::inotify_add_watch(events_.get(), path.c_str(), kEvents);
  if (watch >= 0) {
    folders_[watch] = folder;
    watches_[folder] = watch;
    return;
  }
  if (errno != ENOSPC && errno != ENOMEM) return;  // it has gone: its parent's events tell
  ranOut_ = true;
  os_log(qvc_default_log(),
         "[WARNING] out of inotify watches after %lu folders: the replica is scanned from time to time "
         "instead. Raise "
         "fs.inotify.max_user_watches, or run with the privilege for fanotify.",
         watches_.size());
}

void InotifyWatcher::folderVanished(ItemNumber folder) {
  const Lock lock(mutex_);
  const auto found = watches_.find(folder);
  if (found == watches_.end()) return;
  // A folder that was removed has lost its watch already; one that was moved away still has it.
  ::inotify_rm_watch(events_.get(), found->second);
  folders_.erase(found->second);
  watches_.erase(found);
}

void InotifyWatcher::run() {
  alignas(inotify_event) char buffer[65536];
  pollfd waits[2] = {{events_.get(), POLLIN, 0}, {stop_.get(), POLLIN, 0}};
  for (;;) {
    if (::poll(waits, 2, -1) < 0 && errno != EINTR) return;
    if (waits[1].revents != 0) return;
    const ssize_t length = ::read(events_.get(), buffer, sizeof buffer);
    for (ssize_t at = 0; at < length;) {
      const auto *event = reinterpret_cast<const inotify_event *>(buffer + at);
      handle(*event);
      at += static_cast<ssize_t>(sizeof *event + event->len);
    }
  }
}

void InotifyWatcher::handle(const inotify_event &event) {
  if (event.mask & IN_Q_OVERFLOW) return sink_.replicaChangesLost("the queue of file-system events ran over");
  ReplicaHint hint;
  {
    const Lock lock(mutex_);
    const auto found = folders_.find(event.wd);
    if (found == folders_.end()) return;
    hint.folder = found->second;
  }
  if (event.mask & (IN_IGNORED | IN_UNMOUNT)) return;
  if (event.len > 0) hint.name = event.name;
  if (hint.folder != kReplicaFolder || !hint.name.empty()) sink_.replicaChanged(std::move(hint));
}

}  // namespace

std::unique_ptr<ReplicaWatcher> MakeInotifyWatcher(ReplicaWatcherSink &sink, std::string *problem) {
  OwnedDescriptor events(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  if (events) return std::make_unique<InotifyWatcher>(std::move(events), sink);
  *problem = std::string("inotify_init1: ") + std::strerror(errno);
  return nullptr;
}

}  // namespace droxa::keld
