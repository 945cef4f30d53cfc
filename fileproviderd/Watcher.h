#pragma once

#include <deque>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// One client that watches a container: holds what it hasn't taken yet, and sends the next batch when it has
// answered the one before. A client that doesn't keep up is told `relisted` instead of what it missed.
// Thread contract: any thread; lock_ guards the pending changes and is never held while the observer is
// called.
class Watcher final : public std::enable_shared_from_this<Watcher> {
 public:
  static constexpr std::size_t kBatch = 200;
  static constexpr std::size_t kMostPending = 10'000;

  Watcher(std::string containerIdentifier, std::shared_ptr<FPDWatchObserver> observer);
  void deliver(const std::vector<FPDChange> &changes);
  void stop();  // nothing is sent after it
  bool isStopped() const;

 private:
  void sendNext();

  const std::string containerIdentifier_;
  mutable Mutex lock_;
  std::shared_ptr<FPDWatchObserver> observer_ GUARDED_BY(lock_);  // null: stopped
  std::deque<FPDChange> pending_ GUARDED_BY(lock_);
  bool sending_ GUARDED_BY(lock_) = false;
};

// What the client holds: the watch ends with it.
// Thread contract: any thread; `onStop` is called once.
class WatchHandle final : public FPDWatch {
 public:
  explicit WatchHandle(std::function<void()> onStop) : onStop_(std::move(onStop)) {}
  ~WatchHandle() override { stop(); }
  void stop() override;

 private:
  Mutex lock_;
  std::function<void()> onStop_ GUARDED_BY(lock_);
};

}  // namespace droxa
