#include <atomic>
#include <cstdlib>
#include <future>
#include <gtest/gtest.h>
#include <latch>
#include <thread>
#include <vector>

#include "platform/dispatch/ThreadPool.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

using namespace std::chrono_literals;

// Blocks of the pool that wait until the test lets them go.
class Blockers {
 public:
  explicit Blockers(int count) : wanted_(count) {
    for (int i = 0; i < count; ++i) {
      dispatch_async_global([this] {
        ++waiting_;
        release_.wait();
        --waiting_;
      });
    }
  }
  ~Blockers() {
    promise_.set_value();
    EXPECT_TRUE(eventually([this] { return waiting_ == 0; }));
  }
  bool allWait() const {
    return eventually([this] { return waiting_ == wanted_; });
  }

 private:
  const int wanted_;
  std::promise<void> promise_;
  const std::shared_future<void> release_ = promise_.get_future().share();
  std::atomic<int> waiting_ = 0;
};

bool runs() {
  auto ran = std::make_shared<std::promise<void>>();
  auto future = ran->get_future();
  dispatch_async_global([ran] { ran->set_value(); });
  return future.wait_for(kTestDeadline) == std::future_status::ready;
}

TEST(ThreadPool, aBlockFindsAThreadHoweverManyAreBlocked) {
  const Blockers blockers(200);
  ASSERT_TRUE(blockers.allWait());
  EXPECT_TRUE(runs());
}

TEST(ThreadPool, blocksOfManyQueuesFindThreadsWhileAllWaitForOneAnother) {
  constexpr int kDepth = 100;
  std::vector<dispatch_queue_t> queues;
  for (int i = 0; i < kDepth; ++i) queues.push_back(dispatch_queue_create("queue", DISPATCH_QUEUE_SERIAL));
  std::promise<void> done;
  // Each queue's block waits for a block of the next queue.
  std::function<void(std::size_t)> descend = [&](std::size_t i) {
    if (i == queues.size()) return;
    std::promise<void> inner;
    dispatch_async(queues[i], [&] {
      descend(i + 1);
      inner.set_value();
    });
    inner.get_future().wait();
  };
  dispatch_async_global([&] {
    descend(0);
    done.set_value();
  });
  EXPECT_EQ(done.get_future().wait_for(kTestDeadline), std::future_status::ready);
}

TEST(ThreadPool, aTimerFiresWhileAllThreadsAreBlocked) {
  std::promise<void> fired;
  auto future = fired.get_future().share();
  std::atomic<int> released = 0;
  const int blocked = 20;
  for (int i = 0; i < blocked; ++i) {
    dispatch_async_global([&, future] {
      future.wait();
      ++released;
    });
  }
  dispatch_after_global(1ms, [&] { fired.set_value(); });
  EXPECT_TRUE(eventually([&] { return released == blocked; }));
}

TEST(ThreadPool, timersFireInTheOrderOfTheirTimes) {
  const auto queue = dispatch_queue_create("order", DISPATCH_QUEUE_SERIAL);
  std::vector<int> order;
  std::promise<void> done;
  dispatch_after(150ms, queue, [&] {
    order.push_back(2);
    done.set_value();
  });
  dispatch_after(1ms, queue, [&] { order.push_back(1); });
  done.get_future().wait();
  EXPECT_EQ(order, (std::vector{1, 2}));
}

TEST(ThreadPool, doesNotGrowForASerialQueuesBacklog) {
  const auto queue = dispatch_queue_create("backlog", DISPATCH_QUEUE_SERIAL);
  const Blockers one(1);
  ASSERT_TRUE(one.allWait());
  const std::size_t before = ThreadPool::shared().threadCount();
  for (int i = 0; i < 1000; ++i) dispatch_async(queue, [] {});
  dispatch_sync(queue, [] {});
  EXPECT_LE(ThreadPool::shared().threadCount(), before + 2);
}

TEST(ThreadPool, blocksBeyondTheLimitWaitForAThread) {
  constexpr int kBeyond = static_cast<int>(ThreadPool::kMostThreads) + 50;
  std::atomic<int> ran = 0;
  {
    const Blockers blockers(static_cast<int>(ThreadPool::kMostThreads));
    ASSERT_TRUE(blockers.allWait());
    for (int i = 0; i < kBeyond; ++i) dispatch_async_global([&] { ++ran; });
    EXPECT_EQ(ThreadPool::shared().threadCount(), ThreadPool::kMostThreads);
    EXPECT_EQ(ran, 0);
  }
  EXPECT_TRUE(eventually([&] { return ran == kBeyond; }));
}

TEST(ThreadPool, idleThreadsEndAndTheNextBlockStillRuns) {
  {
    const Blockers blockers(30);
    ASSERT_TRUE(blockers.allWait());
  }
  EXPECT_TRUE(eventually([] { return ThreadPool::shared().threadCount() == 1; }, 40s));
  EXPECT_TRUE(runs());
}

TEST(ThreadPool, survivesManyThreadsHandingOver) {
  constexpr int kEach = 2000;
  std::atomic<int> ran = 0;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&] {
      for (int i = 0; i < kEach; ++i) dispatch_async_global([&] { ++ran; });
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_TRUE(eventually([&] { return ran == 4 * kEach; }));
}

// Ends the process while blocks run, wait and are due.
[[noreturn]] void exitWhileThreadsRun() {
  static std::latch started(3);
  for (int i = 0; i < 2; ++i) {
    dispatch_async_global([] {
      started.count_down();
      for (;;) std::this_thread::yield();
    });
  }
  const auto queue = dispatch_queue_create("blocked", DISPATCH_QUEUE_SERIAL);
  dispatch_async(queue, [] {
    started.count_down();
    std::promise<void>().get_future().wait_for(1h);
  });
  dispatch_async(queue, [] {});
  dispatch_after_global(1h, [] {});
  started.wait();
  std::exit(7);
}

TEST(ThreadPoolDeathTest, theProcessEndsCleanlyWhileThreadsRun) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(exitWhileThreadsRun(), testing::ExitedWithCode(7), "^$");
}

}  // namespace
}  // namespace droxa
