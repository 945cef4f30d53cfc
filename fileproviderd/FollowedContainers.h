#pragma once

#include <list>
#include <map>
#include <memory>
#include <string>

#include "fileproviderd/ContainerFollower.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// The containers that the host follows: those with watchers, and the few whose watchers went last, which
// would otherwise have to be listed anew by the next. Thread contract: any thread; lock_ guards the table and
// is never held while a follower is called.
class FollowedContainers final : public std::enable_shared_from_this<FollowedContainers> {
 public:
  static constexpr std::size_t kMostUnwatched = 8;

  explicit FollowedContainers(std::shared_ptr<ExtensionCalls> calls,
                              std::shared_ptr<ItemBudget> budget = std::make_shared<ItemBudget>(),
                              FollowerTiming timing = {});
  ~FollowedContainers();

  void watch(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
             FPDWatchCompletion completion);
  void signal(const std::string &identifier);
  void extensionEnded();

  std::uint64_t followedCount() const;
  std::uint64_t watcherCount() const;
  std::uint64_t cachedItemCount() const { return budget_->used(); }

 private:
  using Follower = std::shared_ptr<ContainerFollower>;
  struct Entry {
    Follower follower;
    std::size_t watchers = 0;
  };
  void unwatch(const std::string &identifier, const Follower &follower,
               const std::shared_ptr<Watcher> &watcher);

  const std::shared_ptr<ExtensionCalls> calls_;
  const std::shared_ptr<ItemBudget> budget_;
  const FollowerTiming timing_;
  mutable Mutex lock_;
  std::map<std::string, Entry> entries_ GUARDED_BY(lock_);
  std::list<std::string> unwatched_ GUARDED_BY(lock_);  // the most recent first
};

}  // namespace droxa
