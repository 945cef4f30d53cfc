#include <cerrno>
#include <gtest/gtest.h>

#include "cli/Commands.h"
#include "tests/cli/ScriptedHost.h"

namespace droxa::testing {
namespace {

class MountCommands : public ::testing::Test, protected CommandFixture {
 protected:
  int mount(const std::string &path) {
    return run([&](CommandContext &made) { return runMount(made, path); });
  }
  std::string status() {
    run([](CommandContext &made) { return runStatus(made, false); });
    return out.str();
  }
};

TEST_F(MountCommands, mountPrintsWhereTheDriveIs) {
  EXPECT_EQ(mount(""), 0);
  EXPECT_EQ(out.str(), "/home/anna/Droxa Drive\n");
  EXPECT_EQ(mount("/mnt/x/../drive"), 0);
  EXPECT_EQ(out.str(), "/mnt/drive\n");
  EXPECT_NE(status().find("mount          /mnt/drive\n"), std::string::npos);
  EXPECT_EQ(run([](CommandContext &made) { return runUnmount(made); }), 0);
  EXPECT_NE(status().find("mount          none\n"), std::string::npos);
}

TEST_F(MountCommands, whyItCantBeMountedIsSaid) {
  host->mountError = NSError::errorWithPOSIXCode(ENODEV, "/mnt/full: is not empty; name an empty folder");
  EXPECT_EQ(mount("/mnt/full"), 1);
  EXPECT_NE(err.str().find("is not empty"), std::string::npos) << err.str();
  host->status.mountProblem = "there is no program fusermount3";
  EXPECT_NE(status().find("mount          none: there is no program fusermount3"), std::string::npos);
}

}  // namespace
}  // namespace droxa::testing
