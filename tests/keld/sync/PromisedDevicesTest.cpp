// A device whose file system has no extended attributes: what the cloud has is a promise there until it is
// wanted.

#include "TwoDevices.h"
#include "keld/contents/PromiseFile.h"

namespace droxa::keld {

namespace {

class PromisedDevices : public testing::Test {
 protected:
  static KeldOptions options(const std::string &cloudFolder) {
    KeldOptions options = DeviceOptions(cloudFolder, "ben");
    options.sync.contents.assume = ContentsCapabilities{false, false, true, true};
    return options;
  }
  const TemporaryFolder folder;
  const std::string cloudFolder = folder.path() + "/cloud";
  Device anna{cloudFolder, "anna"};
  Device ben{options(cloudFolder)};
};

}  // namespace

TEST_F(PromisedDevices, aDocumentOfTheCloudComesAsAPromiseAndIsFetched) {
  anna.keld.write("a", "anna's");
  ASSERT_FALSE(anna.waitForUploads("a"));
  ASSERT_TRUE(ben.knowsSoon("a"));
  EXPECT_TRUE(ben.exists(PromiseNameFor("a")));
  EXPECT_FALSE(ben.exists("a"));
  EXPECT_TRUE(eventually([&] { return ben.status("a").upload == QVUploadState::inCloud; }));
  EXPECT_TRUE(ben.isDataless("a"));
  const ItemNumber number = ben.keld.number("a");
  EXPECT_TRUE(ben.saysSoon("a", "anna's"));
  EXPECT_EQ(ben.keld.number("a"), number);
  EXPECT_EQ(anna.names(), std::vector<std::string>{"a"});
}

TEST_F(PromisedDevices, whatIsLetGoOfIsAPromiseAndStaysInTheCloud) {
  ben.keld.write("b", "ben's");
  ASSERT_FALSE(ben.waitForUploads("b"));
  const ItemNumber number = ben.keld.number("b");
  NSError error;
  ASSERT_TRUE(eventually([&] { return !(error = ben.evict("b")); })) << error.description();
  EXPECT_TRUE(ben.exists(PromiseNameFor("b")));
  EXPECT_TRUE(eventually([&] { return ben.keld.number("b") == number && ben.isDataless("b"); }));
  ASSERT_TRUE(anna.knowsSoon("b"));
  EXPECT_TRUE(ben.saysSoon("b", "ben's"));
}

}  // namespace droxa::keld
