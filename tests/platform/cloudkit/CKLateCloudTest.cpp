#include <filesystem>
#include <future>
#include <gtest/gtest.h>

#include "platform/cloudkit/CKLateCloud.h"
#include "platform/cloudkit/EmbeddedCloud.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

namespace fs = std::filesystem;

// A cloud whose folder is a file at first, as an unmounted disk's place may be.
struct LateCloud : testing::Test {
  LateCloud() { folder.write("cloud", "not a folder"); }

  std::shared_ptr<CKCloud> open(NSError *error) {
    ++tries;
    return EmbeddedCloud::open(folder.path() + "/cloud", "anna", "desk", error);
  }
  void makeRoom() { fs::remove(folder.path() + "/cloud"); }
  void expectUnavailable(const NSError &error) {
    EXPECT_TRUE(CKErrorIs(error, CKErrorCode::serviceUnavailable)) << error.description();
    EXPECT_TRUE(CKErrorIsTransient(error));
    EXPECT_EQ(error.localizedDescription().rfind("the cloud in a drawer can't be opened: ", 0), 0u)
        << error.localizedDescription();
  }

  const TemporaryFolder folder;
  int tries = 0;
  CKLateCloud cloud{"the cloud in a drawer", "desk", [this](NSError *error) { return open(error); },
                    std::chrono::milliseconds(0)};
  const CKRecordZoneID zone{"documents"};
  const CKCallContext context;
};

TEST_F(LateCloud, eachCallTellsWhyItIsntOpen) {
  expectUnavailable(cloud.saveZone(zone, context));
  expectUnavailable(cloud.deleteZone(zone, context));
  expectUnavailable(cloud.listZones(context).error);
  expectUnavailable(cloud.accountStatus(context).error);
  expectUnavailable(cloud.fetchRecords({{"a", zone}}, {}, context).error);
  expectUnavailable(cloud.modifyRecords({}, context).error);
  expectUnavailable(cloud.fetchZoneChanges(zone, {}, {}, 10, context).error);
  expectUnavailable(cloud.uploadAsset(-1, 0, {}, context).error);
  expectUnavailable(cloud.readAsset(
      {}, 0, [](auto) { return NSError(); }, {}, context));
  expectUnavailable(cloud.hasAsset({}, context).error);
  expectUnavailable(cloud.currentUserIdentity(context).error);
  expectUnavailable(cloud.lookUpShareParticipants({"bert"}, context).error);
  expectUnavailable(cloud.fetchShareMetadata({}, context).error);
  expectUnavailable(cloud.acceptShare({}, context).error);
  expectUnavailable(cloud.shareTokens({"a", zone}, context).error);
  expectUnavailable(cloud.verifyShareToken("token", context).error);
  NSError error;
  EXPECT_FALSE(cloud.subscribe([](const auto &) {}, &error));
  expectUnavailable(error);
  EXPECT_TRUE(cloud.cloudIdentifier().isNull());
  EXPECT_EQ(cloud.description(), "the cloud in a drawer");
  EXPECT_EQ(cloud.deviceName(), "desk");
}

TEST_F(LateCloud, isThatCloudOnceItCanBeOpened) {
  expectUnavailable(cloud.saveZone(zone, context));
  makeRoom();
  EXPECT_FALSE(cloud.saveZone(zone, context));
  const int triesSoFar = tries;
  EXPECT_EQ(cloud.listZones(context).zones, std::vector{zone});
  EXPECT_FALSE(cloud.cloudIdentifier().isNull());
  EXPECT_NE(cloud.description(), "the cloud in a drawer");
  NSError error;
  EXPECT_TRUE(cloud.subscribe([](const auto &) {}, &error)) << error.description();
  EXPECT_EQ(tries, triesSoFar) << "opened once";
}

TEST_F(LateCloud, itsSharedDatabaseOpensWithIt) {
  const std::shared_ptr<CKCloud> shared = cloud.sharedDatabase();
  expectUnavailable(shared->listZones(context).error);
  makeRoom();
  EXPECT_FALSE(cloud.saveZone(zone, context));
  const CKZoneList zones = shared->listZones(context);
  EXPECT_FALSE(zones.error) << zones.error.description();
  EXPECT_TRUE(zones.zones.empty()) << "nobody shares anything";
}

TEST_F(LateCloud, isTriedOnlyNowAndThen) {
  CKLateCloud patient(
      "the cloud in a drawer", "desk", [this](NSError *error) { return open(error); }, std::chrono::hours(1));
  for (int i = 0; i < 5; ++i) expectUnavailable(patient.listZones(context).error);
  EXPECT_EQ(tries, 1);
}

TEST_F(LateCloud, nobodyWaitsForAnOpeningThatHangs) {
  std::promise<void> started, released;
  CKLateCloud slow(
      "the cloud in a drawer", "desk",
      [&](NSError *error) {
        started.set_value();
        released.get_future().wait();
        return open(error);
      },
      std::chrono::hours(1));
  auto first = std::async(std::launch::async, [&] { return slow.listZones(context).error; });
  started.get_future().wait();
  EXPECT_TRUE(CKErrorIs(slow.listZones(context).error, CKErrorCode::serviceUnavailable));
  released.set_value();
  expectUnavailable(first.get());
}

}  // namespace
}  // namespace droxa
