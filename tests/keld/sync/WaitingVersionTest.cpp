// Newer versions that can't be fetched for a while, and what is written meanwhile.

#include "tests/keld/sync/TwoDevices.h"
#include "tests/support/FaultyCloud.h"

namespace droxa::keld {
namespace {

// A device whose downloads fail while the test wants them to.
class WaitingVersion : public testing::Test {
 protected:
  static KeldOptions optionsWith(std::shared_ptr<CKCloud> cloud) {
    KeldOptions options;
    options.sync.cloud = std::move(cloud);
    return options;
  }
  std::shared_ptr<CKCloud> open(const std::string &device) {
    NSError error;
    auto cloud = EmbeddedCloud::open(folder.path() + "/cloud", "ada", device, &error);
    EXPECT_TRUE(cloud) << error.description();
    return cloud;
  }
  // The name of the copy on a device; "" while there is none.
  static std::string conflictCopy(Device &device) {
    for (const auto &entry : std::filesystem::directory_iterator(device.keld.at("")))
      if (entry.path().filename().string().find("conflict, ben") != std::string::npos)
        return entry.path().filename();
    return {};
  }
  const TemporaryFolder folder;
  const std::shared_ptr<FaultyCloud> faulty = std::make_shared<FaultyCloud>(open("ben"));
  Device anna{optionsWith(open("anna"))}, ben{optionsWith(faulty)};
};

TEST_F(WaitingVersion, anEditUnderAVersionThatWaitsIsKeptBesideIt) {
  anna.keld.write("notes.txt", "base");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(ben.knowsSoon("notes.txt"));
  ASSERT_EQ(ben.contents("notes.txt"), "base");
  FaultyCloud::Fault failing;
  failing.error = CKErrorMake(CKErrorCode::networkFailure, "no way there");
  faulty->onEveryCall(FaultyCloud::Call::readAsset, failing);
  const int before = faulty->count(FaultyCloud::Call::readAsset);
  anna.keld.write("notes.txt", "from anna");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(eventually([&] { return faulty->count(FaultyCloud::Call::readAsset) > before; }));
  ben.keld.write("notes.txt", "from ben!!");
  const NSError why = ben.waitForUploads();
  EXPECT_NE(why.localizedDescription().find("no way there"), std::string::npos) << why.description();
  faulty->clearFaults();
  for (Device *device : {&anna, &ben}) {
    ASSERT_TRUE(eventually([&] { return !conflictCopy(*device).empty(); }));
    EXPECT_TRUE(device->saysSoon(conflictCopy(*device), "from ben!!"));
    EXPECT_TRUE(device->saysSoon("notes.txt", "from anna"));
  }
}

TEST_F(WaitingVersion, whatCouldNotBeFetchedIsTriedAgainBeforeTheNextPoll) {
  anna.keld.write("notes.txt", "base");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(ben.knowsSoon("notes.txt"));
  ASSERT_EQ(ben.contents("notes.txt"), "base");
  FaultyCloud::Fault failing;
  failing.error = CKErrorMake(CKErrorCode::networkFailure, "no way there");
  faulty->onEveryCall(FaultyCloud::Call::readAsset, failing);
  const int before = faulty->count(FaultyCloud::Call::readAsset);
  anna.keld.write("notes.txt", "from anna");
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(eventually([&] { return faulty->count(FaultyCloud::Call::readAsset) > before + 2; }));
  faulty->clearFaults();
  EXPECT_TRUE(eventually([&] { return ben.read("notes.txt") == "from anna"; }));
}

}  // namespace
}  // namespace droxa::keld
