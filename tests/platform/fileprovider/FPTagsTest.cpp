#include <gtest/gtest.h>

#include "platform/fileprovider/FPTags.h"

namespace droxa {
namespace {

using Tags = std::vector<FPTag>;

NSData dataOf(const std::string &text) {
  return NSData::dataWithString(text);
}

std::string textOf(const NSData &data) {
  return {data.bytes().begin(), data.bytes().end()};
}

TEST(FPTags, readBackInTheirOrder) {
  const Tags tags = {{"Work", 6}, {"", 0}, {"Ünï 🚀", 7}, {"plain", 0}};
  EXPECT_EQ(FPGetTagsFromTagsData(FPGetTagsDataFromTags(tags)),
            (Tags{{"Work", 6}, {"Ünï 🚀", 7}, {"plain", 0}}));
}

TEST(FPTags, noneIsNoBlob) {
  EXPECT_FALSE(FPGetTagsDataFromTags({}));
  EXPECT_EQ(FPGetTagsFromTagsData(NSData()), Tags());
  EXPECT_EQ(FPGetTagsFromTagsData(dataOf("")), Tags());
}

TEST(FPTags, labelsThatCantBeReadBackAreLeftOut) {
  const Tags tags = {
      {"line\nbreak", 1}, {"\xff", 1}, {std::string("\xc2\x85"), 1}, {std::string(70'000, 'x'), 1}};
  EXPECT_FALSE(FPGetTagsDataFromTags(tags));
}

TEST(FPTags, anUnknownColourIsNone) {
  EXPECT_EQ(FPGetTagsFromTagsData(FPGetTagsDataFromTags({{"a", 8}})), (Tags{{"a", 0}}));
}

TEST(FPTags, theLongestLabelReadsBack) {
  const Tags tags = {{std::string(65'535, 'x'), 3}};
  EXPECT_EQ(FPGetTagsFromTagsData(FPGetTagsDataFromTags(tags)), tags);
}

TEST(FPTags, whatIsCutOffLeavesTheTagsBefore) {
  const std::string blob = textOf(FPGetTagsDataFromTags({{"one", 1}, {"two", 2}}));
  const std::size_t first = blob.size() - 6;
  for (std::size_t length = 0; length < blob.size(); ++length) {
    const Tags expected = length < first ? Tags() : Tags{{"one", 1}};
    EXPECT_EQ(FPGetTagsFromTagsData(dataOf(blob.substr(0, length))), expected) << length;
  }
}

TEST(FPTags, hostileBytesArePassedOver) {
  const std::string head("dxtg\x01", 5);
  const std::string good("\x02\x00\x01z", 4);
  EXPECT_EQ(FPGetTagsFromTagsData(dataOf("not tags at all")), Tags());
  EXPECT_EQ(FPGetTagsFromTagsData(dataOf("dxtg\x02" + good)), Tags());
  for (const std::string &bad : {std::string("\x09\x00\x01z", 4), std::string("\x01\xff\xffz", 4),
                                 std::string("\x01\x00\x01\n", 4), std::string("\x01\x00\x01\xe2", 4)}) {
    EXPECT_EQ(FPGetTagsFromTagsData(dataOf(head + good + bad + good)), (Tags{{"z", 2}})) << bad;
  }
}

}  // namespace
}  // namespace droxa
