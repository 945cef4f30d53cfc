#pragma once

#include <condition_variable>
#include <deque>
#include <memory>
#include <string>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Ends the process with a message.
[[noreturn]] void DispatchFatal(const std::string &message);

// A serial queue over the thread pool. One thread at a time has the queue's turn; it gives the turn on to
// whatever stands first in line: a synchronous caller, which then runs its own block, or a pool thread that
// runs the blocks in line until a synchronous caller is met. The turn is never held by a thread that only
// waits, so a strand of the pool's library, which can't be handed to a caller, isn't used. Thread contract:
// every member may be called on any thread; `line_` and `isTaken_` are guarded by `mutex_`, which is never
// held while a block runs or is released.
class DispatchQueue : public std::enable_shared_from_this<DispatchQueue> {
 public:
  DispatchQueue(std::string label, dispatch_queue_attr_t attr) : label_(std::move(label)), attr_(attr) {}

  const std::string &label() const { return label_; }
  dispatch_queue_attr_t attr() const { return attr_; }

  void async(dispatch_block_t block);
  void sync(const dispatch_block_t &block);
  bool isCurrent() const;

 private:
  struct Caller {
    std::condition_variable_any changed;
    bool hasTurn = false;
  };
  struct Entry {
    dispatch_block_t block;    // when there is no caller
    Caller *caller = nullptr;  // waits in sync(); lives until it has had its turn
  };

  void takeTurn();                          // waits in line
  void giveTurnOn();                        // REQUIRES: the calling thread has the turn
  void runBlocks();                         // REQUIRES: the calling thread, of the pool, has the turn
  bool nextBlock(dispatch_block_t &block);  // false: the turn was given on

  const std::string label_;
  const dispatch_queue_attr_t attr_;

  Mutex mutex_;
  std::deque<Entry> line_ GUARDED_BY(mutex_);
  bool isTaken_ GUARDED_BY(mutex_) = false;  // a thread has the turn, or a pool thread is on its way to it
};

}  // namespace droxa
