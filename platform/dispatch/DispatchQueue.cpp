#include "platform/dispatch/DispatchQueue.h"

#include <cstdio>
#include <cstdlib>

#include "platform/dispatch/ThreadPool.h"

namespace droxa {
namespace {

// Marks a queue as current on the calling thread for a scope. The marks of a thread form a list: within a
// synchronous block the queues of the blocks around it are current as well.
class CurrentQueue {
 public:
  explicit CurrentQueue(const DispatchQueue &queue) : queue_(queue), outer_(innermost) { innermost = this; }
  ~CurrentQueue() { innermost = outer_; }
  CurrentQueue(const CurrentQueue &) = delete;
  CurrentQueue &operator=(const CurrentQueue &) = delete;

  static bool is(const DispatchQueue &queue) {
    for (const CurrentQueue *mark = innermost; mark; mark = mark->outer_) {
      if (&mark->queue_ == &queue) return true;
    }
    return false;
  }

 private:
  static thread_local const CurrentQueue *innermost;
  const DispatchQueue &queue_;
  const CurrentQueue *const outer_;
};

thread_local const CurrentQueue *CurrentQueue::innermost = nullptr;

}  // namespace

void DispatchFatal(const std::string &message) {
  std::fprintf(stderr, "droxa: %s\n", message.c_str());
  std::abort();
}

bool DispatchQueue::isCurrent() const {
  return CurrentQueue::is(*this);
}

void DispatchQueue::async(dispatch_block_t block) {
  {
    const Lock lock(mutex_);
    line_.push_back({std::move(block), nullptr});
    if (isTaken_) return;
    isTaken_ = true;
  }
  ThreadPool::shared().post([queue = shared_from_this()] { queue->runBlocks(); });
}

void DispatchQueue::sync(const dispatch_block_t &block) {
  if (isCurrent()) {
    DispatchFatal("dispatch_sync: called on the queue \"" + label_ + "\" itself, which would wait forever");
  }
  takeTurn();
  {
    const CurrentQueue mark(*this);
    block();
  }
  giveTurnOn();
}

void DispatchQueue::takeTurn() {
  Lock lock(mutex_);
  if (!isTaken_) {
    isTaken_ = true;
    return;
  }
  Caller caller;
  line_.push_back({{}, &caller});
  while (!caller.hasTurn) caller.changed.wait(lock);
}

void DispatchQueue::giveTurnOn() {
  {
    const Lock lock(mutex_);
    if (line_.empty()) {
      isTaken_ = false;
      return;
    }
    if (Caller *caller = line_.front().caller) {
      line_.pop_front();
      caller->hasTurn = true;
      caller->changed.notify_one();  // under the lock: the caller is gone as soon as it sees its turn
      return;
    }
  }
  ThreadPool::shared().post([queue = shared_from_this()] { queue->runBlocks(); });
}

bool DispatchQueue::nextBlock(dispatch_block_t &block) {
  {
    const Lock lock(mutex_);
    if (!line_.empty() && !line_.front().caller) {
      block = std::move(line_.front().block);
      line_.pop_front();
      return true;
    }
  }
  giveTurnOn();
  return false;
}

void DispatchQueue::runBlocks() {
  const CurrentQueue mark(*this);
  for (dispatch_block_t block; nextBlock(block); block = nullptr) block();
}

}  // namespace droxa
