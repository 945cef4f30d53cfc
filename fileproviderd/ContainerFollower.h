#pragma once

#include <chrono>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/KnownItems.h"
#include "fileproviderd/Watcher.h"
#include "platform/dispatch/dispatch.h"

namespace droxa {

// How long a follower waits before it tries a container again that couldn't be listed.
struct FollowerTiming {
  std::chrono::milliseconds firstRetry{250};
  std::chrono::milliseconds longestRetry{10'000};
};

// Keeps an enumerator of one container open and what it lists in memory, asks for changes whenever the
// container is signalled, and tells the watchers what came of it.
//
//   opening → anchoring → listing ⇄ changing → idle         a signal:            idle → changing
//      ↑____________________________|                       an expired anchor:   changing → anchoring
//      waiting  ← any failure                               a new extension:     any → opening
//
// The anchor is taken before the first page is asked for, and a signal that comes during the listing is
// followed at the next page, so nothing that happens meanwhile is missed. The listing of a container that is
// followed already only serves to find the difference. Of a container with more items than there is room for
// nothing is kept: its watchers are told of changes without what was before, and of a new listing by
// `relisted`.
//
// Thread contract: the public operations on any thread; all else on queue_. Watchers are told on queue_.
class ContainerFollower final : public std::enable_shared_from_this<ContainerFollower> {
 public:
  using Ready = std::function<void(const NSError &error)>;

  static std::shared_ptr<ContainerFollower> create(std::string identifier,
                                                   std::shared_ptr<ExtensionCalls> calls,
                                                   std::shared_ptr<ItemBudget> budget,
                                                   FollowerTiming timing = {});

  // Tells `watcher` of every change that happens after `ready` was called without an error. `ready` is called
  // exactly once, on queue_.
  void addWatcher(std::shared_ptr<Watcher> watcher, Ready ready);
  void removeWatcher(const std::shared_ptr<Watcher> &watcher);
  void signal();          // the container has changes to ask for
  void extensionEnded();  // the enumerator is gone
  void close();           // lets go of the enumerator and of all items
  const dispatch_queue_t &queue() const { return queue_; }

 private:
  enum class Phase { closed, opening, anchoring, listing, changing, idle, waiting };
  using Round = std::uint64_t;
  struct Waiting {
    std::shared_ptr<Watcher> watcher;
    Ready ready;
  };

  ContainerFollower(std::string identifier, std::shared_ptr<ExtensionCalls> calls,
                    std::shared_ptr<ItemBudget> budget, FollowerTiming timing);

  // Each step asks the extension; its answer comes back on queue_ and is dropped when its round is over.
  void open();
  void takeAnchor();
  void listPage(const NSData &page);
  void askForChanges();
  void opened(std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator, const NSError &error);
  void listed(const NSFileProviderItems &items, const NSData &next, const NSError &error);
  void changed(const NSFileProviderItems &updated, const std::vector<std::string> &deleted,
               const NSData &anchor, bool moreComing, const NSError &error);

  void goOn();  // after a page or a batch: the next step
  void finishListing();
  void becomeIdle();
  void failed(const NSError &error);
  void retryLater();
  void startOver();  // gives up the round, and the enumerator with it

  void keepListed(const KnownItems::Item &item);
  void keepChanged(const KnownItems::Item &item);
  void stopKeeping();
  void apply(const NSFileProviderItems &updated, const std::vector<std::string> &deleted);
  bool movedAway(const KnownItems::Item &before, const NSFileProviderItem &now) const;
  void tell(const std::vector<FPDChange> &changes);
  void answerWaiting(const NSError &error);
  // Runs `step` on queue_ unless the round that it belongs to is over by then.
  std::function<void(std::function<void()>)> inThisRound();

  // Constant after construction.
  const std::string identifier_;
  const std::shared_ptr<ExtensionCalls> calls_;
  const FollowerTiming timing_;
  const dispatch_queue_t queue_;

  // On queue_ only.
  Phase phase_ = Phase::closed;
  Round round_ = 0;  // of the newest enumerator or attempt
  std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator_;
  NSData anchor_;             // nil: the container doesn't track changes
  NSData nextPage_;           // while listing: where it goes on
  bool isListing_ = false;    // pages are still to come, whatever is done in between
  bool isSignalled_ = false;  // since the newest change request was made
  bool hasBase_ = false;      // the container was listed once
  bool isBaseKept_ = false;   // known_ is all of it
  bool isKeeping_ = true;     // there has been room for the listing under way
  bool hasToldFailure_ = false;
  int expiries_ = 0;  // in a row
  int ends_ = 0;      // of the extension, since the follower was idle
  std::chrono::milliseconds retry_;
  KnownItems known_;
  KnownItems fresh_;  // the listing under way
  std::vector<std::shared_ptr<Watcher>> watchers_;
  std::vector<Waiting> waiting_;
};

}  // namespace droxa
