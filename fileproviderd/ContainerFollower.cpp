#include "fileproviderd/ContainerFollower.h"

#include <algorithm>

#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {
constexpr int kMostExpiries = 3;  // in a row, before the container is left alone for a while
constexpr int kMostEnds = 2;      // of the extension while it works on the container, before the same
}  // namespace

std::shared_ptr<ContainerFollower> ContainerFollower::create(std::string identifier,
                                                             std::shared_ptr<ExtensionCalls> calls,
                                                             std::shared_ptr<ItemBudget> budget,
                                                             FollowerTiming timing) {
  return std::shared_ptr<ContainerFollower>(
      new ContainerFollower(std::move(identifier), std::move(calls), std::move(budget), timing));
}

ContainerFollower::ContainerFollower(std::string identifier, std::shared_ptr<ExtensionCalls> calls,
                                     std::shared_ptr<ItemBudget> budget, FollowerTiming timing)
    : identifier_(std::move(identifier)),
      calls_(std::move(calls)),
      timing_(timing),
      queue_(dispatch_queue_create("follow " + identifier_, DISPATCH_QUEUE_SERIAL)),
      retry_(timing.firstRetry),
      known_(budget),
      fresh_(budget) {}

void ContainerFollower::addWatcher(std::shared_ptr<Watcher> watcher, Ready ready) {
  dispatch_async(queue_, [self = shared_from_this(), watcher, ready] {
    if (self->phase_ == Phase::idle) {
      self->watchers_.push_back(watcher);
      ready(NSError());
      return;
    }
    self->waiting_.push_back({watcher, ready});
    if (self->phase_ == Phase::closed || self->phase_ == Phase::waiting) self->open();
  });
}

void ContainerFollower::removeWatcher(const std::shared_ptr<Watcher> &watcher) {
  dispatch_async(queue_, [self = shared_from_this(), watcher] { std::erase(self->watchers_, watcher); });
}

void ContainerFollower::signal() {
  dispatch_async(queue_, [self = shared_from_this()] {
    self->isSignalled_ = true;
    if (self->phase_ == Phase::idle) self->goOn();
    if (self->phase_ == Phase::waiting) self->open();
  });
}

void ContainerFollower::extensionEnded() {
  dispatch_async(queue_, [self = shared_from_this()] {
    // Without an enumerator there is nothing that could have been lost.
    if (self->enumerator_) self->failed(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  });
}

void ContainerFollower::close() {
  dispatch_async(queue_, [self = shared_from_this()] {
    self->startOver();
    self->watchers_.clear();
    self->hasBase_ = self->isBaseKept_ = false;
    self->known_.clear();
    self->phase_ = Phase::closed;
    self->answerWaiting(NSError(NSCocoaErrorDomain, NSUserCancelledError));
  });
}

std::function<void(std::function<void()>)> ContainerFollower::inThisRound() {
  return [self = shared_from_this(), round = round_](const std::function<void()> &step) {
    dispatch_async(self->queue_, [self, round, step] {
      if (self->round_ == round) step();
    });
  };
}

void ContainerFollower::open() {
  startOver();
  phase_ = Phase::opening;
  calls_->enumeratorForContainer(
      identifier_,
      [this, run = inThisRound()](const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator,
                                  const NSError &error) {
        run([this, enumerator, error] { opened(enumerator, error); });
      });
}

void ContainerFollower::opened(std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator,
                               const NSError &error) {
  if (!enumerator) {
    failed(error ? error : fileProviderErrorForNonExistentItemWithIdentifier(identifier_));
    return;
  }
  enumerator_ = std::move(enumerator);
  takeAnchor();
}

void ContainerFollower::takeAnchor() {
  // The first listing was cut off after watchers had been promised every change: there is nothing to compare
  // with.
  if (!hasBase_ && !watchers_.empty()) tell({relistedChange(identifier_)});
  phase_ = Phase::anchoring;
  enumerator_->currentSyncAnchor([this, run = inThisRound()](const NSData &anchor) {
    run([this, anchor] {
      anchor_ = anchor;
      isSignalled_ = false;
      isListing_ = true;
      isKeeping_ = true;
      fresh_.clear();
      listPage(NSFileProviderInitialPageSortedByName());
    });
  });
}

void ContainerFollower::listPage(const NSData &page) {
  phase_ = Phase::listing;
  enumerator_->enumerateItems(page, [this, run = inThisRound()](const NSFileProviderItems &items,
                                                                const NSData &next, const NSError &error) {
    run([this, items, next, error] { listed(items, next, error); });
  });
}

void ContainerFollower::listed(const NSFileProviderItems &items, const NSData &next, const NSError &error) {
  if (error) {
    failed(error);
    return;
  }
  for (const auto &item : items) keepListed(item);
  // The first page has set up the pushes; a container that isn't kept needs no more of it.
  nextPage_ = isKeeping_ ? next : NSData();
  if (nextPage_) answerWaiting(NSError());
  goOn();
}

void ContainerFollower::goOn() {
  if (isSignalled_ && anchor_) {
    askForChanges();
  } else if (isListing_ && nextPage_) {
    listPage(nextPage_);
  } else if (isListing_) {
    finishListing();
  } else if (isSignalled_) {
    takeAnchor();  // a container without change tracking is listed anew
  } else {
    becomeIdle();
  }
}

void ContainerFollower::finishListing() {
  isListing_ = false;
  if (isBaseKept_ && isKeeping_) {
    tell(known_.changesTo(fresh_));
  } else if (hasBase_) {
    tell({relistedChange(identifier_)});
  }
  known_.swap(fresh_);
  fresh_.clear();
  hasBase_ = true;
  isBaseKept_ = isKeeping_;
  // What was pushed while the last page was on its way is asked for once, signalled or not.
  if (anchor_) {
    askForChanges();
  } else {
    goOn();
  }
}

void ContainerFollower::askForChanges() {
  phase_ = Phase::changing;
  isSignalled_ = false;
  enumerator_->enumerateChanges(
      anchor_,
      [this, run = inThisRound()](const NSFileProviderItems &updated, const std::vector<std::string> &deleted,
                                  const NSData &anchor, bool moreComing, const NSError &error) {
        run([this, updated, deleted, anchor, moreComing, error] {
          changed(updated, deleted, anchor, moreComing, error);
        });
      });
}

void ContainerFollower::changed(const NSFileProviderItems &updated, const std::vector<std::string> &deleted,
                                const NSData &anchor, bool moreComing, const NSError &error) {
  if (error.is(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired) &&
      ++expiries_ <= kMostExpiries) {
    takeAnchor();
    return;
  }
  if (error) {
    failed(error);
    return;
  }
  expiries_ = 0;
  apply(updated, deleted);
  // More to come without a step ahead would go round for ever.
  if (moreComing && anchor != anchor_) isSignalled_ = true;
  if (anchor) anchor_ = anchor;
  goOn();
}

void ContainerFollower::apply(const NSFileProviderItems &updated, const std::vector<std::string> &deleted) {
  std::vector<FPDChange> changes;
  for (const std::string &identifier : deleted) {
    const KnownItems::Item before =
        known_.find(identifier) ? known_.find(identifier) : fresh_.find(identifier);
    known_.remove(identifier);
    fresh_.remove(identifier);
    changes.push_back(removalOfItem(identifier, before));
  }
  for (const auto &item : updated) {
    const KnownItems::Item before = known_.find(item->itemIdentifier()) ? known_.find(item->itemIdentifier())
                                                                        : fresh_.find(item->itemIdentifier());
    if (movedAway(before, *item)) {
      known_.remove(item->itemIdentifier());
      fresh_.remove(item->itemIdentifier());
      changes.push_back(removalOfItem(item->itemIdentifier(), before));
      continue;
    }
    // While the first listing is under way, what isn't known may be on a later page.
    if (auto change = changeOfItem(before, *item, isBaseKept_)) changes.push_back(std::move(*change));
    keepChanged(item);
  }
  tell(changes);
}

bool ContainerFollower::movedAway(const KnownItems::Item &before, const NSFileProviderItem &now) const {
  return before && before->fields().parentItemIdentifier != now.fields().parentItemIdentifier &&
         identifier_ != NSFileProviderWorkingSetContainerItemIdentifier &&
         identifier_ != NSFileProviderAllDirectoriesContainerItemIdentifier;
}

void ContainerFollower::keepListed(const KnownItems::Item &item) {
  if (isKeeping_ && !fresh_.put(item)) stopKeeping();
}

// During a second listing a change goes to both, so that it is told once.
void ContainerFollower::keepChanged(const KnownItems::Item &item) {
  const bool listedToo = !isListing_ || !isKeeping_ || fresh_.put(item);
  const bool known = !isBaseKept_ || known_.put(item);
  if (!listedToo || !known) stopKeeping();
}

void ContainerFollower::stopKeeping() {
  isKeeping_ = false;
  isBaseKept_ = false;
  known_.clear();
  fresh_.clear();
}

void ContainerFollower::tell(const std::vector<FPDChange> &changes) {
  for (const auto &watcher : watchers_) watcher->deliver(changes);
}

void ContainerFollower::answerWaiting(const NSError &error) {
  std::vector<Waiting> waiting;
  waiting.swap(waiting_);
  for (Waiting &one : waiting) {
    if (!error) watchers_.push_back(one.watcher);
    one.ready(error);
  }
}

void ContainerFollower::becomeIdle() {
  retry_ = timing_.firstRetry;
  hasToldFailure_ = false;
  ends_ = 0;
  phase_ = Phase::idle;
  answerWaiting(NSError());
}

void ContainerFollower::failed(const NSError &error) {
  const bool hadEnumerator = enumerator_ != nullptr;
  startOver();
  answerWaiting(error);
  if (watchers_.empty()) {
    hasBase_ = isBaseKept_ = false;
    known_.clear();
    phase_ = Phase::closed;
  } else if (hadEnumerator && isConnectionGone(error) && ++ends_ <= kMostEnds) {
    open();
  } else {
    if (!hasToldFailure_) tell({relistedChange(identifier_)});
    hasToldFailure_ = true;
    retryLater();
  }
}

void ContainerFollower::retryLater() {
  phase_ = Phase::waiting;
  auto run = inThisRound();
  dispatch_after(retry_, queue_, [this, self = shared_from_this(), run] {
    run([this] {
      if (phase_ == Phase::waiting) open();
    });
  });
  retry_ = std::min(retry_ * 2, timing_.longestRetry);
}

void ContainerFollower::startOver() {
  ++round_;
  if (enumerator_) enumerator_->invalidate();
  enumerator_ = nullptr;
  isListing_ = false;
  isSignalled_ = false;
  expiries_ = 0;
  nextPage_ = NSData();
  fresh_.clear();
}

}  // namespace droxa
