#include "fileproviderd/FollowedContainers.h"

#include <vector>

namespace droxa {

FollowedContainers::FollowedContainers(std::shared_ptr<ExtensionCalls> calls,
                                       std::shared_ptr<ItemBudget> budget, FollowerTiming timing)
    : calls_(std::move(calls)), budget_(std::move(budget)), timing_(timing) {}

FollowedContainers::~FollowedContainers() {
  for (const auto &[identifier, entry] : entries_) entry.follower->close();
}

void FollowedContainers::watch(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                               FPDWatchCompletion completion) {
  auto watcher = std::make_shared<Watcher>(identifier, std::move(observer));
  Follower follower;
  {
    Lock held(lock_);
    Entry &entry = entries_[identifier];
    if (!entry.follower) entry.follower = ContainerFollower::create(identifier, calls_, budget_, timing_);
    ++entry.watchers;
    unwatched_.remove(identifier);
    follower = entry.follower;
  }
  auto stop = [weak = weak_from_this(), identifier, follower, watcher] {
    watcher->stop();
    if (auto self = weak.lock()) self->unwatch(identifier, follower, watcher);
  };
  follower->addWatcher(watcher, [stop, completion](const NSError &error) {
    if (!error) {
      completion(std::make_shared<WatchHandle>(stop), NSError());
      return;
    }
    stop();
    completion(nullptr, error);
  });
}

void FollowedContainers::unwatch(const std::string &identifier, const Follower &follower,
                                 const std::shared_ptr<Watcher> &watcher) {
  std::vector<Follower> closed;
  {
    Lock held(lock_);
    const auto found = entries_.find(identifier);
    if (found == entries_.end() || found->second.follower != follower) return;
    if (--found->second.watchers == 0) unwatched_.push_front(identifier);
    while (unwatched_.size() > kMostUnwatched) {
      closed.push_back(entries_[unwatched_.back()].follower);
      entries_.erase(unwatched_.back());
      unwatched_.pop_back();
    }
  }
  follower->removeWatcher(watcher);
  for (const Follower &one : closed) one->close();
}

void FollowedContainers::signal(const std::string &identifier) {
  Follower follower;
  {
    Lock held(lock_);
    const auto found = entries_.find(identifier);
    if (found != entries_.end()) follower = found->second.follower;
  }
  if (follower) follower->signal();
}

// What nobody watches isn't worth starting the extension again.
void FollowedContainers::extensionEnded() {
  std::vector<Follower> watched;
  std::vector<Follower> closed;
  {
    Lock held(lock_);
    for (const std::string &identifier : unwatched_) {
      closed.push_back(entries_[identifier].follower);
      entries_.erase(identifier);
    }
    unwatched_.clear();
    for (const auto &[identifier, entry] : entries_) watched.push_back(entry.follower);
  }
  for (const Follower &one : closed) one->close();
  for (const Follower &one : watched) one->extensionEnded();
}

std::uint64_t FollowedContainers::followedCount() const {
  Lock held(lock_);
  return entries_.size();
}

std::uint64_t FollowedContainers::watcherCount() const {
  Lock held(lock_);
  std::uint64_t count = 0;
  for (const auto &[identifier, entry] : entries_) count += entry.watchers;
  return count;
}

}  // namespace droxa
