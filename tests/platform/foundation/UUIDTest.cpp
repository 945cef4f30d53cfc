#include <gtest/gtest.h>
#include <set>

#include "platform/foundation/UUID.h"

namespace droxa {
namespace {

TEST(UUID, isNullUntilItIsGenerated) {
  UUID uuid;
  EXPECT_TRUE(uuid.isNull());
  uuid_generate(uuid);
  EXPECT_FALSE(uuid.isNull());
}

TEST(UUID, isDifferentEachTime) {
  std::set<std::string> seen;
  for (int i = 0; i < 1000; ++i) seen.insert(UUID::generate().description());
  EXPECT_EQ(seen.size(), 1000U);
}

TEST(UUID, isOfTheRandomKind) {
  const UUID uuid = UUID::generate();
  EXPECT_EQ(uuid.bytes[6] >> 4, 4);
  EXPECT_EQ(uuid.bytes[8] >> 6, 2);
}

TEST(UUID, comparesByUnsignedBytesFromTheFirst) {
  UUID low;
  UUID high;
  low.bytes[15] = 0xff;
  high.bytes[0] = 0x80;
  EXPECT_LT(uuid_compare(low, high), 0);
  EXPECT_GT(uuid_compare(high, low), 0);
  EXPECT_EQ(uuid_compare(high, high), 0);
}

TEST(UUID, isDescribedInGroups) {
  UUID uuid;
  for (std::size_t i = 0; i < 16; ++i) uuid.bytes[i] = static_cast<std::uint8_t>(i * 17);
  EXPECT_EQ(uuid.description(), "00112233-4455-6677-8899-AABBCCDDEEFF");
}

}  // namespace
}  // namespace droxa
