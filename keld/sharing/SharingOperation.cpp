#include "keld/sharing/SharingOperation.h"

#include <algorithm>
#include <utility>

#include "platform/cloudkit/CKError.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVSharingTopics.h"

namespace droxa::keld {

namespace {

constexpr std::chrono::milliseconds kLook{200};

// What a client cancels its operation by. It keeps nothing: the operation ends by itself.
class Cancelling final : public QVCancellable {
 public:
  explicit Cancelling(std::weak_ptr<SharingOperation> operation) : operation_(std::move(operation)) {}
  void invalidate() override {
    if (const auto operation = operation_.lock())
      operation->cancel(qvc_error(QVErrorCancelled, "the operation was cancelled"));
  }

 private:
  const std::weak_ptr<SharingOperation> operation_;
};

}  // namespace

void SharingOperation::offerCancelling() {
  std::shared_ptr<QVOperationClient> client;
  {
    const Lock lock(mutex_);
    client = client_;
  }
  if (client) client->setRemoteOperationProxy(std::make_shared<Cancelling>(weak_from_this()), {});
}

void SharingOperation::cancel(const NSError &why) {
  {
    const Lock lock(mutex_);
    if (why_) return;
    why_ = why;
    changed_.notify_all();
  }
  cancellation_->cancel();
  if (cancelled_) cancelled_();
}

NSError SharingOperation::stopped() const {
  const Lock lock(mutex_);
  return why_;
}

CKCallContext SharingOperation::call() const {
  CKCallContext context = CKCallContext::withTimeout(timeout_);
  context.cancellation = cancellation_;
  context.qualityOfService = CKQualityOfService::userInitiated;
  return context;
}

void SharingOperation::progress(const char *topic, std::uint64_t done, std::uint64_t total) {
  std::shared_ptr<QVOperationClient> client;
  {
    const Lock lock(mutex_);
    client = client_;
  }
  if (!client) return;
  client->progressCallbackWithTopic(topic, {{QVSharingProgressDone, static_cast<std::int64_t>(done)},
                                            {QVSharingProgressTotal, static_cast<std::int64_t>(total)}});
}

bool SharingOperation::waitUntil(const Wait &wait, CKCallContext::Clock::time_point time) const {
  Lock lock(mutex_);
  while (!wait.answer && !why_) {
    if (changed_.wait_until(mutex_, time) == std::cv_status::timeout) return wait.answer || why_;
  }
  return true;
}

NSError SharingOperation::await(const std::string &what, const std::function<void(Done)> &begin,
                                const std::function<std::uint64_t()> &position) {
  const auto wait = std::make_shared<Wait>();
  begin([self = shared_from_this(), wait](const NSError &error) {
    const Lock lock(self->mutex_);
    wait->answer = error;
    self->changed_.notify_all();
  });
  std::uint64_t last = position ? position() : 0;
  auto deadline = CKCallContext::Clock::now() + timeout_;
  while (CKCallContext::Clock::now() < deadline) {
    const auto look = position ? std::min(deadline, CKCallContext::Clock::now() + kLook) : deadline;
    if (waitUntil(*wait, look)) break;
    const std::uint64_t now = position ? position() : last;
    if (now != std::exchange(last, now)) deadline = CKCallContext::Clock::now() + timeout_;
  }
  const Lock lock(mutex_);
  if (wait->answer) return *wait->answer;
  if (why_) return why_;
  return CKErrorMakeTimeout(what + " took more than " + std::to_string(timeout_.count()) + " ms");
}

void SharingOperation::finish() {
  std::shared_ptr<QVOperationClient> released;  // without the lock
  const Lock lock(mutex_);
  released.swap(client_);
}

}  // namespace droxa::keld
