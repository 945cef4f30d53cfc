#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

// A drive with a bit of everything, whose databases are lost while the daemon is off.
class LostDatabase : public FaultyDrive {
 protected:
  void fill() {
    hand.folder("far");
    hand.put("far/dataless", "contents far away");
    hand.put("fetched", "fetched contents");
    device.keld.folder("near/deep");
    device.keld.write("near/deep/own", "own contents");
    device.keld.write("large", std::string(5 << 20, 'l'));
    std::filesystem::create_symlink("near/deep/own", device.keld.at("link"));
    ASSERT_FALSE(device.waitForUploads());
    ASSERT_TRUE(device.knowsSoon("far/dataless"));
    ASSERT_EQ(device.contents("fetched"), "fetched contents");
    EXPECT_FALSE(device.waitForUploads());
    before = hand.all();
    ASSERT_EQ(before.size(), 8U);
  }
  void lose(const std::vector<std::string> &names) {
    device.keld.stop();
    for (const std::string &name : names)
      for (const char *suffix : {"", "-wal", "-shm"}) std::filesystem::remove(state() + "/" + name + suffix);
    uploads = cloud->count(Call::uploadAsset);
    reads = cloud->count(Call::readAsset);
    device.keld.start();
    device.keld.waitForFirstScan();
  }
  std::string state() { return std::filesystem::path(device.keld.databasePath()).parent_path().string(); }
  void expectNothingChanged() {
    ASSERT_TRUE(eventually([&] {
      for (const char *path : {"far/dataless", "fetched", "near/deep/own", "large"})
        if (!device.keld.knows(path) || device.status(path).upload != QVUploadState::inCloud) return false;
      return true;
    }));
    EXPECT_FALSE(device.waitForUploads());
    const auto after = hand.all();
    EXPECT_EQ(after.size(), before.size());
    for (const auto &[path, document] : before) {
      const auto found = after.find(path);
      ASSERT_NE(found, after.end()) << path;
      EXPECT_EQ(found->second.record, document.record) << path;
      EXPECT_EQ(found->second.content, document.content) << path;
    }
    EXPECT_EQ(cloud->count(Call::uploadAsset), uploads) << "contents were sent again";
    EXPECT_EQ(cloud->count(Call::readAsset), reads) << "contents were fetched again";
    EXPECT_TRUE(device.isDataless("far/dataless"));
    EXPECT_EQ(device.read("near/deep/own"), "own contents");
    EXPECT_EQ(device.read("fetched"), "fetched contents");
    EXPECT_TRUE(conflictCopies().empty());
    EXPECT_EQ(device.transfers().heldDeletions, 0U);
  }
  void expectStillWorks() {
    device.keld.write("near/deep/own", "edited");
    device.keld.rename("near", "renamed");
    EXPECT_FALSE(device.waitForUploads());
    EXPECT_TRUE(eventually([&] { return hand.contents("renamed/deep/own") == "edited"; }));
    hand.put("fetched", "newer");
    EXPECT_TRUE(eventually([&] { return device.read("fetched") == "newer"; }));
    EXPECT_EQ(device.contents("far/dataless"), "contents far away");
    EXPECT_EQ(hand.all().size(), before.size());
  }

  std::multimap<std::string, DocumentRecord> before;
  int uploads = 0, reads = 0;
};

TEST_F(LostDatabase, itemsAreBoundAgainByTheirMarkers) {
  fill();
  lose({"keld.sqlite"});
  expectNothingChanged();
  expectStillWorks();
}

TEST_F(LostDatabase, theSyncIsRebuiltFromTheCloudAndTheMarkers) {
  fill();
  lose({"sync.sqlite"});
  expectNothingChanged();
  expectStillWorks();
}

TEST_F(LostDatabase, bothCanBeLost) {
  fill();
  lose({"keld.sqlite", "sync.sqlite"});
  expectNothingChanged();
  expectStillWorks();
}

TEST_F(LostDatabase, nothingIsSentBeforeTheCloudCouldBeAsked) {
  fill();
  device.keld.stop();
  cloud->onEveryCall(Call::fetchZoneChanges, failing(CKErrorCode::networkFailure));
  lose({"sync.sqlite"});
  const int fetches = cloud->count(Call::fetchZoneChanges);
  device.keld.write("new", "x");
  ASSERT_TRUE(eventually([&] { return cloud->count(Call::fetchZoneChanges) > fetches + 1; }));
  EXPECT_EQ(cloud->count(Call::uploadAsset), uploads);
  cloud->clearFaults();
  EXPECT_TRUE(isInCloudSoon("new"));
  EXPECT_EQ(hand.all().size(), before.size() + 1);
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(LostDatabase, aStateFromABackupCatchesUp) {
  fill();
  device.keld.stop();
  std::filesystem::copy(state(), state() + "-backup", std::filesystem::copy_options::recursive);
  device.keld.start();
  device.keld.waitForFirstScan();
  device.keld.write("near/deep/own", "edited since");
  device.keld.write("since", "made since");
  ASSERT_FALSE(device.waitForUploads());
  hand.put("fetched", "newer contents");
  ASSERT_TRUE(eventually([&] { return device.read("fetched") == "newer contents"; }));
  ASSERT_TRUE(eventually([&] { return device.status("fetched").upload == QVUploadState::inCloud; }));
  device.keld.rename("large", "renamed");
  ASSERT_TRUE(isInCloudSoon("renamed"));
  ASSERT_FALSE(device.waitForUploads());
  device.keld.stop();
  std::filesystem::remove_all(state());
  std::filesystem::rename(state() + "-backup", state());
  device.keld.start();
  device.keld.waitForFirstScan();
  ASSERT_TRUE(device.knowsSoon("renamed"));
  ASSERT_TRUE(eventually([&] { return device.status("since").upload == QVUploadState::inCloud; }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(device.read("near/deep/own"), "edited since");
  EXPECT_EQ(device.read("fetched"), "newer contents");
  EXPECT_EQ(device.read("since"), "made since");
  EXPECT_EQ(hand.contents("near/deep/own"), "edited since");
  EXPECT_EQ(hand.contents("fetched"), "newer contents");
  EXPECT_EQ(hand.all().size(), before.size() + 1);
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(LostDatabase, aDocumentWhoseFileWasLostWithTheDatabaseComesBackDataless) {
  fill();
  device.keld.stop();
  std::filesystem::remove(device.keld.at("near/deep/own"));
  lose({"keld.sqlite"});
  ASSERT_TRUE(device.knowsSoon("near/deep/own"));
  EXPECT_EQ(device.contents("near/deep/own"), "own contents");
  EXPECT_EQ(hand.all().size(), before.size());
}

TEST_F(LostDatabase, pinsAreOfTheSameDocumentsAfterwards) {
  fill();
  ASSERT_FALSE(device.pin("near"));
  lose({"keld.sqlite"});
  expectNothingChanged();
  EXPECT_TRUE(device.status("near/deep/own").isPinned);
  EXPECT_FALSE(device.status("large").isPinned);
}

}  // namespace
}  // namespace droxa::keld
