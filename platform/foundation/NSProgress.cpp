#include "platform/foundation/NSProgress.h"

#include <utility>

namespace droxa {
namespace {

std::shared_ptr<NSProgress> &Current() {
  thread_local std::shared_ptr<NSProgress> current;
  return current;
}

}  // namespace

std::shared_ptr<NSProgress> NSProgress::progressWithTotalUnitCount(std::int64_t count) {
  auto progress = std::make_shared<NSProgress>();
  progress->setTotalUnitCount(count);
  return progress;
}

std::int64_t NSProgress::totalUnitCount() const {
  const Lock lock(mutex_);
  return total_;
}

void NSProgress::setTotalUnitCount(std::int64_t count) {
  const Lock lock(mutex_);
  total_ = count;
}

std::int64_t NSProgress::completedUnitCount() const {
  const Lock lock(mutex_);
  return completed_;
}

void NSProgress::setCompletedUnitCount(std::int64_t count) {
  const Lock lock(mutex_);
  completed_ = count;
}

bool NSProgress::isCancellable() const {
  const Lock lock(mutex_);
  return isCancellable_;
}

void NSProgress::setCancellable(bool isCancellable) {
  const Lock lock(mutex_);
  isCancellable_ = isCancellable;
}

void NSProgress::cancel() {
  std::function<void()> handler;
  {
    const Lock lock(mutex_);
    if (isCancelled_) return;
    isCancelled_ = true;
    handler = std::exchange(cancellationHandler_, nullptr);
  }
  if (handler) handler();
}

bool NSProgress::isCancelled() const {
  const Lock lock(mutex_);
  return isCancelled_;
}

void NSProgress::setCancellationHandler(std::function<void()> handler) {
  {
    const Lock lock(mutex_);
    if (!isCancelled_) {
      // The one that is replaced is released without the lock.
      cancellationHandler_.swap(handler);
      return;
    }
  }
  if (handler) handler();
}

std::shared_ptr<NSProgress> NSProgress::currentProgress() {
  return Current();
}

NSCurrentProgress::NSCurrentProgress(std::shared_ptr<NSProgress> progress)
    : previous_(std::exchange(Current(), std::move(progress))) {}

NSCurrentProgress::~NSCurrentProgress() {
  Current() = previous_;
}

}  // namespace droxa
