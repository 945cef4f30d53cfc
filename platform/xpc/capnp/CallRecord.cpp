#include "platform/xpc/capnp/CallRecord.h"

#include <utility>

namespace droxa {

void CallWaiter::wait() {
  dispatch_block_t block;
  {
    Lock lock(mutex_);
    while (!block_) finished_.wait(mutex_);
    block = std::move(block_);
  }
  block();
}

void CallWaiter::finish(dispatch_block_t block) {
  const Lock lock(mutex_);
  block_ = std::move(block);
  finished_.notify_one();
}

void CallRecord::answer(std::unique_ptr<CallRecord> record, std::function<void(CallRecord &)> block,
                        std::shared_ptr<void> kept) {
  const std::shared_ptr<CallWaiter> waiter = std::move(record->waiter);
  dispatch_block_t run = [shared = std::shared_ptr<CallRecord>(std::move(record)),
                          answering = std::move(block), last = std::move(kept)]() mutable {
    answering(*shared);
    answering = nullptr;
    shared = nullptr;
  };
  if (waiter) {
    waiter->finish(std::move(run));
  } else {
    dispatch_async_global(std::move(run));
  }
}

}  // namespace droxa
