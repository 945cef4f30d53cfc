#include "tessaly/QVHomeCloud.h"
#include "tests/thumbnails/ThumbnailsFixture.h"
#include "thumbnails/QVUbiquitousCloudKitContainer.h"

namespace droxa {
namespace {

namespace fs = std::filesystem;

class UbiquitousCloudKitContainer : public ExtensionTest {
 protected:
  UbiquitousCloudKitContainer() { QVRegisterUbiquitousCloudKitContainer(); }
  ~UbiquitousCloudKitContainer() override {
    CKContainer::registerContainer(QVUbiquitousCloudKitContainerIdentifier, nullptr);
  }
  std::shared_ptr<CKContainer> container(NSError *error) const {
    return CKContainer::containerWithIdentifier(QVUbiquitousCloudKitContainerIdentifier, error);
  }
  void makeCloud(const std::string &folder) const {
    NSError error;
    EXPECT_TRUE(EmbeddedCloud::open(folder, QVLocalUserName(), "another", &error)) << error.description();
  }
  void remember(const std::string &json) const {
    std::ofstream(home.configuration() + "/cloud.json") << json;
  }
};

TEST_F(UbiquitousCloudKitContainer, aCloudThatIsNotThereIsNotMade) {
  NSError error;
  EXPECT_FALSE(container(&error));
  EXPECT_TRUE(CKErrorIs(error, CKErrorCode::serviceUnavailable)) << error.description();
  EXPECT_FALSE(fs::exists(home.path() + "/cloud"));
  EXPECT_FALSE(container(nullptr));
}

TEST_F(UbiquitousCloudKitContainer, theHomesOwnCloudIsOpenedOnce) {
  makeCloud(home.path() + "/cloud");
  NSError error;
  const auto first = container(&error);
  ASSERT_TRUE(first) << error.description();
  EXPECT_EQ(first->privateCloudDatabase()->cloud()->deviceName(), QVDeviceName(DroxaProcessHome()));
  EXPECT_EQ(container(nullptr), first);
}

TEST_F(UbiquitousCloudKitContainer, aCloudThatComesLaterIsOpenedThen) {
  EXPECT_FALSE(container(nullptr));
  makeCloud(home.path() + "/cloud");
  EXPECT_TRUE(container(nullptr));
}

TEST_F(UbiquitousCloudKitContainer, whatTheHomeRemembersIsOpened) {
  makeCloud(home.path() + "/elsewhere");
  remember(R"({"cloud": ")" + home.path() + R"(/elsewhere", "device": "desk", "account": "vera"})");
  NSError error;
  const auto found = container(&error);
  ASSERT_TRUE(found) << error.description();
  EXPECT_EQ(found->privateCloudDatabase()->cloud()->deviceName(), "desk");
  EXPECT_EQ(found->privateCloudDatabase()->cloud()->currentUserIdentity({}).identity.accountName, "vera");
}

TEST_F(UbiquitousCloudKitContainer, aFileThatCannotBeReadIsNamed) {
  makeCloud(home.path() + "/cloud");
  remember("not JSON");
  NSError error;
  EXPECT_FALSE(container(&error));
  EXPECT_NE(error.localizedDescription().find("cloud.json"), std::string::npos) << error.description();
}

TEST_F(UbiquitousCloudKitContainer, aContainerThatNobodyRegisteredIsAnError) {
  NSError error;
  EXPECT_FALSE(CKContainer::containerWithIdentifier("unheard of", &error));
  EXPECT_TRUE(CKErrorIs(error, CKErrorCode::invalidArguments));
}

}  // namespace
}  // namespace droxa
