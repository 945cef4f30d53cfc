#include <gtest/gtest.h>
#include <pwd.h>
#include <unistd.h>

#include "platform/foundation/NSFileHandle.h"
#include "tests/platform/EnvironmentVariable.h"

namespace droxa {
namespace {

TEST(NSHomeDirectory, isWhatWasSetElseTheEnvironmentsElseTheDatabases) {
  const EnvironmentVariable home("HOME", "/home/of-the-environment");
  EXPECT_EQ(NSHomeDirectory(), "/home/of-the-environment");
  NSSetHomeDirectory("/home/that-was-set");
  EXPECT_EQ(NSHomeDirectory(), "/home/that-was-set");
  NSSetHomeDirectory(std::nullopt);
  EXPECT_EQ(NSHomeDirectory(), "/home/of-the-environment");
  const EnvironmentVariable none("HOME", std::nullopt);
  const passwd *entry = getpwuid(getuid());
  EXPECT_EQ(NSHomeDirectory(), entry ? entry->pw_dir : "/");
}

}  // namespace
}  // namespace droxa
