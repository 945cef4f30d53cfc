// What others share, as long as they do.

#include "tests/keld/sync/TwoAccounts.h"

namespace droxa::keld {
namespace {

class SharedZonesTest : public TwoAccounts {};

TEST_F(SharedZonesTest, aSharedDocumentIsListedUnderItsOwnersName) {
  anna.device.keld.write("letter.txt", "dear Ben");
  ASSERT_TRUE(anna.hasSentAll());
  const CKShare share = anna.share("letter.txt", {{"ben", Permission::readWrite}});
  EXPECT_EQ(ben.accept(share), ben.by("anna", "letter.txt"));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "letter.txt")), "dear Ben");
  const auto listed = ben.device.keld.namesIn("");
  EXPECT_TRUE(std::find(listed.begin(), listed.end(), "Shared by anna") != listed.end());
}

TEST_F(SharedZonesTest, anOwnerWithADisplayNameIsShownByIt) {
  ASSERT_FALSE(anna.cloud->setUserIdentity("Anna / Ltd", "anna@example.org", {}));
  shareProject(Permission::readOnly);
  const auto isListed = [&] {
    const auto listed = ben.device.keld.namesIn("");
    return std::find(listed.begin(), listed.end(), "Shared by Anna _ Ltd") != listed.end();
  };
  EXPECT_TRUE(eventually(isListed));
  ben.device.keld.stop();
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(isListed());
  ben.device.keld.stop();
  ASSERT_FALSE(anna.cloud->setUserIdentity("Anna Smith", "anna@example.org", {}));
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(eventually([&] {
    const auto listed = ben.device.keld.namesIn("");
    return std::find(listed.begin(), listed.end(), "Shared by Anna Smith") != listed.end();
  }));
}

TEST_F(SharedZonesTest, editsTravelBothWays) {
  shareProject(Permission::readWrite);
  const std::string plan = ben.by("anna", "project/plan.txt");
  EXPECT_EQ(ben.device.contents(plan), "the plan");
  ben.device.keld.write(plan, "the plan, by Ben");
  ASSERT_TRUE(ben.hasSentAll(plan));
  EXPECT_TRUE(anna.device.saysSoon("project/plan.txt", "the plan, by Ben"));
  anna.device.keld.write("project/plan.txt", "the plan, by both");
  EXPECT_TRUE(ben.device.saysSoon(plan, "the plan, by both"));
}

TEST_F(SharedZonesTest, whatIsNewInASharedFolderTravelsBothWays) {
  shareProject(Permission::readWrite);
  ben.device.keld.folder(ben.by("anna", "project/drafts/old"));
  ben.device.keld.write(ben.by("anna", "project/drafts/old/one.txt"), "Ben's");
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_TRUE(anna.device.knowsSoon("project/drafts/old/one.txt"));
  EXPECT_EQ(anna.device.contents("project/drafts/old/one.txt"), "Ben's");
  anna.device.keld.write("project/drafts/two.txt", "Anna's");
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/drafts/two.txt")));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "project/drafts/two.txt")), "Anna's");
}

TEST_F(SharedZonesTest, renamesAndDeletionsTravelBothWays) {
  shareProject(Permission::readWrite);
  ben.device.keld.rename(ben.by("anna", "project/plan.txt"), ben.by("anna", "project/goals.txt"));
  EXPECT_TRUE(anna.device.knowsSoon("project/goals.txt"));
  anna.device.keld.rename("project", "work");
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "work/goals.txt")));
  ben.device.keld.remove(ben.by("anna", "work/goals.txt"));
  EXPECT_TRUE(anna.device.losesSoon("work/goals.txt"));
  anna.device.keld.write("work/more.txt");
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "work/more.txt")));
  anna.device.keld.remove("work/more.txt");
  EXPECT_TRUE(ben.device.losesSoon(ben.by("anna", "work/more.txt")));
}

TEST_F(SharedZonesTest, aParticipantRenamesTheSharedFolderAndTheOwnersPlaceStays) {
  anna.device.keld.folder("private");
  anna.device.keld.folder("private/project");
  ASSERT_TRUE(anna.hasSentAll());
  ben.accept(anna.share("private/project", {{"ben", Permission::readWrite}}));
  ben.device.keld.rename(ben.by("anna", "project"), ben.by("anna", "ours"));
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_TRUE(anna.device.knowsSoon("private/ours"));
}

TEST_F(SharedZonesTest, acceptingAgainAnswersTheSamePlaceAndTheOwnersOwnIsInTheDrive) {
  const CKShare share = shareProject(Permission::readWrite);
  EXPECT_EQ(ben.accept(share), ben.by("anna", "project"));
  EXPECT_EQ(anna.accept(share), anna.device.keld.at("project"));
}

TEST_F(SharedZonesTest, aUrlThatLeadsNowhereIsAnError) {
  CKShare share = shareProject(Permission::readOnly);
  anna.takeBack(share);
  NSError error;
  EXPECT_EQ(ben.accept(share, &error), "");
  EXPECT_TRUE(CKErrorIs(error, CKErrorCode::unknownItem)) << error.description();
  share.URL = NSURL();
  EXPECT_EQ(ben.accept(share, &error), "");
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument)) << error.description();
}

TEST_F(SharedZonesTest, whatIsPutBesideTheSharedFoldersStaysHereAndSaysWhatToDo) {
  shareProject(Permission::readWrite);
  const std::string beside = ben.by("anna", "mine.txt");
  ben.device.keld.write(beside, "Ben's own");
  EXPECT_EQ(ben.refusalOf(beside), QVErrorNotInSharedFolder);
  EXPECT_TRUE(ben.device.waitForUploads(beside));
  ben.device.keld.rename(beside, ben.by("anna", "project/mine.txt"));
  EXPECT_TRUE(anna.device.knowsSoon("project/mine.txt"));
}

TEST_F(SharedZonesTest, deletingWhatIsSharedLeavesItAndTheOwnerKeepsEverything) {
  shareProject(Permission::readWrite);
  ben.device.keld.remove(ben.by("anna", "project"));
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  anna.device.keld.write("project/later.txt");
  ASSERT_TRUE(anna.hasSentAll());
  EXPECT_EQ(anna.device.names("project"), (std::vector<std::string>{"later.txt", "plan.txt"}));
}

TEST_F(SharedZonesTest, aSharedFolderThatIsMovedIntoTheOwnDriveIsLeftWithItsContents) {
  shareProject(Permission::readWrite);
  ben.device.keld.rename(ben.by("anna", "project"), "copy");
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_EQ(ben.device.contents("copy/plan.txt"), "the plan");
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_EQ(anna.device.names("project"), (std::vector<std::string>{"plan.txt"}));
}

TEST_F(SharedZonesTest, aFolderThatIsMovedIntoASharedOneTakesEverythingAlongAndLeavesNothing) {
  ben.device.keld.folder("mine/deep");
  ben.device.keld.write("mine/deep/one.txt", "one");
  ASSERT_TRUE(ben.hasSentAll());
  ASSERT_TRUE(eventually([&] { return !ben.device.evict("mine/deep/one.txt"); }));
  shareProject(Permission::readWrite);
  ben.device.keld.rename("mine", ben.by("anna", "project/mine"));
  EXPECT_TRUE(anna.device.knowsSoon("project/mine/deep/one.txt"));
  EXPECT_TRUE(anna.device.saysSoon("project/mine/deep/one.txt", "one"));
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_EQ(ben.device.keld.daemon().sync().store().countRows(), 0U);
  EXPECT_EQ(ben.device.contents(ben.by("anna", "project/mine/deep/one.txt")), "one");
}

TEST_F(SharedZonesTest, aDocumentThatIsMovedIntoASharedFolderIsTheOwnersThen) {
  shareProject(Permission::readWrite);
  ben.device.keld.write("note.txt", "a note");
  ASSERT_TRUE(ben.hasSentAll());
  ben.device.keld.rename("note.txt", ben.by("anna", "project/note.txt"));
  EXPECT_TRUE(anna.device.knowsSoon("project/note.txt"));
  EXPECT_EQ(anna.device.contents("project/note.txt"), "a note");
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_EQ(ben.device.status(ben.by("anna", "project/note.txt")).upload, QVUploadState::inCloud);
}

TEST_F(SharedZonesTest, pinsAndDownloadsOfAFolderAreTheZones) {
  shareProject(Permission::readWrite);
  const std::string plan = ben.by("anna", "project/plan.txt");
  EXPECT_TRUE(ben.device.isDataless(plan));
  ASSERT_FALSE(ben.device.pin(ben.by("anna", "project")));
  EXPECT_TRUE(eventually([&] { return ben.device.read(plan) == "the plan"; }));
  EXPECT_TRUE(ben.device.evict(plan).is(QVTessalyErrorDomain, QVErrorPinned));
  ASSERT_FALSE(ben.device.pin(ben.by("anna", "project"), false));
  // When the transfer has ended.
  EXPECT_TRUE(eventually([&] { return !ben.device.evict(plan) && ben.device.isDataless(plan); }));
  EXPECT_GE(ben.device.transfers().downloads.done, 1U);
}

TEST_F(SharedZonesTest, anEditorThatSavesByRenamingDoesNotLeaveTheShare) {
  anna.device.keld.write("letter.txt", "dear Ben");
  ASSERT_TRUE(anna.hasSentAll());
  const std::string letter = ben.accept(anna.share("letter.txt", {{"ben", Permission::readWrite}}));
  EXPECT_EQ(ben.device.contents(letter), "dear Ben");
  ben.device.keld.write(letter + "-new", "dear Anna");
  ben.device.keld.rename(letter + "-new", letter);
  EXPECT_TRUE(anna.device.saysSoon("letter.txt", "dear Anna"));
  ASSERT_TRUE(ben.hasSentAll());
  // With a pause, in which the other file is seen.
  ben.device.keld.write(letter + "-new", "dear Anna, again");
  EXPECT_EQ(ben.refusalOf(letter + "-new"), QVErrorNotInSharedFolder);
  ben.device.keld.rename(letter + "-new", letter);
  EXPECT_TRUE(anna.device.saysSoon("letter.txt", "dear Anna, again"));
  ASSERT_TRUE(ben.hasSentAll());
  EXPECT_TRUE(ben.device.exists(letter));
}

// --- The sharing operations on what others share.

TEST_F(SharedZonesTest, aParticipantIsToldOfTheShareAndLeavesItByAnOperation) {
  const CKShare share = shareProject(Permission::readOnly);
  const NSURL plan = ben.device.url(ben.by("anna", "project/plan.txt"));
  Once<std::optional<CKShare>, NSURL, NSError> told("share");
  ben.device.keld.session()->startOperation_toCopySharingInfoAtURL(nullptr, plan, told.completion());
  ASSERT_FALSE(told.value<2>()) << told.value<2>().description();
  ASSERT_TRUE(told.value<0>());
  EXPECT_EQ(told.value<0>()->URL, share.URL);
  EXPECT_EQ(told.value<0>()->recordID.zoneID.ownerName, "anna");
  Once<NSError> left("leaving");
  ben.device.keld.session()->startOperation_toUnshareShare(nullptr, told.value<0>(), true, left.completion());
  EXPECT_FALSE(left.value<0>()) << left.value<0>().description();
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_TRUE(anna.device.exists("project/plan.txt"));
}

TEST_F(SharedZonesTest, aParticipantCantShareWhatIsTheOwners) {
  shareProject(Permission::readWrite);
  Once<std::optional<CKShare>, NSError> made("share");
  ben.device.keld.session()->createSharingInfoForURL(ben.device.url(ben.by("anna", "project/plan.txt")),
                                                     made.completion());
  EXPECT_TRUE(made.value<1>().is(QVTessalyErrorDomain, QVErrorNotShareable)) << made.value<1>().description();
}

TEST_F(SharedZonesTest, itemsKnowTheirRecordsAndWhoSharesThem) {
  shareProject(Permission::readWrite);
  const std::string plan = ben.by("anna", "project/plan.txt");
  const QVFileObjectID id = QVFileObjectID::documentID(ben.device.keld.number(plan));
  Once<std::map<QVFileObjectID, CKRecordID>, NSError> records("records");
  ben.device.keld.session()->resolveFileObjectIDsToContentRecordIDs({id}, records.completion());
  ASSERT_EQ(records.value<0>().count(id), 1U);
  EXPECT_EQ(records.value<0>().at(id), (CKRecordID{anna.recordAt("project/plan.txt"), {"drive", "anna"}}));
  Once<bool, bool, bool, std::optional<std::string>, NSError> options("share options");
  ben.device.keld.session()->getShareOptionsOfItemIdentifier(id.asString(), options.completion());
  EXPECT_TRUE(options.value<0>());
  EXPECT_TRUE(options.value<1>());
  EXPECT_FALSE(options.value<2>());
}

TEST_F(SharedZonesTest, tagsAndFavouritesAreEachPersonsOwn) {
  anna.device.keld.folder("project");
  anna.device.keld.write("project/plan.txt", "the plan");
  QVItemMetadataChange change;
  change.favoriteRank = 7;
  Once<NSError> set("metadata");
  ASSERT_TRUE(anna.device.knowsSoon("project/plan.txt"));
  anna.device.keld.session()->setMetadataAtURL(anna.device.url("project/plan.txt"), change, set.completion());
  ASSERT_FALSE(set.value<0>());
  ASSERT_TRUE(anna.hasSentAll());
  ben.accept(anna.share("project", {{"ben", Permission::readWrite}}));
  const std::string plan = ben.by("anna", "project/plan.txt");
  ASSERT_TRUE(ben.device.knowsSoon(plan));
  EXPECT_EQ(ben.device.keld.record(plan)->metadata.favoriteRank, 0U);
}

}  // namespace
}  // namespace droxa::keld
