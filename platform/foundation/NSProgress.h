#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <vector>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// How far a piece of work has come, and the way to stop it. Work that can be watched takes the progress that
// is current on the thread that begins it. Thread contract: any thread; the cancellation handler runs on the
// thread that cancels, once, and without a lock held; those who watch are told on the thread that changed it,
// without a lock held.
class NSProgress final {
 public:
  NSProgress() = default;
  static std::shared_ptr<NSProgress> progressWithTotalUnitCount(std::int64_t count);
  NSProgress(const NSProgress &) = delete;
  NSProgress &operator=(const NSProgress &) = delete;

  // In units of the work's own choice: bytes, where contents are moved. -1: not known yet.
  std::int64_t totalUnitCount() const;
  void setTotalUnitCount(std::int64_t count);
  std::int64_t completedUnitCount() const;
  void setCompletedUnitCount(std::int64_t count);
  // Called after each change of a count, for as long as this lives.
  void addChangeHandler(std::function<void()> handler);

  // Whether cancelling makes sense, for who shows it; cancel() doesn't ask.
  bool isCancellable() const;
  void setCancellable(bool isCancellable);
  void cancel();
  bool isCancelled() const;
  // Called by cancel(); at once, when that has been. A later handler replaces an earlier one.
  void setCancellationHandler(std::function<void()> handler);

  // The progress of the work that the calling thread begins; null: nobody watches.
  static std::shared_ptr<NSProgress> currentProgress();

 private:
  using Handlers = std::vector<std::function<void()>>;

  static void tell(const std::shared_ptr<const Handlers> &handlers);

  mutable Mutex mutex_;
  std::shared_ptr<const Handlers> changeHandlers_ GUARDED_BY(mutex_);  // null: none
  bool isCancellable_ GUARDED_BY(mutex_) = true;
  std::int64_t total_ GUARDED_BY(mutex_) = -1;
  std::int64_t completed_ GUARDED_BY(mutex_) = 0;
  bool isCancelled_ GUARDED_BY(mutex_) = false;
  std::function<void()> cancellationHandler_ GUARDED_BY(mutex_);
};

// Makes `progress` the current one of this thread for as long as it lives.
class NSCurrentProgress final {
 public:
  explicit NSCurrentProgress(std::shared_ptr<NSProgress> progress);
  ~NSCurrentProgress();
  NSCurrentProgress(const NSCurrentProgress &) = delete;
  NSCurrentProgress &operator=(const NSCurrentProgress &) = delete;

 private:
  const std::shared_ptr<NSProgress> previous_;
};

}  // namespace droxa
