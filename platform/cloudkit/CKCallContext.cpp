#include "platform/cloudkit/CKCallContext.h"

#include <algorithm>

#include "platform/cloudkit/CKError.h"

namespace droxa {

void CKCancellation::cancel() {
  const Lock lock(mutex_);
  cancelled_.store(true, std::memory_order_release);
  changed_.notify_all();
}

bool CKCancellation::waitUntil(std::chrono::steady_clock::time_point time) const {
  Lock lock(mutex_);
  while (!isCancelled()) {
    if (time == std::chrono::steady_clock::time_point::max()) {
      changed_.wait(lock);
    } else if (changed_.wait_until(lock, time) == std::cv_status::timeout) {
      break;
    }
  }
  return isCancelled();
}

CKCallContext CKCallContext::withTimeout(std::chrono::milliseconds timeout) {
  CKCallContext context;
  context.deadline = Clock::now() + timeout;
  return context;
}

CKCallContext::Clock::time_point CKCallContext::effectiveDeadline() const {
  return idleDeadline ? std::min(deadline, idleDeadline->time()) : deadline;
}

NSError CKCallContext::check() const {
  if (isCancelled()) return CKErrorMake(CKErrorCode::operationCancelled, "The call was cancelled");
  const Clock::time_point last = effectiveDeadline();
  if (last != Clock::time_point::max() && Clock::now() >= last) {
    return CKErrorMakeTimeout("The call's deadline passed");
  }
  return {};
}

NSError CKCallContext::waitUntil(Clock::time_point time) const {
  const Clock::time_point end = std::min(time, effectiveDeadline());
  // Without a cancellation of its own the wait uses one that nobody sets.
  if (cancellation) {
    cancellation->waitUntil(end);
  } else {
    CKCancellation().waitUntil(end);
  }
  return check();
}

}  // namespace droxa
