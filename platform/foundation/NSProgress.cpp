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

void NSProgress::tell(const std::shared_ptr<const Handlers> &handlers) {
  if (!handlers) return;
  for (const auto &handler : *handlers) handler();
}

std::int64_t NSProgress::totalUnitCount() const {
  const Lock lock(mutex_);
  return total_;
}

void NSProgress::setTotalUnitCount(std::int64_t count) {
  std::shared_ptr<const Handlers> handlers;
  {
    const Lock lock(mutex_);
    if (total_ == count) return;
    total_ = count;
    handlers = changeHandlers_;
  }
  tell(handlers);
}

std::int64_t NSProgress::completedUnitCount() const {
  const Lock lock(mutex_);
  return completed_;
}

void NSProgress::setCompletedUnitCount(std::int64_t count) {
  std::shared_ptr<const Handlers> handlers;
  {
    const Lock lock(mutex_);
    if (completed_ == count) return;
    completed_ = count;
    handlers = changeHandlers_;
  }
  tell(handlers);
}

void NSProgress::addChangeHandler(std::function<void()> handler) {
  const Lock lock(mutex_);
  auto handlers = changeHandlers_ ? *changeHandlers_ : Handlers();
  handlers.push_back(std::move(handler));
  changeHandlers_ = std::make_shared<const Handlers>(std::move(handlers));
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
