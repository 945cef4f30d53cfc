#include "platform/cloudkit/CKOperation.h"

#include <algorithm>
#include <random>

#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/os_log.h"

namespace droxa {
namespace {

using Clock = CKCallContext::Clock;

// A point in the future; far ones are as good as none.
Clock::time_point after(std::chrono::milliseconds interval) {
  constexpr std::chrono::hours kAsGoodAsNever{24 * 365};
  return interval > kAsGoodAsNever ? Clock::time_point::max() : Clock::now() + interval;
}

// The waits between the tries.
class Backoff {
 public:
  explicit Backoff(const CKOperationConfiguration &configuration) : configuration_(configuration) {}

  void reset() { count_ = 0; }
  std::chrono::milliseconds next() {
    std::chrono::milliseconds most = configuration_.initialRetryDelay;
    for (int i = 0; i < count_ && most < configuration_.longestRetryDelay; ++i) most *= 2;
    ++count_;
    most = std::clamp(most, std::chrono::milliseconds(0), configuration_.longestRetryDelay);
    // Random, lest all who lost the cloud at once come back at once.
    thread_local std::mt19937 random(std::random_device{}());
    return std::chrono::milliseconds(
        std::uniform_int_distribution<std::int64_t>(most.count() / 2, most.count())(random));
  }

 private:
  const CKOperationConfiguration &configuration_;
  int count_ = 0;
};

}  // namespace

struct CKOperation::State {
  const std::shared_ptr<CKMovingDeadline> idleDeadline = std::make_shared<CKMovingDeadline>();
  const std::shared_ptr<CKCancellation> cancellation = std::make_shared<CKCancellation>();

  mutable Mutex mutex;
  std::shared_ptr<CKCloud> cloud GUARDED_BY(mutex);
  bool isRunning GUARDED_BY(mutex) = false;
  NSError error GUARDED_BY(mutex);
  int attempts GUARDED_BY(mutex) = 0;

  Clock::time_point deadline;  // of the whole; written before perform(), on its thread
};

CKOperation::CKOperation() : ckState_(std::make_unique<State>()) {}

CKOperation::~CKOperation() = default;

// A queue never runs an operation that was cancelled before it started, and so its completion block would
// stay unanswered. It is therefore told only once main() runs, where there is nothing left to skip.
void CKOperation::cancel() {
  ckState_->cancellation->cancel();
  bool isRunning = false;
  {
    const Lock lock(ckState_->mutex);
    isRunning = ckState_->isRunning;
  }
  if (isRunning) NSOperation::cancel();
}

bool CKOperation::isCancelled() const {
  return ckState_->cancellation->isCancelled();
}

NSError CKOperation::error() const {
  const Lock lock(ckState_->mutex);
  return ckState_->error;
}

int CKOperation::attempts() const {
  const Lock lock(ckState_->mutex);
  return ckState_->attempts;
}

bool CKOperation::attach(std::shared_ptr<CKCloud> cloud) {
  const Lock lock(ckState_->mutex);
  if (ckState_->cloud) return false;
  ckState_->cloud = std::move(cloud);
  return true;
}

CKCloud &CKOperation::cloud() const {
  const Lock lock(ckState_->mutex);
  return *ckState_->cloud;
}

void CKOperation::main() {
  {
    const Lock lock(ckState_->mutex);
    ckState_->isRunning = true;
  }
  ckState_->deadline = after(configuration.timeoutIntervalForResource);
  NSError error;
  if (isCancelled()) {
    NSOperation::cancel();
    error = CKErrorMake(CKErrorCode::operationCancelled, "The operation was cancelled before it ran");
  } else {
    error = perform();
  }
  {
    const Lock lock(ckState_->mutex);
    ckState_->error = error;
  }
  complete(error);
}

NSError CKOperation::retrying(Timing timing,
                              const std::function<Attempt(const CKCallContext &context)> &attempt) {
  Backoff backoff(configuration);
  for (;;) {
    const Attempt tried = attemptOnce(timing, attempt);
    if (!CKErrorIsTransient(tried.error) || !configuration.allowsRetry) return tried.error;
    if (tried.progressed) backoff.reset();
    const std::chrono::milliseconds delay =
        std::max(backoff.next(), CKErrorRetryAfter(tried.error).value_or(std::chrono::milliseconds(0)));
    const Clock::time_point next = after(delay);
    if (next >= ckState_->deadline) return tried.error;
    os_log_info(os_log_create("droxa", "cloudkit"), "operation %s tries again in %lld ms: %@",
                operationID.description(), static_cast<long long>(delay.count()), tried.error);
    if (ckState_->cancellation->waitUntil(next)) {
      return CKErrorMake(CKErrorCode::operationCancelled, "The operation was cancelled", tried.error);
    }
  }
}

CKOperation::Attempt CKOperation::attemptOnce(
    Timing timing, const std::function<Attempt(const CKCallContext &context)> &attempt) {
  {
    const Lock lock(ckState_->mutex);
    ++ckState_->attempts;
  }
  CKCallContext context;
  context.deadline = ckState_->deadline;
  if (timing == Timing::transfer) {
    noteProgress();
    context.idleDeadline = ckState_->idleDeadline;
  } else {
    context.deadline = std::min(context.deadline, after(configuration.timeoutIntervalForRequest));
  }
  context.cancellation = ckState_->cancellation;
  context.qualityOfService = configuration.qualityOfService;
  context.discretionaryNetworkBehavior = configuration.discretionaryNetworkBehavior;
  context.sourceApplicationBundleIdentifier = configuration.sourceApplicationBundleIdentifier;
  return attempt(context);
}

void CKOperation::noteProgress() {
  ckState_->idleDeadline->moveTo(after(configuration.timeoutIntervalForRequest));
}

}  // namespace droxa
