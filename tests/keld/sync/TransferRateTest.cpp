#include <gtest/gtest.h>

#include "keld/sync/TransferRate.h"

namespace droxa::keld {
namespace {

using std::chrono::seconds;
const TransferRate::Clock::time_point kStart{seconds(1000)};

TEST(TransferRate, isTheMeanOfTheLastFiveSeconds) {
  TransferRate rate;
  rate.add(500, kStart);
  EXPECT_EQ(rate.bytesPerSecond(kStart), 100U);
  rate.add(1000, kStart + seconds(4));
  EXPECT_EQ(rate.bytesPerSecond(kStart + seconds(4)), 300U);
  EXPECT_EQ(rate.bytesPerSecond(kStart + seconds(5)), 200U) << "the first second is over";
}

TEST(TransferRate, isNothingWhenNothingMoves) {
  TransferRate rate;
  EXPECT_EQ(rate.bytesPerSecond(kStart), 0U);
  rate.add(500, kStart);
  EXPECT_EQ(rate.bytesPerSecond(kStart + seconds(9)), 0U);
  EXPECT_EQ(rate.bytesPerSecond(kStart + seconds(100'000)), 0U);
  EXPECT_EQ(rate.total(), 500U);
}

}  // namespace
}  // namespace droxa::keld
