#include "fileproviderd/Watcher.h"

#include <algorithm>
#include <utility>

#include "fileproviderd/KnownItems.h"

namespace droxa {

Watcher::Watcher(std::string containerIdentifier, std::shared_ptr<FPDWatchObserver> observer)
    : containerIdentifier_(std::move(containerIdentifier)), observer_(std::move(observer)) {}

void Watcher::deliver(const std::vector<FPDChange> &changes) {
  {
    Lock held(lock_);
    if (!observer_ || changes.empty()) return;
    if (pending_.size() + changes.size() > kMostPending) {
      pending_.assign(1, relistedChange(containerIdentifier_));
    } else {
      pending_.insert(pending_.end(), changes.begin(), changes.end());
    }
  }
  sendNext();
}

void Watcher::sendNext() {
  std::vector<FPDChange> batch;
  std::shared_ptr<FPDWatchObserver> observer;
  {
    Lock held(lock_);
    if (!observer_ || sending_ || pending_.empty()) return;
    sending_ = true;
    observer = observer_;
    const auto end = pending_.begin() + static_cast<std::ptrdiff_t>(std::min(kBatch, pending_.size()));
    batch.assign(std::move_iterator(pending_.begin()), std::move_iterator(end));
    pending_.erase(pending_.begin(), end);
  }
  observer->receiveChanges(batch, [self = shared_from_this()] {
    {
      Lock held(self->lock_);
      self->sending_ = false;
    }
    self->sendNext();
  });
}

void Watcher::stop() {
  std::shared_ptr<FPDWatchObserver> released;
  Lock held(lock_);
  released.swap(observer_);
  pending_.clear();
  held.unlock();
}

bool Watcher::isStopped() const {
  Lock held(lock_);
  return !observer_;
}

void WatchHandle::stop() {
  std::function<void()> onStop;
  {
    Lock held(lock_);
    onStop.swap(onStop_);
  }
  if (onStop) onStop();
}

}  // namespace droxa
