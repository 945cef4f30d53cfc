#include <fstream>
#include <gtest/gtest.h>

#include "tessaly/QVHomeCloud.h"
#include "tests/support/ScratchHome.h"

namespace droxa {
namespace {

class QVHomeCloudTest : public testing::Test {
 protected:
  std::optional<QVHomeCloud> read(const std::string &json) {
    std::ofstream(home.configuration() + "/cloud.json") << json;
    return QVHomeCloudRead(home, &error);
  }

  ScratchHome scratch;
  const DroxaHome home = DroxaProcessHome();
  NSError error;
};

TEST_F(QVHomeCloudTest, whatIsRememberedIsRead) {
  EXPECT_EQ(read(R"({"cloud": "/drive", "device": "desk", "account": "vera"})"),
            (QVHomeCloud{"/drive", "desk", "vera"}));
  EXPECT_EQ(read(R"({"cloud": null, "device": null})"), QVHomeCloud());
  EXPECT_FALSE(error);
}

TEST_F(QVHomeCloudTest, nothingRememberedIsNoError) {
  EXPECT_EQ(QVHomeCloudRead(home, &error), std::nullopt);
  EXPECT_FALSE(error);
}

TEST_F(QVHomeCloudTest, aFileThatCannotBeReadIsNamed) {
  EXPECT_EQ(read("nonsense"), std::nullopt);
  EXPECT_NE(error.localizedDescription().find("cloud.json"), std::string::npos);
}

TEST_F(QVHomeCloudTest, whatIsLeftOutHasADefault) {
  const QVHomeCloud cloud = QVHomeCloudWithDefaults(home, {});
  EXPECT_EQ(cloud.folder, home.root() + "/cloud");
  EXPECT_EQ(cloud.device, QVDeviceName(home));
  EXPECT_EQ(cloud.account, QVLocalUserName());
  EXPECT_EQ(QVHomeCloudWithDefaults(home, {"/a", "b", "c"}), (QVHomeCloud{"/a", "b", "c"}));
  EXPECT_FALSE(cloud.device.empty());
  EXPECT_FALSE(cloud.account.empty());
}

}  // namespace
}  // namespace droxa
