#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/cloudkit/CKCallContext.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVOperationClient.h"

namespace droxa::keld {

// One operation that is carried out for a client: how the client hears of it and stops it, and how long what
// it waits for may take. Holds the client's side until it has finished, and no longer.
// Thread contract: cancel() and stopped() on any thread; the rest on the thread that carries it out, but for
// offerCancelling(), which comes before.
class SharingOperation final : public std::enable_shared_from_this<SharingOperation> {
 public:
  using Done = std::function<void(const NSError &error)>;

  // `client` may be null. Each call to the cloud, and each wait that doesn't move, ends after the timeout.
  SharingOperation(std::shared_ptr<QVOperationClient> client, std::chrono::milliseconds timeout)
      : timeout_(timeout), client_(std::move(client)) {}

  // Gives the client what it cancels the operation by.
  void offerCancelling();
  // Called once, on the thread of cancel(). Set before it can be cancelled.
  void setCancelHandler(std::function<void()> handler) { cancelled_ = std::move(handler); }
  // The operation ends with `why`, unless it has its outcome already. The first cancellation counts.
  void cancel(const NSError &why) EXCLUDES(mutex_);
  NSError stopped() const EXCLUDES(mutex_);  // nil, or why it was cancelled

  // For one call to the cloud.
  CKCallContext call() const;
  const std::shared_ptr<CKCancellation> &cancellation() const { return cancellation_; }
  void progress(const char *topic, std::uint64_t done, std::uint64_t total) EXCLUDES(mutex_);

  // Calls `begin` with what is to be called (once, on any thread) when it is done, and waits for that:
  // answers what it was called with, why the operation was cancelled, or a timeout (CKErrorIsTimeout) that
  // says `what` was waited for. `position` (may be null) is asked several times a second: the timeout counts
  // from its last change.
  NSError await(const std::string &what, const std::function<void(Done)> &begin,
                const std::function<std::uint64_t()> &position = nullptr) EXCLUDES(mutex_);

  // Its outcome is known: the client isn't held, or told anything, any more.
  void finish() EXCLUDES(mutex_);

 private:
  struct Wait {
    std::optional<NSError> answer;  // guarded by the operation's lock
  };
  bool waitUntil(const Wait &wait, CKCallContext::Clock::time_point time) const EXCLUDES(mutex_);

  const std::chrono::milliseconds timeout_;
  const std::shared_ptr<CKCancellation> cancellation_ = std::make_shared<CKCancellation>();
  std::function<void()> cancelled_;
  mutable Mutex mutex_;
  mutable std::condition_variable_any changed_;
  std::shared_ptr<QVOperationClient> client_ GUARDED_BY(mutex_);
  NSError why_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
