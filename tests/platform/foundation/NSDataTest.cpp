#include <gtest/gtest.h>

#include "platform/foundation/NSData.h"

namespace droxa {
namespace {

TEST(NSData, nilDiffersFromEmpty) {
  const NSData nil;
  const NSData empty = NSData::dataWithBytes(nullptr, 0);
  EXPECT_FALSE(nil);
  EXPECT_TRUE(empty);
  EXPECT_NE(nil, empty);
  EXPECT_EQ(nil, NSData());
  EXPECT_EQ(nil.length(), 0U);
  EXPECT_TRUE(nil.bytes().empty());
  EXPECT_TRUE(empty.bytes().empty());
}

TEST(NSData, comparesByItsBytes) {
  EXPECT_EQ(NSData::dataWithString("abc"), NSData::dataWithBytes("abc", 3));
  EXPECT_NE(NSData::dataWithString("abc"), NSData::dataWithString("abd"));
  EXPECT_NE(NSData::dataWithString("abc"), NSData::dataWithString("abcd"));
}

TEST(NSData, keepsBytesOfAnyValue) {
  const std::uint8_t bytes[] = {0, 255, 10, 0};
  const NSData data = NSData::dataWithBytes(bytes);
  ASSERT_EQ(data.length(), 4U);
  EXPECT_EQ(data.bytes()[1], 255);
  EXPECT_EQ(data.bytes()[3], 0);
}

TEST(NSData, isDescribedByLengthAndBytes) {
  EXPECT_EQ(NSData().description(), "(null)");
  EXPECT_EQ(NSData::dataWithString("").description(), "{length = 0, bytes = 0x}");
  EXPECT_EQ(NSData::dataWithString("\x01\x02\xfe").description(), "{length = 3, bytes = 0x0102fe}");
}

TEST(NSData, showsAtMost24Bytes) {
  const std::string shown(48, '1');
  EXPECT_EQ(NSData::dataWithString(std::string(24, '\x11')).description(),
            "{length = 24, bytes = 0x" + shown + "}");
  EXPECT_EQ(NSData::dataWithString(std::string(25, '\x11')).description(),
            "{length = 25, bytes = 0x" + shown + " ...}");
}

}  // namespace
}  // namespace droxa
