#include <filesystem>
#include <gtest/gtest.h>
#include <unistd.h>

#include "platform/foundation/ProcessLock.h"

namespace droxa::testing {
namespace {

std::string lockPath(const std::string &name) {
  return ::testing::TempDir() + "/droxa-lock-" + name + "-" + std::to_string(getpid());
}

TEST(ProcessLock, oneHoldsItAndTheOtherIsToldWho) {
  const std::string path = lockPath("held");
  int holder = -1;
  std::string problem;
  {
    const auto lock = ProcessLock::acquire(path, &holder, &problem);
    ASSERT_TRUE(lock) << problem;
    EXPECT_EQ(ProcessLock::holderOf(path), getpid());
    EXPECT_FALSE(ProcessLock::acquire(path, &holder, &problem));
    EXPECT_EQ(holder, getpid());
    EXPECT_NE(problem.find(path), std::string::npos);
  }
  EXPECT_EQ(ProcessLock::holderOf(path), 0);
  EXPECT_TRUE(ProcessLock::acquire(path, &holder, &problem));
  std::filesystem::remove(path);
}

TEST(ProcessLock, aFileThatCantBeMadeIsNamed) {
  int holder = -1;
  std::string problem;
  EXPECT_FALSE(ProcessLock::acquire("/no/such/folder/lock", &holder, &problem));
  EXPECT_EQ(holder, 0);
  EXPECT_NE(problem.find("/no/such/folder/lock"), std::string::npos);
  EXPECT_EQ(ProcessLock::holderOf("/no/such/folder/lock"), 0);
}

}  // namespace
}  // namespace droxa::testing
