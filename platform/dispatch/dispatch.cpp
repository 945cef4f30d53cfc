#include "platform/dispatch/dispatch.h"

#include "platform/dispatch/DispatchQueue.h"
#include "platform/dispatch/ThreadPool.h"

namespace droxa {
namespace {

DispatchQueue &required(const dispatch_queue_t &queue, const char *operation) {
  if (!queue) DispatchFatal(std::string(operation) + ": there is no queue");
  return *queue;
}

}  // namespace

dispatch_queue_attr_t dispatch_queue_attr_make_with_autorelease_frequency(
    dispatch_queue_attr_t attr, dispatch_autorelease_frequency_t frequency) {
  attr.autoreleaseFrequency = frequency;
  return attr;
}

dispatch_queue_t dispatch_queue_create(std::string label, dispatch_queue_attr_t attr) {
  return std::make_shared<DispatchQueue>(std::move(label), attr);
}

const std::string &dispatch_queue_get_label(const dispatch_queue_t &queue) {
  return required(queue, "dispatch_queue_get_label").label();
}

dispatch_queue_attr_t dispatch_queue_get_attr(const dispatch_queue_t &queue) {
  return required(queue, "dispatch_queue_get_attr").attr();
}

void dispatch_async(const dispatch_queue_t &queue, dispatch_block_t block) {
  required(queue, "dispatch_async").async(std::move(block));
}

void dispatch_after(std::chrono::nanoseconds delay, const dispatch_queue_t &queue, dispatch_block_t block) {
  required(queue, "dispatch_after");
  ThreadPool::shared().postAfter(
      delay, [queue, handed = std::move(block)]() mutable { queue->async(std::move(handed)); });
}

void dispatch_sync(const dispatch_queue_t &queue, const dispatch_block_t &block) {
  // NOLINTNEXTLINE(performance-unnecessary-copy-initialization): the block may release the caller's reference
  const dispatch_queue_t held = queue;
  required(held, "dispatch_sync").sync(block);
}

bool dispatch_queue_is_current(const dispatch_queue_t &queue) {
  return queue && queue->isCurrent();
}

void dispatch_assert_queue(const dispatch_queue_t &queue) {
  const DispatchQueue &expected = required(queue, "dispatch_assert_queue");
  if (!expected.isCurrent()) {
    DispatchFatal("dispatch_assert_queue: expected to run on the queue \"" + expected.label() + "\"");
  }
}

void dispatch_async_global(dispatch_block_t block) {
  ThreadPool::shared().post(std::move(block));
}

void dispatch_after_global(std::chrono::nanoseconds delay, dispatch_block_t block) {
  ThreadPool::shared().postAfter(delay, std::move(block));
}

}  // namespace droxa
