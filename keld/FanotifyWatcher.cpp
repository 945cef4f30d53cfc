// Watches the file system that the replica is on, as a whole, and passes on what is of the replica. Needs
// privileges, and costs nothing per folder.

#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <optional>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/fanotify.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <unordered_map>
#include <vector>

#include "keld/FolderReading.h"
#include "keld/ReplicaWatcher.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kEvents = FAN_CREATE | FAN_DELETE | FAN_MOVED_FROM | FAN_MOVED_TO | FAN_MODIFY |
                                  FAN_ATTRIB | FAN_CLOSE_WRITE | FAN_ONDIR;
// What is frequent, and is told even of files that nobody here asks about: of every write to a database, too.
constexpr std::uint64_t kIgnoredElsewhere = FAN_MODIFY | FAN_CLOSE_WRITE | FAN_EVENT_ON_CHILD;
constexpr std::size_t kMostKnownFolders = 8192;

// Thread contract: the watcher's thread reads; nothing else touches the members after start.
class FanotifyWatcher final : public ReplicaWatcher {
 public:
  FanotifyWatcher(OwnedDescriptor events, OwnedDescriptor replica, std::string realPath,
                  std::uint64_t replicaInode, ReplicaWatcherSink &sink)
      : events_(std::move(events)),
        replica_(std::move(replica)),
        stop_(::eventfd(0, EFD_CLOEXEC)),
        realPath_(std::move(realPath)),
        replicaInode_(replicaInode),
        sink_(sink),
        thread_([this] { run(); }) {}

  ~FanotifyWatcher() override {
    const std::uint64_t one = 1;
    (void)!::write(stop_.get(), &one, sizeof one);
    thread_.join();
  }

  void folderAppeared(ItemNumber, int) override {}
  void folderVanished(ItemNumber) override {}
  std::string description() const override { return "fanotify"; }
  bool needsScanning() const override { return false; }

 private:
  void run();
  void handle(const fanotify_event_metadata &event, const char *bytes);  // `bytes`: the whole event
  std::optional<std::uint64_t> folderInode(const file_handle &handle);   // nullopt: not of the replica
  std::optional<std::uint64_t> resolve(const file_handle &handle);
  void ignoreFilesIn(const std::string &folder);
  void forgetFolders();

  const OwnedDescriptor events_, replica_, stop_;
  const std::string realPath_;
  const std::uint64_t replicaInode_;
  ReplicaWatcherSink &sink_;
  std::unordered_map<std::string, std::optional<std::uint64_t>>
      known_;  // by the bytes of the folder's handle
  std::thread thread_;
};

void FanotifyWatcher::run() {
  alignas(fanotify_event_metadata) char buffer[65536];
  pollfd waits[2] = {{events_.get(), POLLIN, 0}, {stop_.get(), POLLIN, 0}};
  for (;;) {
    if (::poll(waits, 2, -1) < 0 && errno != EINTR) return;
    if (waits[1].revents != 0) return;
    const ssize_t length = ::read(events_.get(), buffer, sizeof buffer);
    // Events follow one another without regard to the alignment of their 64-bit fields, so each head is
    // copied out.
    for (ssize_t at = 0; length - at >= static_cast<ssize_t>(sizeof(fanotify_event_metadata));) {
      fanotify_event_metadata event;
      std::memcpy(&event, buffer + at, sizeof event);
      if (event.event_len < sizeof event || event.event_len > length - at) break;
      handle(event, buffer + at);
      at += event.event_len;
    }
  }
}

void FanotifyWatcher::handle(const fanotify_event_metadata &event, const char *bytes) {
  if (event.mask & FAN_Q_OVERFLOW)
    return sink_.replicaChangesLost("the queue of file-system events ran over");
  // A folder that moved may have come into the replica, or left it, with all that is below.
  if ((event.mask & FAN_ONDIR) && (event.mask & (FAN_MOVED_FROM | FAN_MOVED_TO))) forgetFolders();
  const char *at = bytes + event.metadata_len;
  const char *const end = bytes + event.event_len;
  while (at + sizeof(fanotify_event_info_header) <= end) {
    fanotify_event_info_header header;
    std::memcpy(&header, at, sizeof header);
    if (header.len < sizeof header || at + header.len > end) return;
    if (header.info_type == FAN_EVENT_INFO_TYPE_DFID_NAME) {
      const auto *info = reinterpret_cast<const fanotify_event_info_fid *>(at);
      const auto *folder = reinterpret_cast<const file_handle *>(info->handle);
      if (const auto inode = folderInode(*folder)) {
        const char *name = reinterpret_cast<const char *>(folder->f_handle) + folder->handle_bytes;
        ReplicaHint hint;
        hint.inode = *inode == replicaInode_ ? 0 : *inode;
        hint.name = std::strcmp(name, ".") == 0 ? "" : name;
        sink_.replicaChanged(std::move(hint));
      }
    }
    at += header.len;
  }
}

std::optional<std::uint64_t> FanotifyWatcher::folderInode(const file_handle &handle) {
  std::string key(reinterpret_cast<const char *>(handle.f_handle), handle.handle_bytes);
  key.append(reinterpret_cast<const char *>(&handle.handle_type), sizeof handle.handle_type);
  if (const auto found = known_.find(key); found != known_.end()) return found->second;
  if (known_.size() >= kMostKnownFolders) known_.clear();
  return known_[key] = resolve(handle);
}

std::optional<std::uint64_t> FanotifyWatcher::resolve(const file_handle &handle) {
  std::vector<char> copy(sizeof(file_handle) + handle.handle_bytes);
  std::memcpy(copy.data(), &handle, copy.size());
  const OwnedDescriptor folder(
      ::open_by_handle_at(replica_.get(), reinterpret_cast<file_handle *>(copy.data()), O_PATH | O_CLOEXEC));
  struct stat status;
  if (!folder || ::fstat(folder.get(), &status) != 0) return std::nullopt;
  char path[PATH_MAX];
  const std::string link = "/proc/self/fd/" + std::to_string(folder.get());
  const ssize_t length = ::readlink(link.c_str(), path, sizeof path);
  // A path that is too long to be told may be of the replica; the item table will know.
  if (length < 0) return status.st_ino;
  const std::string_view told(path, static_cast<std::size_t>(length));
  const bool isInside = told.substr(0, realPath_.size()) == realPath_ &&
                        (told.size() == realPath_.size() || told[realPath_.size()] == '/');
  if (isInside) return status.st_ino;
  ignoreFilesIn(link);
  return std::nullopt;
}

// Each event wakes this thread, also those of keld's own writes. Where the kernel doesn't know such marks,
// all events go on coming. The kernel drops a mark with its folder when it is short of memory.
void FanotifyWatcher::ignoreFilesIn(const std::string &folder) {
  (void)::fanotify_mark(events_.get(), FAN_MARK_ADD | FAN_MARK_IGNORE_SURV | FAN_MARK_EVICTABLE,
                        kIgnoredElsewhere, AT_FDCWD, folder.c_str());
}

// Before the move is passed on: whoever looks at the folder then misses nothing that comes later.
void FanotifyWatcher::forgetFolders() {
  known_.clear();
  (void)::fanotify_mark(events_.get(), FAN_MARK_FLUSH, 0, AT_FDCWD, nullptr);
}

}  // namespace

std::unique_ptr<ReplicaWatcher> MakeFanotifyWatcher(const std::string &replicaPath, ReplicaWatcherSink &sink,
                                                    std::string *problem) {
  const auto failed = [problem](const char *what) {
    *problem = std::string(what) + ": " + std::strerror(errno);
    return nullptr;
  };
  OwnedDescriptor events(::fanotify_init(FAN_CLASS_NOTIF | FAN_REPORT_DFID_NAME | FAN_CLOEXEC | FAN_NONBLOCK,
                                         O_RDONLY | O_CLOEXEC));
  if (!events) return failed("fanotify_init");
  OwnedDescriptor replica(::open(replicaPath.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  struct stat status;
  if (!replica || ::fstat(replica.get(), &status) != 0) return failed(replicaPath.c_str());
  if (::fanotify_mark(events.get(), FAN_MARK_ADD | FAN_MARK_FILESYSTEM, kEvents, replica.get(), nullptr) != 0)
    return failed("fanotify_mark");
  char *real = ::realpath(replicaPath.c_str(), nullptr);
  if (!real) return failed(replicaPath.c_str());
  std::string realPath = real;
  std::free(real);
  // The handles that events carry must be of use here.
  std::vector<char> memory(sizeof(file_handle) + MAX_HANDLE_SZ);
  auto *handle = reinterpret_cast<file_handle *>(memory.data());
  handle->handle_bytes = MAX_HANDLE_SZ;
  int mount = 0;
  if (::name_to_handle_at(replica.get(), "", handle, &mount, AT_EMPTY_PATH) != 0)
    return failed("name_to_handle_at");
  const OwnedDescriptor back(::open_by_handle_at(replica.get(), handle, O_PATH | O_CLOEXEC));
  if (!back) return failed("open_by_handle_at");
  return std::make_unique<FanotifyWatcher>(std::move(events), std::move(replica), std::move(realPath),
                                           status.st_ino, sink);
}

}  // namespace droxa::keld
