#pragma once

#include <chrono>
#include <condition_variable>
#include <optional>
#include <utility>

#include "cli/CallResult.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Where the answer of a call is waited for. The first one counts; an answer after the wait is dropped.
// Thread contract: any thread.
template <class Value>
class AnswerSlot {
 public:
  void put(CallResult<Value> result) {
    Lock held(lock_);
    if (result_) return;
    result_ = std::move(result);
    answered_.notify_all();
  }

  // The answer, if there is one in time.
  std::optional<CallResult<Value>> waitFor(std::chrono::milliseconds timeout) {
    const auto until = std::chrono::steady_clock::now() + timeout;
    Lock held(lock_);
    while (!result_)
      if (answered_.wait_until(held, until) == std::cv_status::timeout) break;
    return result_;
  }

  // NSXPCConnectionReplyInvalid when there is none in time.
  CallResult<Value> wait(std::chrono::milliseconds timeout) {
    if (auto result = waitFor(timeout)) return *result;
    return {{}, NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)};
  }

 private:
  Mutex lock_;
  std::condition_variable_any answered_;
  std::optional<CallResult<Value>> result_ GUARDED_BY(lock_);
};

}  // namespace droxa
