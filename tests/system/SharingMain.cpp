// The tests of sharing bring an /etc of their own, which has to come before the first thread.

#include <gtest/gtest.h>

#include "tests/system/OwnEtc.h"

int main(int argc, char **argv) {
  droxa::testing::OwnEtc::enter();
  ::testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
