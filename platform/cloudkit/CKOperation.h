#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/UUID.h"

namespace droxa {

// Which user-visible task operations belong to; for logs. Thread contract: a value.
struct CKOperationGroup {
  UUID operationGroupID = UUID::generate();
  std::string name;
};

// How an operation goes about its calls. Thread contract: a value; set before the operation is added.
struct CKOperationConfiguration {
  CKQualityOfService qualityOfService = CKQualityOfService::standard;
  CKDiscretionaryNetworkBehavior discretionaryNetworkBehavior = CKDiscretionaryNetworkBehavior::standard;
  // Of one attempt. An attempt that takes longer counts as networkFailure, and may be retried. The time of an
  // asset's transfer counts from the last bytes that moved.
  std::chrono::milliseconds timeoutIntervalForRequest = std::chrono::seconds(60);
  // Of the whole operation from its start, retries and waits included; it then ends with its last error.
  std::chrono::milliseconds timeoutIntervalForResource = std::chrono::minutes(10);
  bool allowsRetry = true;  // false: the first error is final
  // Before retry n (from 0): a random time between half and all of initialRetryDelay * 2^n, at most
  // longestRetryDelay; or what the cloud asked for, if that is longer. A wait that wouldn't end before the
  // operation's deadline isn't begun: the operation ends with the error that it has.
  std::chrono::milliseconds initialRetryDelay = std::chrono::milliseconds(500);
  std::chrono::milliseconds longestRetryDelay = std::chrono::seconds(60);
  std::string sourceApplicationBundleIdentifier;  // "": the container's
};

// Work on a CKDatabase that retries transient errors (CKErrorIsTransient). An operation that was added
// answers its completion block exactly once, whatever happens: cancelled before or while it runs, it answers
// operationCancelled (or its outcome, if that came first). Blocks are called on the queue's thread that runs
// the operation, one at a time, none after the completion block; they must not wait for the operation.
// Set everything before adding; results may be read in the completion block and once it has finished.
// Thread contract: cancel(), isCancelled() on any thread; the rest as just said.
class CKOperation : public NSOperation {
 public:
  CKOperation();
  ~CKOperation() override;

  CKOperationConfiguration configuration;
  CKOperationGroup group;
  const UUID operationID = UUID::generate();

  // Stops a running call within about 50 ms, and a wait for a retry at once.
  void cancel() final;
  bool isCancelled() const;

  // The outcome: nil, or the error that the completion block got.
  NSError error() const;
  int attempts() const;  // calls that were made to the cloud

 protected:
  // The cloud that it was added to; set before perform().
  CKCloud &cloud() const;
  // Does the work. Returns the outcome.
  virtual NSError perform() = 0;
  // Calls the completion block. Called once.
  virtual void complete(const NSError &error) = 0;

  // One try of a call.
  struct Attempt {
    NSError error;            // its outcome; transient: tried again if there is time
    bool progressed = false;  // something was got done: the next delay starts small again
  };
  // A call must end in time; a transfer must keep moving.
  enum class Timing { call, transfer };
  // Calls `attempt` until it doesn't answer a transient error, it may not be retried, there is no time left
  // or the operation is cancelled. Returns the last error.
  NSError retrying(Timing timing, const std::function<Attempt(const CKCallContext &context)> &attempt);
  // Says that the transfer of the running attempt moved on, and so may take its time anew.
  void noteProgress();

 private:
  friend class CKDatabase;
  bool attach(std::shared_ptr<CKCloud> cloud);  // false: it was added before
  void main() final;
  Attempt attemptOnce(Timing timing, const std::function<Attempt(const CKCallContext &context)> &attempt);
  struct State;
  const std::unique_ptr<State> ckState_;
};

}  // namespace droxa
