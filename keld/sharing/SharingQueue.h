#pragma once

#include <atomic>
#include <condition_variable>
#include <cstddef>
#include <deque>
#include <functional>
#include <memory>
#include <set>

#include "keld/sharing/SharingOperation.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

struct SharingOptions {
  std::size_t atOnce = 8;
  std::size_t mostWaiting = 256;  // more are refused
  // Of each call to the cloud, and of each wait that doesn't move.
  std::chrono::milliseconds timeout = std::chrono::seconds(60);
};

// Whose operations they are: one connection's. Thread contract: any thread.
struct SharingOwner {
  std::atomic<bool> hasEnded{false};
};

// Carries sharing operations out on the pool, so many at once and no more, in the order in which they came.
// Each is answered exactly once: with its outcome, why it was cancelled, or why it wasn't taken. What is
// cancelled while it waits is answered without waiting for its turn.
// Thread contract: any thread. Operations and answers run on the pool, but for the answer of one that isn't
// taken, which comes before start() returns.
class SharingQueue final : public std::enable_shared_from_this<SharingQueue> {
 public:
  struct Task {
    std::function<NSError(SharingOperation &operation)> perform;  // may throw SqlError
    std::function<void(const NSError &error)> answer;
  };

  explicit SharingQueue(SharingOptions options) : options_(options) {}

  void start(const std::shared_ptr<SharingOwner> &owner, std::shared_ptr<QVOperationClient> client,
             Task task);
  // The owner's operations are cancelled, and no more taken.
  void end(const std::shared_ptr<SharingOwner> &owner);
  // Cancels all with QVErrorShuttingDown, and returns when all have been answered.
  void stop();

  std::size_t count() const;  // under way or waiting

 private:
  struct Entry {
    std::shared_ptr<SharingOperation> operation;
    std::shared_ptr<SharingOwner> owner;
    Task task;
  };
  using Entries = std::deque<std::shared_ptr<Entry>>;

  NSError add(const std::shared_ptr<Entry> &entry) EXCLUDES(mutex_);
  void startMore() REQUIRES(mutex_);
  void runOnPool(const std::shared_ptr<Entry> &entry) REQUIRES(mutex_);
  void run(const std::shared_ptr<Entry> &entry) EXCLUDES(mutex_);
  void takeOut(const SharingOperation *operation) EXCLUDES(mutex_);
  Entries entriesOf(const SharingOwner *owner) const EXCLUDES(mutex_);  // null: everybody's

  const SharingOptions options_;
  mutable Mutex mutex_;
  std::condition_variable_any idle_;
  Entries waiting_ GUARDED_BY(mutex_);
  std::set<std::shared_ptr<Entry>> running_ GUARDED_BY(mutex_);
  bool stopped_ GUARDED_BY(mutex_) = false;
};

}  // namespace droxa::keld
