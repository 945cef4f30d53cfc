#include <gtest/gtest.h>

#include "platform/foundation/NSObject.h"

namespace droxa {

class Lamp : public NSObject {};

namespace {

TEST(NSObject, isDescribedByItsClassAndAddress) {
  const Lamp lamp;
  const Lamp other;
  EXPECT_TRUE(lamp.description().starts_with("<Lamp: 0x")) << lamp.description();
  EXPECT_TRUE(lamp.description().ends_with(">"));
  EXPECT_NE(lamp.description(), other.description());
}

}  // namespace
}  // namespace droxa
