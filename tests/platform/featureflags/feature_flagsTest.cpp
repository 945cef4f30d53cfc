#include <gtest/gtest.h>
#include <sys/stat.h>

#include "platform/featureflags/feature_flags.h"
#include "platform/foundation/Paths.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class FeatureFlags : public testing::Test {
 protected:
  FeatureFlags() { OSFeatureFlagsSetFolders(folder_.path() + "/user", folder_.path() + "/system"); }
  ~FeatureFlags() override { OSFeatureFlagsSetFolders("", ""); }

  bool enabledBy(const std::string &contents) {
    folder_.write("user/Domain/Name", contents);
    return _os_feature_enabled_impl("Domain", "Name");
  }

  const TemporaryFolder folder_;
};

TEST_F(FeatureFlags, aFeatureWithoutAFileIsDisabled) {
  EXPECT_FALSE(_os_feature_enabled_impl("Domain", "Name"));
}

TEST_F(FeatureFlags, aFileEnables) {
  for (const char *text : {"", "\n", "1", "true", "yes\n", " on \r\n"}) EXPECT_TRUE(enabledBy(text)) << text;
}

TEST_F(FeatureFlags, aFileDisables) {
  for (const char *text : {"0", "false\n", "no", "off", "2", "enabled", "true true"}) {
    EXPECT_FALSE(enabledBy(text)) << text;
  }
  EXPECT_FALSE(enabledBy(std::string(1000, ' ')));
}

TEST_F(FeatureFlags, theUsersFileCountsBeforeTheSystems) {
  folder_.write("system/Domain/Name", "1");
  EXPECT_TRUE(_os_feature_enabled_impl("Domain", "Name"));
  EXPECT_FALSE(enabledBy("0"));
  folder_.write("system/Domain/Name", "0");
  EXPECT_TRUE(enabledBy("1"));
}

TEST_F(FeatureFlags, whatIsNoFileDisables) {
  folder_.write("system/Domain/Name", "1");
  std::filesystem::create_directories(folder_.path() + "/user/Domain/Name");
  EXPECT_FALSE(_os_feature_enabled_impl("Domain", "Name"));
  ASSERT_EQ(mkfifo((folder_.path() + "/user/Domain/Pipe").c_str(), 0600), 0);
  EXPECT_FALSE(_os_feature_enabled_impl("Domain", "Pipe"));
}

TEST_F(FeatureFlags, namesDoNotLeadOutOfTheFolder) {
  folder_.write("user/Domain/Name", "1");
  folder_.write("Name", "1");
  for (const char *domain : {"", ".", "..", "../user/Domain", "Domain/"}) {
    EXPECT_FALSE(_os_feature_enabled_impl(domain, "Name")) << domain;
  }
  EXPECT_FALSE(_os_feature_enabled_impl("Domain", "../Domain/Name"));
  EXPECT_FALSE(_os_feature_enabled_impl("Domain", std::string_view("Name\0", 5)));
}

TEST_F(FeatureFlags, theUsersFolderIsInTheConfigurationFolderByDefault) {
  const DroxaHome before = DroxaProcessHome();
  OSFeatureFlagsSetFolders("", folder_.path() + "/system");
  DroxaSetProcessHome(DroxaHome(folder_.path() + "/home"));
  folder_.write("home/config/feature-flags/Domain/Name", "yes");
  EXPECT_TRUE(_os_feature_enabled_impl("Domain", "Name"));
  DroxaSetProcessHome(before);
}

}  // namespace
}  // namespace droxa
