#pragma once

#include <deque>
#include <memory>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

// Lets the calls of one peer run on the pool, a bounded number at once and the others afterwards in their
// order. Thread contract: any thread.
class CallGate : public std::enable_shared_from_this<CallGate> {
 public:
  void run(dispatch_block_t block);
  // What hasn't started never does.
  void close();

 private:
  void work(dispatch_block_t first);

  Mutex mutex_;
  std::size_t running_ GUARDED_BY(mutex_) = 0;
  std::deque<dispatch_block_t> waiting_ GUARDED_BY(mutex_);
  bool closed_ GUARDED_BY(mutex_) = false;
};

}  // namespace droxa
