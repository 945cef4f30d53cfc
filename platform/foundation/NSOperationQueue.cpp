#include "platform/foundation/NSOperationQueue.h"

#include <algorithm>
#include <condition_variable>
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

  // False when it has been handed to a queue before.
  bool add() EXCLUDES(mutex) {
    const Lock lock(mutex);
    if (stage != Stage::fresh) return false;
    stage = Stage::added;
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
    const Lock lock(mutex);
    stage = Stage::finished;
    changed.notify_all();
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

struct NSOperationQueue::State {
  Mutex mutex;
  std::condition_variable_any emptied;
  std::vector<std::shared_ptr<NSOperation>> operations GUARDED_BY(mutex);  // added and not finished

  void remove(const std::shared_ptr<NSOperation> &operation) EXCLUDES(mutex) {
    const Lock lock(mutex);
    std::erase(operations, operation);
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
  if (!operation || !operation->state_->add()) {
    os_log_fault(os_log_create("droxa", "foundation"), "[CRIT] an operation queue was given %s",
                 operation ? "an operation that was added before" : "no operation");
    return;
  }
  {
    const Lock lock(state_->mutex);
    state_->operations.push_back(operation);
  }
  dispatch_async_global([state = state_, operation = std::move(operation)] {
    if (operation->state_->start()) operation->main();
    operation->state_->finish();
    state->remove(operation);
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
