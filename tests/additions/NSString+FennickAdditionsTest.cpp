#include <gtest/gtest.h>

#include "additions/NSString+FennickAdditions.h"

namespace droxa {
namespace {

TEST(StringWithSize, hasTwoDecimals) {
  EXPECT_EQ(qv_stringWithSize({12, 7.5}), "{12.00, 7.50}");
  EXPECT_EQ(qv_stringWithSize({0, 0}), "{0.00, 0.00}");
  EXPECT_EQ(qv_stringWithSize({1.005, 2.999}), "{1.00, 3.00}");
  EXPECT_EQ(qv_stringWithSize({-3.14159, 1e6}), "{-3.14, 1000000.00}");
}

}  // namespace
}  // namespace droxa
