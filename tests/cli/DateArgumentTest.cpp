#include <gtest/gtest.h>
#include <stdlib.h>
#include <time.h>

#include "cli/DateArgument.h"

namespace droxa::testing {
namespace {

class DateArgument : public ::testing::Test {
 protected:
  DateArgument() {
    setenv("TZ", "XYZ-2", 1);  // two hours to the east, all year
    tzset();
  }
};

std::string read(const std::string &text) {
  return dateFromText(text).description();
}

TEST_F(DateArgument, withAZoneIsThatMoment) {
  EXPECT_EQ(read("2026-01-31T12:00:00Z"), "2026-01-31 12:00:00.000000000 +0000");
  EXPECT_EQ(read("2026-01-31T12:00:00.123456789Z"), "2026-01-31 12:00:00.123456789 +0000");
  EXPECT_EQ(read("2026-01-31T12:00:00.5+01:00"), "2026-01-31 11:00:00.500000000 +0000");
  EXPECT_EQ(read("2026-01-31 12:00-0130"), "2026-01-31 13:30:00.000000000 +0000");
}

TEST_F(DateArgument, withoutOneIsLocal) {
  EXPECT_EQ(read("2026-01-31"), "2026-01-30 22:00:00.000000000 +0000");
  EXPECT_EQ(read("2026-01-31T12:00"), "2026-01-31 10:00:00.000000000 +0000");
  EXPECT_EQ(read("2026-01-31 12:00:07"), "2026-01-31 10:00:07.000000000 +0000");
}

TEST_F(DateArgument, beforeTheEpochAndLeapDaysAreDates) {
  EXPECT_EQ(read("1969-12-31T23:59:59Z"), "1969-12-31 23:59:59.000000000 +0000");
  EXPECT_EQ(read("2024-02-29T00:00:00Z"), "2024-02-29 00:00:00.000000000 +0000");
}

TEST_F(DateArgument, anythingElseIsNone) {
  for (const char *text : {"",
                           "yesterday",
                           "2026",
                           "2026-1-31",
                           "2026-13-01",
                           "2026-00-10",
                           "2026-02-30",
                           "2025-02-29",
                           "2026-01-31T",
                           "2026-01-31T24:00",
                           "2026-01-31T12",
                           "2026-01-31T12:60",
                           "2026-01-31T12:00:00.",
                           "2026-01-31T12:00:00.1234567890Z",
                           "2026-01-31T12:00Zx",
                           "2026-01-31Z",
                           "2026-01-31T12:00+1",
                           " 2026-01-31",
                           "2026-01-31 ",
                           "9999-01-01",
                           "0001-01-01",
                           "2262-12-31T00:00:00Z"})
    EXPECT_FALSE(dateFromText(text)) << text;
}

}  // namespace
}  // namespace droxa::testing
