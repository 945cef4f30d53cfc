#include <gtest/gtest.h>
#include <limits>

#include "platform/foundation/NSDate.h"

namespace droxa {
namespace {

std::string described(std::int64_t nanoseconds) {
  return NSDate::dateWithNanosecondsSince1970(nanoseconds).description();
}

TEST(NSDate, nilIsNotTheEpoch) {
  const NSDate nil;
  EXPECT_FALSE(nil);
  EXPECT_EQ(nil.description(), "(null)");
  EXPECT_NE(nil, NSDate::dateWithNanosecondsSince1970(0));
  EXPECT_TRUE(NSDate::dateWithNanosecondsSince1970(0));
}

TEST(NSDate, isOrderedByTime) {
  EXPECT_LT(NSDate::dateWithNanosecondsSince1970(-1), NSDate::dateWithNanosecondsSince1970(0));
  EXPECT_LE(NSDate::dateWithNanosecondsSince1970(5), NSDate::now());
}

TEST(NSDate, theDistantFutureIsAfterEveryOtherDate) {
  EXPECT_GT(NSDate::distantFuture(), NSDate::now());
  EXPECT_EQ(NSDate::distantFuture().nanosecondsSince1970(), std::numeric_limits<std::int64_t>::max());
}

TEST(NSDate, isDescribedInUTCWithNanoseconds) {
  EXPECT_EQ(described(1'769'860'800'123'456'789), "2026-01-31 12:00:00.123456789 +0000");
  EXPECT_EQ(described(0), "1970-01-01 00:00:00.000000000 +0000");
}

TEST(NSDate, countsForwardWithinASecondBefore1970) {
  EXPECT_EQ(described(-1), "1969-12-31 23:59:59.999999999 +0000");
  EXPECT_EQ(described(-1'000'000'000), "1969-12-31 23:59:59.000000000 +0000");
}

TEST(NSDate, describesTheEndsOfItsRange) {
  EXPECT_EQ(described(std::numeric_limits<std::int64_t>::max()), "2262-04-11 23:47:16.854775807 +0000");
  EXPECT_EQ(described(std::numeric_limits<std::int64_t>::min()), "1677-09-21 00:12:43.145224192 +0000");
}

}  // namespace
}  // namespace droxa
