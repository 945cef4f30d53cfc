#include <gtest/gtest.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/foundation/DescriptorLimit.h"

namespace droxa {
namespace {

// What is left of `before` in a process of its own.
rlimit raised(rlimit before) {
  int ends[2] = {-1, -1};
  EXPECT_EQ(pipe(ends), 0);
  const pid_t child = fork();
  if (child == 0) {
    rlimit after{};
    if (setrlimit(RLIMIT_NOFILE, &before) != 0) _exit(1);
    DroxaRaiseDescriptorLimit();
    getrlimit(RLIMIT_NOFILE, &after);
    _exit(write(ends[1], &after, sizeof after) == sizeof after ? 0 : 1);
  }
  rlimit after{};
  close(ends[1]);
  EXPECT_EQ(read(ends[0], &after, sizeof after), static_cast<ssize_t>(sizeof after));
  close(ends[0]);
  waitpid(child, nullptr, 0);
  return after;
}

TEST(DescriptorLimit, isRaisedAsFarAsTheSystemLetsIt) {
  EXPECT_EQ(raised({64, 1000}).rlim_cur, 1000u);
}

TEST(DescriptorLimit, leavesWhatTheSystemAllowsAtMostAsItIs) {
  EXPECT_EQ(raised({64, 1000}).rlim_max, 1000u);
}

TEST(DescriptorLimit, isNeverLowered) {
  rlimit own{};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &own), 0);
  EXPECT_GE(raised(own).rlim_cur, own.rlim_cur);
}

}  // namespace
}  // namespace droxa
