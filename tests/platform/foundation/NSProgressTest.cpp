#include <gtest/gtest.h>
#include <thread>
#include <vector>

#include "platform/foundation/NSProgress.h"

namespace droxa {
namespace {

TEST(NSProgress, startsAtNothingOfAnUnknownTotal) {
  const NSProgress progress;
  EXPECT_EQ(progress.totalUnitCount(), -1);
  EXPECT_EQ(progress.completedUnitCount(), 0);
  EXPECT_TRUE(progress.isCancellable());
  EXPECT_FALSE(progress.isCancelled());
  EXPECT_EQ(NSProgress::progressWithTotalUnitCount(7)->totalUnitCount(), 7);
}

TEST(NSProgress, eachOfThoseWhoWatchIsToldOfEachChange) {
  NSProgress progress;
  std::vector<std::int64_t> first, second;
  progress.addChangeHandler([&] { first.push_back(progress.completedUnitCount()); });
  progress.setCompletedUnitCount(1);
  progress.addChangeHandler([&] { second.push_back(progress.totalUnitCount()); });
  progress.setTotalUnitCount(5);
  progress.setTotalUnitCount(5);  // no change
  progress.setCompletedUnitCount(2);
  EXPECT_EQ(first, (std::vector<std::int64_t>{1, 1, 2}));
  EXPECT_EQ(second, (std::vector<std::int64_t>{5, 5}));
}

TEST(NSProgress, cancelsOnceByTheHandlerThatStands) {
  NSProgress progress;
  int earlier = 0, later = 0;
  progress.setCancellationHandler([&earlier] { ++earlier; });
  progress.setCancellationHandler([&later] { ++later; });
  progress.cancel();
  progress.cancel();
  EXPECT_EQ(earlier, 0);
  EXPECT_EQ(later, 1);
  progress.setCancellationHandler([&earlier] { ++earlier; });
  EXPECT_EQ(earlier, 1) << "at once, since it was cancelled";
}

TEST(NSProgress, whoShowsItIsToldWhetherCancellingMakesSense) {
  NSProgress progress;
  progress.setCancellable(false);
  EXPECT_FALSE(progress.isCancellable());
  progress.cancel();
  EXPECT_TRUE(progress.isCancelled()) << "it doesn't ask";
}

TEST(NSProgress, isTheThreadsCurrentOneForAScope) {
  const auto outer = std::make_shared<NSProgress>(), inner = std::make_shared<NSProgress>();
  EXPECT_FALSE(NSProgress::currentProgress());
  {
    const NSCurrentProgress one(outer);
    {
      const NSCurrentProgress two(inner);
      EXPECT_EQ(NSProgress::currentProgress(), inner);
      std::thread([] { EXPECT_FALSE(NSProgress::currentProgress()); }).join();
    }
    EXPECT_EQ(NSProgress::currentProgress(), outer);
  }
  EXPECT_FALSE(NSProgress::currentProgress());
}

}  // namespace
}  // namespace droxa
