#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

enum class CKQualityOfService : std::uint8_t {
  background,
  utility,
  standard,
  userInitiated,
  userInteractive
};

// Whether a call may wait for a better moment (a charger, an unmetered network), where a cloud has such ones.
enum class CKDiscretionaryNetworkBehavior : std::uint8_t {
  nonDiscretionary = 0,
  standard = 1,
  discretionary = 2
};

// Says that calls are to stop. Set once, never cleared.
// Thread contract: every member may be called on any thread, cancel() also inside a callback of the call.
class CKCancellation {
 public:
  void cancel() EXCLUDES(mutex_);
  bool isCancelled() const { return cancelled_.load(std::memory_order_acquire); }
  // Waits until the time has come or it is cancelled; true: cancelled. Woken at once by cancel().
  bool waitUntil(std::chrono::steady_clock::time_point time) const EXCLUDES(mutex_);

 private:
  mutable Mutex mutex_;
  mutable std::condition_variable_any changed_;
  std::atomic<bool> cancelled_{false};  // written under the mutex, so that no waiter misses it
};

// A deadline that the caller moves while a call runs: for transfers that may take long but must not stand
// still. Thread contract: every member may be called on any thread.
class CKMovingDeadline {
 public:
  using Clock = std::chrono::steady_clock;
  void moveTo(Clock::time_point time) { time_.store(time, std::memory_order_release); }
  Clock::time_point time() const { return time_.load(std::memory_order_acquire); }

 private:
  std::atomic<Clock::time_point> time_{Clock::time_point::max()};
};

// What a caller says about one call to a cloud: how long it may take, how it is told to stop, and for whom.
// Copies share the cancellation. Thread contract: a value.
struct CKCallContext {
  using Clock = std::chrono::steady_clock;

  Clock::time_point deadline = Clock::time_point::max();  // max(): none
  std::shared_ptr<const CKMovingDeadline> idleDeadline;   // null: none; the earlier of the two counts
  std::shared_ptr<CKCancellation> cancellation;           // null: can't be cancelled
  CKQualityOfService qualityOfService = CKQualityOfService::standard;
  CKDiscretionaryNetworkBehavior discretionaryNetworkBehavior = CKDiscretionaryNetworkBehavior::standard;
  std::string sourceApplicationBundleIdentifier;  // of the program that asked for it; may be ""

  static CKCallContext withTimeout(std::chrono::milliseconds timeout);

  // The deadline as it stands now.
  Clock::time_point effectiveDeadline() const;
  bool isCancelled() const { return cancellation && cancellation->isCancelled(); }
  // nil while the call may go on; operationCancelled or the timeout error (CKErrorIsTimeout) otherwise.
  NSError check() const;
  // Waits until the time has come; answers as check() does, as soon as that is no longer nil.
  NSError waitUntil(Clock::time_point time) const;
};

}  // namespace droxa
