#include "platform/xpc/capnp/CallGate.h"

#include <utility>

#include "platform/xpc/capnp/Limits.h"

namespace droxa {

void CallGate::run(dispatch_block_t block) {
  {
    const Lock lock(mutex_);
    if (!closed_ && running_ == XPCMaximumConcurrentCalls) {
      waiting_.push_back(std::move(block));
      return;
    }
    ++running_;
    if (closed_) block = [released = std::move(block)] {};  // not run, but released on the pool
  }
  dispatch_async_global(
      [self = shared_from_this(), first = std::move(block)]() mutable { self->work(std::move(first)); });
}

void CallGate::work(dispatch_block_t block) {
  for (;;) {
    block();
    block = nullptr;
    const Lock lock(mutex_);
    if (waiting_.empty()) {
      --running_;
      return;
    }
    block = std::move(waiting_.front());
    waiting_.pop_front();
  }
}

void CallGate::close() {
  auto released = std::make_shared<std::deque<dispatch_block_t>>();
  {
    const Lock lock(mutex_);
    closed_ = true;
    released->swap(waiting_);
  }
  // They hold objects of users, which are not released on the caller's thread, the loop.
  if (!released->empty()) dispatch_async_global([kept = std::move(released)] { kept->clear(); });
}

}  // namespace droxa
