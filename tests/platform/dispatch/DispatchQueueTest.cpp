#include <atomic>
#include <future>
#include <gtest/gtest.h>
#include <mutex>
#include <thread>
#include <vector>

#include "platform/dispatch/dispatch.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

using namespace std::chrono_literals;

dispatch_queue_t makeQueue(std::string label = "queue") {
  return dispatch_queue_create(std::move(label), DISPATCH_QUEUE_SERIAL);
}

// Returns when all that was handed to the queue before has run.
void drain(const dispatch_queue_t &queue) {
  dispatch_sync(queue, [] {});
}

TEST(DispatchQueue, keepsItsLabelAndAttributes) {
  const auto attr = dispatch_queue_attr_make_with_autorelease_frequency(
      DISPATCH_QUEUE_SERIAL, DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM);
  const auto queue = dispatch_queue_create("label", attr);
  EXPECT_EQ(dispatch_queue_get_label(queue), "label");
  EXPECT_EQ(dispatch_queue_get_attr(queue), attr);
  EXPECT_NE(attr, DISPATCH_QUEUE_SERIAL);
}

TEST(DispatchQueue, runsBlocksInTheOrderInWhichTheyCame) {
  const auto queue = makeQueue();
  std::vector<int> seen;
  std::vector<int> expected;
  for (int i = 0; i < 1000; ++i) {
    expected.push_back(i);
    if (i % 7 == 3) {
      dispatch_sync(queue, [&seen, i] { seen.push_back(i); });
    } else {
      dispatch_async(queue, [&seen, i] { seen.push_back(i); });
    }
  }
  drain(queue);
  EXPECT_EQ(seen, expected);
}

TEST(DispatchQueue, runsOneBlockAtATime) {
  const auto queue = makeQueue();
  int unguarded = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < 500; ++i) {
        dispatch_async(queue, [&] { ++unguarded; });
        dispatch_sync(queue, [&] { ++unguarded; });
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  drain(queue);
  EXPECT_EQ(unguarded, 4000);
}

TEST(DispatchQueue, aBlockMayHandOverTheNext) {
  const auto queue = makeQueue();
  std::promise<void> done;
  int left = 100;
  std::function<void()> next = [&] {
    if (--left == 0) {
      done.set_value();
    } else {
      dispatch_async(queue, next);
    }
  };
  dispatch_async(queue, next);
  EXPECT_EQ(done.get_future().wait_for(kTestDeadline), std::future_status::ready);
}

TEST(DispatchQueue, runsWhatItHoldsAfterItsRelease) {
  std::promise<void> release;
  std::promise<void> done;
  {
    const auto queue = makeQueue();
    dispatch_async(queue, [&] { release.get_future().wait(); });
    dispatch_async(queue, [&] { done.set_value(); });
  }
  release.set_value();
  EXPECT_EQ(done.get_future().wait_for(kTestDeadline), std::future_status::ready);
}

TEST(DispatchQueue, aSynchronousBlockMayReleaseTheQueue) {
  auto queue = makeQueue();
  dispatch_sync(queue, [&] { queue.reset(); });
  EXPECT_FALSE(queue);
}

TEST(DispatchQueue, runsASynchronousBlockOnTheCallersThread) {
  const auto queue = makeQueue();
  std::promise<void> release;
  dispatch_async(queue, [&] { release.get_future().wait(); });
  std::promise<std::thread::id> ran;
  std::thread caller([&] { dispatch_sync(queue, [&] { ran.set_value(std::this_thread::get_id()); }); });
  const std::thread::id expected = caller.get_id();
  release.set_value();
  caller.join();
  EXPECT_EQ(ran.get_future().get(), expected);
}

TEST(DispatchQueue, releasesABlockOnTheQueue) {
  const auto queue = makeQueue();
  std::promise<bool> wasCurrent;
  struct Held {
    ~Held() { done(); }
    std::function<void()> done;
  };
  auto held = std::make_shared<Held>();
  held->done = [&] { wasCurrent.set_value(dispatch_queue_is_current(queue)); };
  dispatch_async(queue, [held = std::move(held)] { (void)held; });
  EXPECT_TRUE(wasCurrent.get_future().get());
}

TEST(DispatchQueue, isCurrentWithinItsBlocksOnly) {
  const auto queue = makeQueue();
  const auto other = makeQueue("other");
  EXPECT_FALSE(dispatch_queue_is_current(queue));
  EXPECT_FALSE(dispatch_queue_is_current(nullptr));
  dispatch_sync(queue, [&] {
    EXPECT_TRUE(dispatch_queue_is_current(queue));
    EXPECT_FALSE(dispatch_queue_is_current(other));
    dispatch_assert_queue(queue);
  });
  dispatch_async(queue, [&] { EXPECT_TRUE(dispatch_queue_is_current(queue)); });
  drain(queue);
  EXPECT_FALSE(dispatch_queue_is_current(queue));
}

TEST(DispatchQueue, theQueuesOfTheBlocksAroundASynchronousOneAreCurrentToo) {
  const auto outer = makeQueue("outer");
  const auto inner = makeQueue("inner");
  dispatch_sync(outer, [&] {
    dispatch_sync(inner, [&] {
      dispatch_assert_queue(outer);
      dispatch_assert_queue(inner);
    });
    EXPECT_FALSE(dispatch_queue_is_current(inner));
  });
}

TEST(DispatchQueue, anAsynchronousBlockDoesNotInheritTheCallersQueue) {
  const auto outer = makeQueue("outer");
  const auto inner = makeQueue("inner");
  std::promise<bool> isOuterCurrent;
  dispatch_sync(outer, [&] {
    dispatch_async(inner, [&] { isOuterCurrent.set_value(dispatch_queue_is_current(outer)); });
  });
  EXPECT_FALSE(isOuterCurrent.get_future().get());
}

TEST(DispatchQueue, runsABlockAfterTheDelay) {
  const auto queue = makeQueue();
  const auto start = std::chrono::steady_clock::now();
  std::promise<std::chrono::steady_clock::time_point> ran;
  dispatch_after(20ms, queue, [&] {
    dispatch_assert_queue(queue);
    ran.set_value(std::chrono::steady_clock::now());
  });
  EXPECT_GE(ran.get_future().get() - start, 20ms);
}

TEST(DispatchQueue, aDelayInThePastIsNone) {
  const auto queue = makeQueue();
  std::promise<void> ran;
  dispatch_after(-1h, queue, [&] { ran.set_value(); });
  EXPECT_EQ(ran.get_future().wait_for(kTestDeadline), std::future_status::ready);
}

TEST(DispatchQueueDeathTest, waitingForTheQueueOnItselfIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        const auto queue = makeQueue("its-label");
        dispatch_sync(queue, [&] { dispatch_sync(queue, [] {}); });
      },
      "dispatch_sync: called on the queue \"its-label\" itself");
}

TEST(DispatchQueueDeathTest, waitingForTheQueueThroughAnotherIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(
      {
        const auto outer = makeQueue("outer-label");
        const auto inner = makeQueue("inner-label");
        dispatch_sync(outer, [&] { dispatch_sync(inner, [&] { dispatch_sync(outer, [] {}); }); });
      },
      "dispatch_sync: called on the queue \"outer-label\" itself");
}

TEST(DispatchQueueDeathTest, assertingAnotherQueueIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(dispatch_assert_queue(makeQueue("its-label")),
               "dispatch_assert_queue: expected to run on the queue \"its-label\"");
}

TEST(DispatchQueueDeathTest, usingNoQueueIsFatal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_DEATH(dispatch_async(nullptr, [] {}), "dispatch_async: there is no queue");
}

}  // namespace
}  // namespace droxa
