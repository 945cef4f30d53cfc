#include <gtest/gtest.h>

#include "platform/foundation/UTF8.h"

namespace droxa {
namespace {

TEST(UTF8, knowsWhatIsWellFormed) {
  for (const char *text : {"", "plain", "é", "€", "🚀", "e\xcc\x81", "\xf4\x8f\xbf\xbf"}) {
    EXPECT_TRUE(UTF8IsValid(text)) << text;
  }
}

TEST(UTF8, knowsWhatIsNot) {
  for (const char *text : {"\x80", "\xc3", "\xc0\x80", "\xc1\xbf", "\xe0\x80\x80", "\xed\xa0\x80",
                           "\xf0\x9f\x9a", "\xf4\x90\x80\x80", "\xf5\x80\x80\x80", "\xff", "a\xc3z"}) {
    EXPECT_FALSE(UTF8IsValid(text)) << text;
  }
}

TEST(UTF8, aBeginningCutsNoCharacterInTwo) {
  EXPECT_EQ(UTF8Prefix("a🚀b", 4), "a");
  EXPECT_EQ(UTF8Prefix("a🚀b", 5), "a🚀");
  EXPECT_EQ(UTF8Prefix("abc", 9), "abc");
  EXPECT_EQ(UTF8Prefix("\xff\xff", 1), "\xff");
  EXPECT_EQ(UTF8Prefix("é", 0), "");
}

}  // namespace
}  // namespace droxa
