#include <gtest/gtest.h>

#include "platform/foundation/PercentEncoding.h"

namespace droxa {
namespace {

TEST(PercentEncoding, leavesUnreservedBytesAndSlashes) {
  const std::string path = "/azAZ09-._~/x";
  EXPECT_EQ(PercentEncodedPath(path), path);
}

TEST(PercentEncoding, encodesEveryOtherByte) {
  EXPECT_EQ(PercentEncodedPath("a b%?#\n\xff\xc3\xa9"), "a%20b%25%3F%23%0A%FF%C3%A9");
  EXPECT_EQ(PercentEncodedPath(":@!$&'()*+,;="), "%3A%40%21%24%26%27%28%29%2A%2B%2C%3B%3D");
}

TEST(PercentEncoding, decodesWhatItEncoded) {
  std::string everyByte;
  for (int byte = 0; byte < 256; ++byte) everyByte += static_cast<char>(byte);
  EXPECT_EQ(PercentDecoded(PercentEncodedPath(everyByte)), everyByte);
}

TEST(PercentEncoding, decodesDigitsOfEitherCase) {
  EXPECT_EQ(PercentDecoded("%c3%A9"), "\xc3\xa9");
}

TEST(PercentEncoding, refusesIncompleteAndForeignDigits) {
  EXPECT_EQ(PercentDecoded("%"), std::nullopt);
  EXPECT_EQ(PercentDecoded("a%2"), std::nullopt);
  EXPECT_EQ(PercentDecoded("%2g"), std::nullopt);
  EXPECT_EQ(PercentDecoded("%+1"), std::nullopt);
}

}  // namespace
}  // namespace droxa
