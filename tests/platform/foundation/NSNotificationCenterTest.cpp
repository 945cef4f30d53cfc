#include <atomic>
#include <gtest/gtest.h>
#include <thread>
#include <vector>

#include "platform/foundation/NSNotificationCenter.h"

namespace droxa {
namespace {

struct Listener {
  void heard() { ++count; }
  std::atomic<int> count = 0;
};

class NSNotificationCenterTest : public testing::Test {
 protected:
  NSNotificationHandler recorded(int number) {
    return [this, number] { heard_.push_back(number); };
  }

  NSNotificationCenter center_;
  std::vector<int> heard_;
  int first_ = 0;
  int second_ = 0;
};

TEST_F(NSNotificationCenterTest, deliversInTheOrderOfRegistration) {
  center_.addObserver(&second_, recorded(1), "name");
  center_.addObserver(&first_, recorded(2), "name");
  center_.addObserver(&second_, recorded(3), "name");
  center_.addObserver(&first_, recorded(4), "other");
  center_.postNotificationName("name");
  EXPECT_EQ(heard_, (std::vector{1, 2, 3}));
}

TEST_F(NSNotificationCenterTest, deliversOnThePostersThread) {
  std::thread::id thread;
  center_.addObserver(
      &first_, [&] { thread = std::this_thread::get_id(); }, "name");
  center_.postNotificationName("name");
  EXPECT_EQ(thread, std::this_thread::get_id());
}

TEST_F(NSNotificationCenterTest, removesOneNameOrAll) {
  center_.addObserver(&first_, recorded(1), "a");
  center_.addObserver(&first_, recorded(2), "b");
  center_.addObserver(&first_, recorded(3), "c");
  EXPECT_EQ(center_.registrationCount(&first_), 3U);
  center_.removeObserver(&first_, "a");
  EXPECT_EQ(center_.registrationCount(&first_), 2U);
  center_.postNotificationName("a");
  center_.postNotificationName("b");
  EXPECT_EQ(heard_, (std::vector{2}));
  center_.removeObserver(&first_);
  EXPECT_EQ(center_.registrationCount(&first_), 0U);
  center_.postNotificationName("c");
  EXPECT_EQ(heard_, (std::vector{2}));
}

TEST_F(NSNotificationCenterTest, anObserverRemovedDuringAPostIsNotCalledAnyMore) {
  center_.addObserver(
      &first_, [&] { center_.removeObserver(&second_); }, "name");
  center_.addObserver(&second_, recorded(2), "name");
  center_.postNotificationName("name");
  EXPECT_TRUE(heard_.empty());
}

TEST_F(NSNotificationCenterTest, anObserverMayRemoveItself) {
  center_.addObserver(
      &first_,
      [&] {
        heard_.push_back(1);
        center_.removeObserver(&first_);
      },
      "name");
  center_.postNotificationName("name");
  center_.postNotificationName("name");
  EXPECT_EQ(heard_, (std::vector{1}));
}

TEST_F(NSNotificationCenterTest, anObserverAddedDuringAPostHearsTheNextOne) {
  center_.addObserver(
      &first_,
      [&] {
        if (center_.registrationCount(&second_) == 0) center_.addObserver(&second_, recorded(2), "name");
      },
      "name");
  center_.postNotificationName("name");
  EXPECT_TRUE(heard_.empty());
  center_.postNotificationName("name");
  EXPECT_EQ(heard_, (std::vector{2}));
}

TEST_F(NSNotificationCenterTest, anObserverMayPost) {
  center_.addObserver(
      &first_, [&] { center_.postNotificationName("inner"); }, "outer");
  center_.addObserver(&second_, recorded(2), "inner");
  center_.postNotificationName("outer");
  EXPECT_EQ(heard_, (std::vector{2}));
}

TEST_F(NSNotificationCenterTest, callsAMemberOfAnObserverThatLives) {
  const auto listener = std::make_shared<Listener>();
  center_.addObserver(listener, &Listener::heard, "name");
  center_.postNotificationName("name");
  EXPECT_EQ(listener->count, 1);
}

TEST_F(NSNotificationCenterTest, holdsAnObserverWeaklyAndForgetsItWhenItHasGone) {
  auto listener = std::make_shared<Listener>();
  const void *address = listener.get();
  center_.addObserver(listener, &Listener::heard, "name");
  EXPECT_EQ(listener.use_count(), 1);
  EXPECT_EQ(center_.registrationCount(address), 1U);
  listener.reset();
  EXPECT_EQ(center_.registrationCount(address), 0U);
  center_.postNotificationName("name");
}

struct Ending {
  void heard() {
    owner->reset();
    EXPECT_FALSE(*isGone);
  }
  ~Ending() { *isGone = true; }
  std::shared_ptr<Ending> *owner;
  bool *isGone;
};

TEST_F(NSNotificationCenterTest, keepsAnObserverAliveForItsCall) {
  bool isGone = false;
  auto ending = std::make_shared<Ending>();
  ending->owner = &ending;
  ending->isGone = &isGone;
  center_.addObserver(ending, &Ending::heard, "name");
  center_.postNotificationName("name");
  EXPECT_TRUE(isGone);
}

TEST_F(NSNotificationCenterTest, releasesARemovedHandlerWithoutItsLock) {
  struct Held {
    explicit Held(NSNotificationCenter &posted) : center(posted) {}
    ~Held() { center.postNotificationName("released"); }
    NSNotificationCenter &center;
  };
  center_.addObserver(&second_, recorded(2), "released");
  center_.addObserver(
      &first_, [held = std::make_shared<Held>(center_)] { (void)held; }, "name");
  center_.removeObserver(&first_);
  EXPECT_EQ(heard_, (std::vector{2}));
}

TEST_F(NSNotificationCenterTest, survivesAddingRemovingAndPostingAtOnce) {
  constexpr int kRounds = 500;
  const auto steady = std::make_shared<Listener>();
  center_.addObserver(steady, &Listener::heard, "name");
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([this] {
      for (int i = 0; i < kRounds; ++i) {
        const auto passing = std::make_shared<Listener>();
        center_.addObserver(passing, &Listener::heard, "name");
        center_.postNotificationName("name");
        if (i % 2) center_.removeObserver(passing.get(), "name");
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(steady->count, 4 * kRounds);
  EXPECT_EQ(center_.registrationCount(steady.get()), 1U);
}

TEST(NSNotificationCenter, theDefaultCenterIsOne) {
  EXPECT_EQ(&NSNotificationCenter::defaultCenter(), &NSNotificationCenter::defaultCenter());
}

}  // namespace
}  // namespace droxa
