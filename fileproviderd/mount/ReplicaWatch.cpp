#include "fileproviderd/mount/ReplicaWatch.h"

#include <array>
#include <cerrno>
#include <poll.h>
#include <string>
#include <sys/eventfd.h>
#include <sys/inotify.h>

namespace droxa {

namespace {

constexpr std::uint32_t kEvents =
    IN_CREATE | IN_DELETE | IN_MOVED_FROM | IN_MOVED_TO | IN_MODIFY | IN_ATTRIB | IN_ONLYDIR | IN_EXCL_UNLINK;
constexpr std::size_t kBuffer = 256 * 1024;

}  // namespace

bool ReplicaWatch::start(Seen seen, Missed missed) {
  events_ = Descriptor(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  end_ = Descriptor(::eventfd(0, EFD_CLOEXEC));
  if (!events_ || !end_) return false;
  seen_ = std::move(seen);
  missed_ = std::move(missed);
  thread_ = std::thread([this] { run(); });
  return true;
}

void ReplicaWatch::stop() {
  if (!thread_.joinable()) return;
  ::eventfd_write(end_.get(), 1);
  thread_.join();
}

bool ReplicaWatch::add(NodeId folder, int pathDescriptor) {
  if (!events_) return false;
  const std::string path = "/proc/self/fd/" + std::to_string(pathDescriptor);
  const Lock held(lock_);
  if (watches_.contains(folder)) return true;
  const int watch = ::inotify_add_watch(events_.get(), path.c_str(), kEvents);
  if (watch < 0) return false;
  // One folder has one watch, whatever node stood for it before.
  const auto [found, isNew] = folders_.emplace(watch, folder);
  if (!isNew) watches_.erase(std::exchange(found->second, folder));
  watches_[folder] = watch;
  return true;
}

void ReplicaWatch::remove(NodeId folder) {
  const Lock held(lock_);
  const auto found = watches_.find(folder);
  if (found == watches_.end()) return;
  ::inotify_rm_watch(events_.get(), found->second);
  folders_.erase(found->second);
  watches_.erase(found);
}

bool ReplicaWatch::isWatched(NodeId folder) const {
  const Lock held(lock_);
  return watches_.contains(folder);
}

std::size_t ReplicaWatch::size() const {
  const Lock held(lock_);
  return watches_.size();
}

void ReplicaWatch::run() {
  std::array<pollfd, 2> waited{{{events_.get(), POLLIN, 0}, {end_.get(), POLLIN, 0}}};
  for (;;) {
    if (::poll(waited.data(), waited.size(), -1) < 0 && errno != EINTR) return;
    if (waited[1].revents != 0) return;
    if (waited[0].revents != 0) readEvents();
  }
}

void ReplicaWatch::readEvents() {
  alignas(inotify_event) static thread_local std::array<char, kBuffer> buffer;
  ssize_t length = 0;
  while ((length = ::read(events_.get(), buffer.data(), buffer.size())) > 0) {
    const char *at = buffer.data();
    while (at < buffer.data() + length) {
      const auto *event = reinterpret_cast<const inotify_event *>(at);
      at += sizeof(inotify_event) + event->len;
      if ((event->mask & IN_Q_OVERFLOW) != 0) {
        missed_();
        continue;
      }
      NodeId folder = 0;
      {
        const Lock held(lock_);
        const auto found = folders_.find(event->wd);
        if (found == folders_.end()) continue;
        folder = found->second;
        if ((event->mask & IN_IGNORED) != 0) {
          watches_.erase(folder);
          folders_.erase(found);
          continue;
        }
      }
      seen_(folder, event->len > 0 ? std::string(event->name) : std::string(),
            (event->mask & (IN_CREATE | IN_MOVED_TO)) != 0);
    }
  }
}

}  // namespace droxa
