#pragma once

#include <condition_variable>
#include <functional>
#include <kj/function.h>
#include <memory>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Lets the thread of a synchronous call wait, and run what ends the call.
// Thread contract: wait() once, on the calling thread; finish() once, on the loop.
class CallWaiter {
 public:
  void wait();
  void finish(dispatch_block_t block);

 private:
  Mutex mutex_;
  std::condition_variable_any finished_;
  dispatch_block_t block_ GUARDED_BY(mutex_);
};

// A call under way: everything of it that belongs to a user (arguments, completion, error handler), so that
// all of it is released together, where the call is answered and never on the loop. Thread contract: owned by
// one thread at a time.
class CallRecord {
 public:
  CallRecord() = default;
  CallRecord(const CallRecord &) = delete;
  CallRecord &operator=(const CallRecord &) = delete;
  virtual ~CallRecord() = default;
  virtual void fail(const NSError &error) = 0;  // runs the user's code

  std::shared_ptr<CallWaiter> waiter;  // null: answered on the pool

  // Runs `block(record)` where the call is to be answered. `kept` is released after that.
  static void answer(std::unique_ptr<CallRecord> record, std::function<void(CallRecord &)> block,
                     std::shared_ptr<void> kept = nullptr);
};

// Gives a reply's decoded values to the record that waits for it.
using ReplyBlock = std::function<void(CallRecord &record)>;

}  // namespace droxa
