#include <gtest/gtest.h>
#include <limits>
#include <vector>

#include "additions/NSData+Additions.h"
#include "platform/fileprovider/NSFileProviderItem.h"

namespace droxa {
namespace {

using Bytes = std::vector<std::uint8_t>;

NSData dataOf(const Bytes &bytes) {
  return NSData::dataWithBytes(bytes.data(), bytes.size());
}

Bytes bytesOf(const NSData &data) {
  return Bytes(data.bytes().begin(), data.bytes().end());
}

UUID countingUUID() {
  UUID uuid;
  for (std::size_t i = 0; i < uuid.bytes.size(); ++i) uuid.bytes[i] = static_cast<std::uint8_t>(0xA0 + i);
  return uuid;
}

NSData truncated(const NSData &data, std::size_t length) {
  Bytes bytes = bytesOf(data);
  bytes.resize(length);
  return dataOf(bytes);
}

TEST(PageToken, hasNoTokenForOffsetZero) {
  EXPECT_FALSE(qv_pageTokenFromSortOrder(1, 0));
  EXPECT_FALSE(qv_pageTokenFromSortOrder(0, 0));
}

TEST(PageToken, isSixteenBytesOfOffsetSortOrderAndZeros) {
  EXPECT_EQ(bytesOf(qv_pageTokenFromSortOrder(1, 200)),
            (Bytes{0xC8, 0, 0, 0, 0, 0, 0, 0, 1, 0, 0, 0, 0, 0, 0, 0}));
  EXPECT_EQ(bytesOf(qv_pageTokenFromSortOrder(0, 0x1122334455667788)),
            (Bytes{0x88, 0x77, 0x66, 0x55, 0x44, 0x33, 0x22, 0x11, 0, 0, 0, 0, 0, 0, 0, 0}));
}

TEST(PageToken, readsBackWhatWasWritten) {
  for (const std::uint64_t offset : {std::uint64_t{1}, std::uint64_t{200}, std::uint64_t{1} << 40,
                                     std::numeric_limits<std::uint64_t>::max()}) {
    for (const std::int64_t sortOrder : {0, 1, 2, 255}) {
      const NSData token = qv_pageTokenFromSortOrder(sortOrder, offset);
      EXPECT_EQ(qv_pageTokenOffset(token), offset);
      EXPECT_EQ(qv_pageTokenSortOrder(token), sortOrder);
    }
  }
}

TEST(PageToken, keepsTheLowByteOfTheSortOrderAlone) {
  EXPECT_EQ(qv_pageTokenSortOrder(qv_pageTokenFromSortOrder(257, 200)), 1);
  EXPECT_EQ(qv_pageTokenSortOrder(qv_pageTokenFromSortOrder(256, 200)), 0);
  EXPECT_EQ(qv_pageTokenSortOrder(qv_pageTokenFromSortOrder(-1, 200)), 255);
}

TEST(PageToken, knowsTheInitialPages) {
  EXPECT_EQ(qv_pageTokenSortOrder(NSFileProviderInitialPageSortedByDate()), 1);
  EXPECT_EQ(qv_pageTokenSortOrder(NSFileProviderInitialPageSortedByName()), 0);
  EXPECT_EQ(qv_pageTokenOffset(NSFileProviderInitialPageSortedByDate()), 0u);
  EXPECT_EQ(qv_pageTokenOffset(NSFileProviderInitialPageSortedByName()), 0u);
}

TEST(PageToken, aTruncatedTokenCountsAsZeroExtended) {
  const NSData token = qv_pageTokenFromSortOrder(1, 0x1122334455667788);
  EXPECT_EQ(qv_pageTokenOffset(truncated(token, 2)), 0x7788u);
  EXPECT_EQ(qv_pageTokenSortOrder(truncated(token, 2)), 0);
  EXPECT_EQ(qv_pageTokenOffset(truncated(token, 8)), 0x1122334455667788u);
  EXPECT_EQ(qv_pageTokenSortOrder(truncated(token, 8)), 0);
  EXPECT_EQ(qv_pageTokenSortOrder(truncated(token, 9)), 1);
  EXPECT_EQ(qv_pageTokenOffset(truncated(token, 0)), 0u);
  EXPECT_EQ(qv_pageTokenSortOrder(truncated(token, 0)), 0);
}

TEST(PageToken, ofAnOversizedTokenTheFirstBytesCount) {
  Bytes bytes = bytesOf(qv_pageTokenFromSortOrder(1, 400));
  bytes.resize(1 << 20, 0xFF);
  EXPECT_EQ(qv_pageTokenOffset(dataOf(bytes)), 400u);
  EXPECT_EQ(qv_pageTokenSortOrder(dataOf(bytes)), 1);
}

TEST(PageToken, foreignBytesAreReadAsTheyStand) {
  const NSData foreign = dataOf(Bytes(16, 0xFF));
  EXPECT_EQ(qv_pageTokenOffset(foreign), std::numeric_limits<std::uint64_t>::max());
  EXPECT_EQ(qv_pageTokenSortOrder(foreign), 255);
}

TEST(PageToken, noTokenReadsAsTheFirstPageByName) {
  EXPECT_EQ(qv_pageTokenOffset(NSData()), 0u);
  EXPECT_EQ(qv_pageTokenSortOrder(NSData()), 0);
}

TEST(ChangeToken, isTwentyFourBytesOfRankAndUUID) {
  EXPECT_EQ(bytesOf(qv_changeTokenFromRank(42, countingUUID())),
            (Bytes{0x2A, 0,    0,    0,    0,    0,    0,    0,    0xA0, 0xA1, 0xA2, 0xA3,
                   0xA4, 0xA5, 0xA6, 0xA7, 0xA8, 0xA9, 0xAA, 0xAB, 0xAC, 0xAD, 0xAE, 0xAF}));
  EXPECT_EQ(bytesOf(qv_changeTokenFromRank(-2, UUID())),
            (Bytes{0xFE, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0, 0, 0, 0,
                   0,    0,    0,    0,    0,    0,    0,    0,    0, 0, 0, 0}));
}

TEST(ChangeToken, aTokenForRankZeroExists) {
  EXPECT_EQ(qv_changeTokenFromRank(0, countingUUID()).length(), 24u);
}

TEST(ChangeToken, givesItsRankToItsIssuerAlone) {
  const UUID issuer = UUID::generate();
  const NSData token = qv_changeTokenFromRank(42, issuer);
  EXPECT_EQ(qv_changeTokenRankWithUUID(token, issuer), 42);
  EXPECT_EQ(qv_changeTokenRankWithUUID(token, UUID::generate()), -1);
  EXPECT_EQ(qv_changeTokenRankWithUUID(token, UUID()), -1);
}

TEST(ChangeToken, everyByteOfTheUUIDCounts) {
  const NSData token = qv_changeTokenFromRank(42, countingUUID());
  for (std::size_t i = 0; i < 16; ++i) {
    UUID other = countingUUID();
    other.bytes[i] ^= 1;
    EXPECT_EQ(qv_changeTokenRankWithUUID(token, other), -1) << "byte " << i;
  }
}

TEST(ChangeToken, keepsTheWholeRangeOfRanks) {
  for (const std::int64_t rank :
       {std::int64_t{0}, std::int64_t{1} << 62, std::numeric_limits<std::int64_t>::max(),
        std::numeric_limits<std::int64_t>::min()}) {
    EXPECT_EQ(qv_changeTokenRankWithUUID(qv_changeTokenFromRank(rank, countingUUID()), countingUUID()), rank);
  }
}

TEST(ChangeToken, aTruncatedTokenIsForeign) {
  const NSData token = qv_changeTokenFromRank(42, countingUUID());
  for (std::size_t length = 0; length < 24; ++length) {
    EXPECT_EQ(qv_changeTokenRankWithUUID(truncated(token, length), countingUUID()), -1) << length;
  }
}

TEST(ChangeToken, anEmptyTokenIsForeignToEveryUUIDButTheNullOne) {
  const NSData empty = dataOf({});
  ASSERT_TRUE(empty);
  EXPECT_EQ(qv_changeTokenRankWithUUID(empty, UUID::generate()), -1);
  EXPECT_EQ(qv_changeTokenRankWithUUID(empty, UUID()), 0);
}

TEST(ChangeToken, ofAnOversizedTokenTheFirstBytesCount) {
  Bytes bytes = bytesOf(qv_changeTokenFromRank(7, countingUUID()));
  bytes.resize(1 << 20, 0xFF);
  EXPECT_EQ(qv_changeTokenRankWithUUID(dataOf(bytes), countingUUID()), 7);
}

TEST(ChangeToken, aPageTokenIsForeign) {
  EXPECT_EQ(qv_changeTokenRankWithUUID(qv_pageTokenFromSortOrder(1, 200), countingUUID()), -1);
}

// As every question to nothing; an enumerator never asks it with a token of its own.
TEST(ChangeToken, noTokenAnswersZero) {
  EXPECT_EQ(qv_changeTokenRankWithUUID(NSData(), countingUUID()), 0);
}

}  // namespace
}  // namespace droxa
