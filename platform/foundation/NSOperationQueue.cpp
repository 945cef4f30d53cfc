#include "platform/foundation/NSOperationQueue.h"

#include <algorithm>
#include <condition_variable>
#include <utility>
#include <vector>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"
#include "platform/oslog/os_log.h"

namespace droxa {

struct NSOperation::State {
  enum class Stage { added, fresh, running, finished };
  mutable Mutex mutex;
  mutable std::condition_variable_any changed;
  Stage stage GUARDED_BY(mutex) = Stage::fresh;
  bool isCancelled GUARDED_BY(mutex) = false;
  std::function<void()> whenFinished GUARDED_BY(mutex);  // set by the queue

  // False when it has been handed to a queue before.
  bool add(std::function<void()> finished) EXCLUDES(mutex) {
    const Lock lock(mutex);
    if (stage != Stage::fresh) return false;
    stage = Stage::added;
    whenFinished = std::move(finished);
    return true;
  }
  // False when it was cancelled and is to be finished without running.
  bool start() EXCLUDES(mutex) {
    const Lock lock(mutex);
    if (isCancelled) return false;
    stage = Stage::running;
    return true;
  }
  void finish() EXCLUDES(mutex) {
    std::function<void()> finished;
    {
      const Lock lock(mutex);
      stage = Stage::finished;
      finished.swap(whenFinished);
      changed.notify_all();
    }
    if (finished) finished();
  }
  void wait() const EXCLUDES(mutex) {
    Lock lock(mutex);
    while (stage != Stage::finished) changed.wait(lock);
  }
};

NSOperation::NSOperation() : state_(std::make_unique<State>()) {}

NSOperation::~NSOperation() = default;

void NSOperation::cancel() {
  const Lock lock(state_->mutex);
  state_->isCancelled = true;
}

bool NSOperation::isCancelled() const {
  const Lock lock(state_->mutex);
  return state_->isCancelled;
}

bool NSOperation::isFinished() const {
  const Lock lock(state_->mutex);
  return state_->stage == State::Stage::finished;
}

void NSOperation::waitUntilFinished() const {
  state_->wait();
}

void NSOperation::finish() {
  state_->finish();
}

struct NSOperationQueue::State {
  Mutex mutex;
  std::condition_variable_any emptied;
  std::vector<std::shared_ptr<NSOperation>> operations GUARDED_BY(mutex);  // added and not finished

  void remove(const NSOperation *operation) EXCLUDES(mutex) {
    std::vector<std::shared_ptr<NSOperation>> removed;  // released without the lock
    const Lock lock(mutex);
    std::erase_if(operations, [&](std::shared_ptr<NSOperation> &other) {
      if (other.get() != operation) return false;
      removed.push_back(std::move(other));
      return true;
    });
    if (operations.empty()) emptied.notify_all();
  }
};

namespace {

class BlockOperation final : public NSOperation {
 public:
  explicit BlockOperation(std::function<void()> block) : block_(std::move(block)) {}
  void main() override { block_(); }

 private:
  const std::function<void()> block_;
};

}  // namespace

NSOperationQueue::NSOperationQueue() : state_(std::make_shared<State>()) {}

NSOperationQueue::~NSOperationQueue() = default;

void NSOperationQueue::addOperation(std::shared_ptr<NSOperation> operation) {
  const std::function<void()> finished = [state = state_, added = operation.get()] { state->remove(added); };
  if (!operation || !operation->state_->add(finished)) {
    os_log_fault(os_log_create("droxa", "foundation"), "[CRIT] an operation queue was given %s",
                 operation ? "an operation that was added before" : "no operation");
    return;
  }
  {
    const Lock lock(state_->mutex);
    state_->operations.push_back(operation);
  }
  dispatch_async_global([operation = std::move(operation)] {
    const bool started = operation->state_->start();
    if (started) operation->main();
    if (!started || !operation->isAsynchronous()) operation->state_->finish();
  });
}

void NSOperationQueue::addOperationWithBlock(std::function<void()> block) {
  addOperation(std::make_shared<BlockOperation>(std::move(block)));
}

void NSOperationQueue::cancelAllOperations() {
  std::vector<std::shared_ptr<NSOperation>> operations;
  {
    const Lock lock(state_->mutex);
    operations = state_->operations;
  }
  for (const auto &operation : operations) operation->cancel();
}

void NSOperationQueue::waitUntilAllOperationsAreFinished() {
  Lock lock(state_->mutex);
  while (!state_->operations.empty()) state_->emptied.wait(lock);
}

std::size_t NSOperationQueue::operationCount() const {
  const Lock lock(state_->mutex);
  return state_->operations.size();
}

}  // namespace droxa
