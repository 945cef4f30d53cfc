#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace droxa {

using dispatch_block_t = std::function<void()>;

enum class dispatch_autorelease_frequency_t : std::uint8_t { inherit = 0, workItem = 1, never = 2 };
inline constexpr auto DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM = dispatch_autorelease_frequency_t::workItem;

// What a queue is made with. Only serial queues exist; the autorelease frequency is kept as told and has no
// effect of its own here, since nothing is autoreleased.
struct dispatch_queue_attr_t {
  dispatch_autorelease_frequency_t autoreleaseFrequency = dispatch_autorelease_frequency_t::inherit;
  bool operator==(const dispatch_queue_attr_t &) const = default;
};
inline constexpr dispatch_queue_attr_t DISPATCH_QUEUE_SERIAL{};

// A serial queue: its blocks run one at a time, in the order in which they were handed over, on the process's
// elastic thread pool. A queue that is released still runs what it holds.
// Thread contract: all operations on any thread.
class DispatchQueue;
using dispatch_queue_t = std::shared_ptr<DispatchQueue>;

dispatch_queue_attr_t dispatch_queue_attr_make_with_autorelease_frequency(
    dispatch_queue_attr_t attr, dispatch_autorelease_frequency_t frequency);
dispatch_queue_t dispatch_queue_create(std::string label, dispatch_queue_attr_t attr);
const std::string &dispatch_queue_get_label(const dispatch_queue_t &queue);
dispatch_queue_attr_t dispatch_queue_get_attr(const dispatch_queue_t &queue);

void dispatch_async(const dispatch_queue_t &queue, dispatch_block_t block);
void dispatch_after(std::chrono::nanoseconds delay, const dispatch_queue_t &queue, dispatch_block_t block);
// Runs the block on the calling thread when all that was handed to the queue before has run, and returns
// after it. Inside the block that queue is current, and so are those on which the caller runs already.
// Calling it on the queue itself is a deadlock, so it is fatal instead.
void dispatch_sync(const dispatch_queue_t &queue, const dispatch_block_t &block);
bool dispatch_queue_is_current(const dispatch_queue_t &queue);
// Ends the process, naming the queue, when the caller doesn't run on it.
void dispatch_assert_queue(const dispatch_queue_t &queue);

// The process's elastic pool: a block handed over always finds a thread, however many others are blocked.
// Threads that stay idle for some seconds end.
void dispatch_async_global(dispatch_block_t block);
void dispatch_after_global(std::chrono::nanoseconds delay, dispatch_block_t block);

}  // namespace droxa
