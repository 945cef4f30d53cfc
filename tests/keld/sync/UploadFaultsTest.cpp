#include <sys/stat.h>

#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

KeldOptions quickToGiveUp() {
  KeldOptions options;
  options.sync.downloads.stallTimeout = std::chrono::milliseconds(300);
  options.sync.pollInterval = std::chrono::milliseconds(500);
  return options;
}

class UploadFaults : public FaultyDrive {
 protected:
  UploadFaults() : FaultyDrive(quickToGiveUp()) {}

  int recordsNamed(const std::string &path) { return static_cast<int>(hand.all().count(path)); }
  EmbeddedCloud &quota() { return *hand.cloud; }
};

TEST_F(UploadFaults, errorsThatPassAreTriedAgain) {
  for (const CKErrorCode code :
       {CKErrorCode::networkFailure, CKErrorCode::serviceUnavailable, CKErrorCode::zoneBusy}) {
    for (const Call call : {Call::uploadAsset, Call::modifyRecords, Call::fetchZoneChanges, Call::saveZone})
      cloud->onNextCall(call, failing(code));
    const std::string name = "document " + std::to_string(static_cast<int>(code));
    device.keld.write(name, name);
    EXPECT_FALSE(device.waitForUploads(name));
    EXPECT_EQ(hand.contents(name), name);
    EXPECT_EQ(recordsNamed(name), 1);
  }
  EXPECT_TRUE(eventually([&] { return device.transfers().isCloudReachable; }));
}

TEST_F(UploadFaults, theNthOfManyFailsAndAllArrive) {
  cloud->onCall(Call::uploadAsset, 3, failing(CKErrorCode::networkFailure));
  cloud->onCall(Call::uploadAsset, 7, failing(CKErrorCode::internalError));
  for (int index = 0; index < 10; ++index)
    device.keld.write("document " + std::to_string(index), std::to_string(index));
  ASSERT_TRUE(eventually([&] { return hand.all().size() == 10; }));
  EXPECT_TRUE(eventually([&] { return !device.waitForUploads(); }));
  for (int index = 0; index < 10; ++index)
    EXPECT_EQ(hand.contents("document " + std::to_string(index)), std::to_string(index));
}

TEST_F(UploadFaults, anErrorThatStaysIsToldByTheStatusAndByWhoWaits) {
  cloud->onEveryCall(Call::uploadAsset, failing(CKErrorCode::internalError));
  device.keld.write("a", "contents");
  const NSError error = device.waitForUploads("a");
  EXPECT_TRUE(error) << "it can't have been sent";
  EXPECT_NE(error.localizedDescription().find(device.keld.at("a")), std::string::npos) << error.description();
  EXPECT_EQ(device.status("a").upload, QVUploadState::failed);
  EXPECT_TRUE(device.status("a").error);
  EXPECT_EQ(device.transfers().uploads.failed, 1U);
  cloud->clearFaults();
  EXPECT_TRUE(eventually([&] { return device.status("a").upload == QVUploadState::inCloud; }));
  EXPECT_EQ(device.transfers().uploads.failed, 0U);
}

TEST_F(UploadFaults, aFullQuotaIsToldAndWhatWaitsIsSentWhenThereIsRoom) {
  ASSERT_FALSE(quota().setQuota(10, {}));
  device.keld.write("a", std::string(100, 'a'));
  const NSError error = device.waitForUploads("a");
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, 4354)) << error.description();
  EXPECT_EQ(device.status("a").upload, QVUploadState::failed);
  EXPECT_EQ(device.status("a").error.code(), 4354);
  device.keld.write("b", "small");
  EXPECT_FALSE(device.waitForUploads("b")) << "others still get in";
  ASSERT_FALSE(quota().setQuota(1000, {}));
  EXPECT_TRUE(isInCloudSoon("a"));
  EXPECT_TRUE(eventually([&] { return device.status("a").upload == QVUploadState::inCloud; }));
}

TEST_F(UploadFaults, aReplyThatIsLostMakesNoSecondRecordAndNoConflict) {
  Fault lost;
  lost.dropsReply = true;
  cloud->onNextCall(Call::modifyRecords, lost);
  device.keld.write("a", "contents");
  EXPECT_FALSE(device.waitForUploads("a"));
  cloud->onNextCall(Call::modifyRecords, lost);
  device.keld.write("a", "other contents");
  EXPECT_FALSE(device.waitForUploads("a"));
  EXPECT_EQ(hand.contents("a"), "other contents");
  EXPECT_EQ(hand.paths(), std::vector<std::string>{"a"});
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UploadFaults, anEditAfterALostReplyIsNoConflict) {
  Fault lost;
  lost.dropsReply = true;
  lost.delay = std::chrono::milliseconds(300);
  sent("b", "base");
  for (const char *name : {"a", "b"}) {
    const int calls = cloud->count(Call::modifyRecords);
    cloud->onNextCall(Call::modifyRecords, lost);
    device.keld.write(name, "first");
    ASSERT_TRUE(eventually([&] { return cloud->count(Call::modifyRecords) > calls; }));
    device.keld.write(name, "the second one");
    EXPECT_FALSE(device.waitForUploads(name));
    EXPECT_TRUE(eventually([&] { return hand.contents(name) == "the second one"; }));
    EXPECT_TRUE(conflictCopies().empty());
    EXPECT_EQ(device.read(name), "the second one");
  }
}

// Carries out the next save and loses its reply, and does something on the device meanwhile.
class LostSave : public FaultyDrive {
 protected:
  void during(const std::function<void()> &save, const std::function<void()> &meanwhile) {
    Fault lost;
    lost.dropsReply = true;
    lost.delay = std::chrono::milliseconds(300);
    const int calls = cloud->count(Call::modifyRecords);
    cloud->onNextCall(Call::modifyRecords, lost);
    save();
    ASSERT_TRUE(eventually([&] { return cloud->count(Call::modifyRecords) > calls; }));
    meanwhile();
  }
  // For good: also after the device has followed the cloud once more.
  void expectOnBoth(std::vector<std::string> names) {
    EXPECT_TRUE(eventually([&] { return hand.paths() == names; })) << testing::PrintToString(hand.paths());
    hand.put("zzz after", "after");
    ASSERT_TRUE(device.knowsSoon("zzz after"));
    EXPECT_FALSE(device.waitForUploads());
    names.emplace_back("zzz after");
    EXPECT_EQ(hand.paths(), names);
    EXPECT_EQ(device.names(), names);
  }
};

TEST_F(LostSave, ofADocumentThatIsDeletedMeanwhileLeavesNothing) {
  during([&] { device.keld.write("a", "contents"); }, [&] { device.keld.remove("a"); });
  expectOnBoth({});
}

TEST_F(LostSave, ofATemporaryFileThatIsRenamedOverADocumentLeavesTheDocument) {
  sent("a", "contents");
  during([&] { device.keld.write("saving", "the next version"); },
         [&] { device.keld.rename("saving", "a"); });
  expectOnBoth({"a"});
  EXPECT_EQ(device.read("a"), "the next version");
  EXPECT_TRUE(eventually([&] { return hand.contents("a") == "the next version"; }));
}

TEST_F(LostSave, ofAFolderThatIsDeletedMeanwhileLeavesNothing) {
  during([&] { device.keld.folder("f"); }, [&] { device.keld.remove("f"); });
  expectOnBoth({});
}

TEST_F(LostSave, ofAnEditOfADocumentThatIsDeletedMeanwhileLeavesNothing) {
  sent("a", "contents");
  during([&] { device.keld.write("a", "other contents"); }, [&] { device.keld.remove("a"); });
  expectOnBoth({});
}

TEST_F(LostSave, ofARenamedDocumentThatIsDeletedMeanwhileLeavesNothing) {
  sent("a", "contents");
  during([&] { device.keld.rename("a", "b"); }, [&] { device.keld.remove("b"); });
  expectOnBoth({});
}

TEST_F(LostSave, ofADocumentInAFolderThatIsDeletedMeanwhileLeavesNothing) {
  device.keld.folder("f");
  sent("f/old", "contents");
  during([&] { device.keld.write("f/new", "other contents"); }, [&] { device.keld.remove("f"); });
  expectOnBoth({});
}

TEST_F(LostSave, ofADocumentThatBecomesExcludedMeanwhileLeavesItHere) {
  during([&] { device.keld.write("a", "contents"); }, [&] { device.keld.rename("a", "a.nosync"); });
  EXPECT_TRUE(leavesCloudSoon("a"));
  EXPECT_EQ(device.read("a.nosync"), "contents");
}

TEST_F(LostSave, ofADocumentThatIsDeletedBeforeARestartLeavesNothing) {
  during([&] { device.keld.write("a", "contents"); },
         [&] {
           ASSERT_TRUE(isInCloudSoon("a"));
           device.keld.stop();
           device.keld.remove("a");
         });
  device.keld.start();
  device.keld.waitForFirstScan();
  expectOnBoth({});
}

TEST_F(LostSave, thatNobodyTellsOfIsNotDeletedOverAnotherDevicesChange) {
  during([&] { device.keld.write("a", "contents"); },
         [&] {
           cloud->onEveryCall(Call::fetchZoneChanges, failing(CKErrorCode::serviceUnavailable));
           device.keld.remove("a");
           ASSERT_TRUE(isInCloudSoon("a"));
           hand.put("a", "written by anna");
         });
  const int calls = cloud->count(Call::modifyRecords);
  EXPECT_TRUE(eventually([&] { return cloud->count(Call::modifyRecords) > calls; }));
  cloud->onEveryCall(Call::fetchZoneChanges, {});
  EXPECT_TRUE(device.knowsSoon("a"));
  expectOnBoth({"a"});
  EXPECT_EQ(device.contents("a"), "written by anna");
}

TEST_F(LostSave, ofADocumentThatAnotherDeviceChangesBeforeTheDeletionKeepsThatChange) {
  during([&] { device.keld.write("a", "contents"); },
         [&] {
           device.keld.remove("a");
           ASSERT_TRUE(isInCloudSoon("a"));
           hand.put("a", "written by anna");
         });
  EXPECT_TRUE(device.knowsSoon("a"));
  expectOnBoth({"a"});
  EXPECT_EQ(device.contents("a"), "written by anna");
}

TEST_F(UploadFaults, aLostReplyOfADeletionIsNoFailure) {
  sent("a", "contents");
  Fault lost;
  lost.dropsReply = true;
  cloud->onNextCall(Call::modifyRecords, lost);
  device.keld.remove("a");
  EXPECT_TRUE(leavesCloudSoon("a"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_FALSE(device.exists("a"));
}

TEST_F(UploadFaults, aFileThatChangesWhileItIsSentIsSentAsItIsInTheEnd) {
  Fault slow;
  slow.delay = std::chrono::milliseconds(200);
  for (const std::size_t size : {std::size_t{1000}, std::size_t{6 << 20}}) {
    const std::string name = std::to_string(size);
    cloud->onEveryCall(Call::uploadAsset, slow);
    const int calls = cloud->count(Call::uploadAsset);
    device.keld.write(name, std::string(size, 'a'));
    ASSERT_TRUE(eventually([&] { return cloud->count(Call::uploadAsset) > calls; }));
    device.keld.write(name, std::string(size, 'b') + "!");
    cloud->clearFaults();
    EXPECT_FALSE(device.waitForUploads(name));
    EXPECT_TRUE(eventually([&] { return hand.contents(name) == std::string(size, 'b') + "!"; }));
    EXPECT_EQ(recordsNamed(name), 1);
  }
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UploadFaults, aLargeUploadThatHangsIsGivenUpAndTriedAgain) {
  cloud->onNextCall(Call::uploadAsset, hanging());
  // At once of its full size, so that it is never taken for a small one.
  device.keld.write("large.tmp", std::string(6 << 20, 'l'));
  device.keld.rename("large.tmp", "large");
  ASSERT_TRUE(eventually([&] { return cloud->hanging() == 1; }));
  device.keld.write("small", "s");
  EXPECT_FALSE(device.waitForUploads("small")) << "a long upload holds up nothing else";
  EXPECT_FALSE(device.waitForUploads("large"));
  EXPECT_EQ(hand.contents("large").size(), 6U << 20);
}

TEST_F(UploadFaults, aFileThatCantBeReadIsToldAndSentWhenItCan) {
  if (::geteuid() == 0) GTEST_SKIP() << "root reads every file";
  device.keld.write("a", "contents");
  ::chmod(device.keld.at("a").c_str(), 0);
  const NSError error = device.waitForUploads("a");
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EACCES)) << error.description();
  ::chmod(device.keld.at("a").c_str(), 0600);
  EXPECT_TRUE(isInCloudSoon("a"));
}

TEST_F(UploadFaults, aDocumentThatIsDeletedBeforeItsTurnNeverArrives) {
  cloud->onEveryCall(Call::uploadAsset, failing(CKErrorCode::networkFailure));
  device.keld.write("a", "contents");
  ASSERT_TRUE(eventually([&] { return device.keld.knows("a"); }));
  device.keld.remove("a");
  ASSERT_TRUE(eventually([&] { return !device.keld.knows("a"); }));
  cloud->clearFaults();
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_TRUE(hand.paths().empty());
}

TEST_F(UploadFaults, aBurstEndsAsTheDiskIs) {
  device.keld.folder("f/g");
  device.keld.write("f/one", "1");
  device.keld.write("f/g/two", "2");
  device.keld.rename("f/g", "f/h");
  device.keld.write("f/h/three", "3");
  device.keld.rename("f", "moved");
  device.keld.remove("moved/one");
  device.keld.folder("gone");
  device.keld.write("gone/four", "4");
  device.keld.remove("gone");
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), (std::vector<std::string>{"moved", "moved/h", "moved/h/three", "moved/h/two"}));
  EXPECT_EQ(hand.contents("moved/h/three"), "3");
  EXPECT_EQ(hand.contents("moved/h/two"), "2");
}

TEST_F(UploadFaults, parentsComeBeforeTheirChildren) {
  device.keld.folder("a/b/c");
  device.keld.write("a/b/c/d", "x");
  cloud->onNextCall(Call::modifyRecords, failing(CKErrorCode::networkFailure));
  EXPECT_FALSE(device.waitForUploads());
  CKServerChangeToken none;
  const CKZoneChanges changes = hand.cloud->fetchZoneChanges(DriveZone(), none, std::nullopt, 100, {});
  std::vector<std::string> seen{ContainerRecord(QVUbiquitousDefaultContainerID)};
  for (const CKRecord &record : changes.changedRecords) {
    const auto document = ReadRecord(record);
    ASSERT_TRUE(document);
    EXPECT_NE(std::find(seen.begin(), seen.end(), document->parent), seen.end())
        << document->name << " came before its folder";
    seen.push_back(document->record);
  }
  EXPECT_EQ(seen.size(), 5U);
}

TEST_F(UploadFaults, excludedNamesAreNeverSent) {
  device.keld.write("a.nosync", "x");
  device.keld.folder("f.nosync");
  device.keld.write("f.nosync/inside", "x");
  sent("seen", "x");
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), std::vector<std::string>{"seen"});
}

TEST_F(UploadFaults, aDocumentThatBecomesExcludedLeavesTheCloudAndComesBack) {
  sent("a", "contents");
  device.keld.folder("f");
  sent("f/b", "inside");
  device.keld.rename("a", "a.nosync");
  device.keld.rename("f", "f.nosync");
  EXPECT_TRUE(leavesCloudSoon("a"));
  EXPECT_TRUE(leavesCloudSoon("f/b"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_TRUE(hand.paths().empty());
  EXPECT_EQ(device.read("a.nosync"), "contents");
  device.keld.rename("a.nosync", "a");
  device.keld.rename("f.nosync", "f");
  EXPECT_TRUE(isInCloudSoon("a"));
  EXPECT_TRUE(isInCloudSoon("f/b"));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.contents("f/b"), "inside");
}

TEST_F(UploadFaults, aDatalessDocumentThatBecomesExcludedIsFetchedFirst) {
  dataless("a", "contents");
  cloud->onEveryCall(Call::readAsset, failing(CKErrorCode::networkFailure));
  device.keld.rename("a", "a.nosync");
  ASSERT_TRUE(eventually([&] { return cloud->count(Call::readAsset) > 0; }));
  EXPECT_TRUE(hand.at("a")) << "the only copy of its contents";
  cloud->clearFaults();
  EXPECT_TRUE(eventually([&] { return device.read("a.nosync") == "contents"; }));
  EXPECT_TRUE(leavesCloudSoon("a"));
}

TEST_F(UploadFaults, anEditOverANewerVersionThatWaitsIsAConflict) {
  sent("a", "base");
  cloud->onEveryCall(Call::readAsset, hanging());
  hand.put("a", "from anna");
  ASSERT_TRUE(eventually([&] { return cloud->count(Call::readAsset) > 0; }));
  device.keld.write("a", "from ben!");
  cloud->clearFaults();
  ASSERT_TRUE(eventually([&] { return conflictCopies().size() == 1; }));
  EXPECT_EQ(device.read(conflictCopies()[0]), "from ben!");
  ASSERT_TRUE(eventually([&] { return device.exists("a"); }));
  EXPECT_EQ(device.contents("a"), "from anna");
  EXPECT_TRUE(isInCloudSoon(conflictCopies()[0]));
  EXPECT_EQ(hand.contents("a"), "from anna");
}

TEST_F(UploadFaults, aRenameWhileANewerVersionWaitsIsNoConflict) {
  sent("a", "base");
  cloud->onEveryCall(Call::readAsset, hanging());
  hand.put("a", "from anna");
  ASSERT_TRUE(eventually([&] { return cloud->count(Call::readAsset) > 0; }));
  device.keld.rename("a", "b");
  EXPECT_TRUE(isInCloudSoon("b"));
  cloud->clearFaults();
  EXPECT_TRUE(eventually([&] { return device.read("b") == "from anna"; }));
  EXPECT_EQ(hand.contents("b"), "from anna");
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UploadFaults, whatIsWrittenWhileNobodyIsSignedInWaits) {
  Once<NSError> out("sign out");
  device.keld.session()->signOut(out.completion());
  ASSERT_FALSE(out.value<0>());
  const int calls = cloud->count(Call::modifyRecords);
  device.keld.write("a", "contents");
  hand.put("b", "from anna");
  device.keld.settle();
  EXPECT_EQ(cloud->count(Call::modifyRecords), calls);
  EXPECT_FALSE(device.keld.knows("b"));
  device.keld.session()->signIn(AccountKeeper::localUserName(), [](const auto &...) {});
  EXPECT_TRUE(isInCloudSoon("a"));
  EXPECT_TRUE(device.knowsSoon("b"));
}

TEST_F(UploadFaults, twoQuickRestartsLoseNothing) {
  device.keld.write("a", "contents");
  device.keld.stop();
  device.keld.start();
  device.keld.stop();
  device.keld.start();
  device.keld.waitForFirstScan();
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.paths(), std::vector<std::string>{"a"});
}

}  // namespace
}  // namespace droxa::keld
