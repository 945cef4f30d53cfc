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
