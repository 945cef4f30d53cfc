// What isn't shared any more goes, and what was changed here and never sent doesn't.

#include "keld/Placement.h"
#include "tests/keld/sync/TwoAccounts.h"

namespace droxa::keld {
namespace {

class SharesTakenBackTest : public TwoAccounts {};

TEST_F(SharesTakenBackTest, itGoesWithItsContainer) {
  const CKShare share = shareProject(Permission::readWrite);
  anna.takeBack(share);
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_EQ(ben.device.names(), std::vector<std::string>());
  EXPECT_TRUE(anna.device.exists("project/plan.txt"));
}

TEST_F(SharesTakenBackTest, whatWasNeverSentIsKeptInTheDrive) {
  const CKShare share = shareProject(Permission::readOnly);
  const std::string plan = ben.by("anna", "project/plan.txt");
  EXPECT_EQ(ben.device.contents(plan), "the plan");
  ben.device.keld.write(plan, "Ben's plan");
  ben.device.keld.write(ben.by("anna", "beside.txt"), "Ben's own");
  EXPECT_EQ(ben.refusalOf(plan), QVErrorReadOnlyShare);
  EXPECT_EQ(ben.refusalOf(ben.by("anna", "beside.txt")), QVErrorNotInSharedFolder);
  anna.takeBack(share);
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_EQ(ben.device.read("project (no longer shared)/plan.txt"), "Ben's plan");
  EXPECT_EQ(ben.device.read("beside (no longer shared).txt"), "Ben's own");
  EXPECT_TRUE(ben.hasSentAll());
  EXPECT_EQ(ben.device.status("project (no longer shared)/plan.txt").upload, QVUploadState::inCloud);
}

TEST_F(SharesTakenBackTest, whatWasChangedWhileTheDaemonWasAwayIsKept) {
  anna.device.keld.write("letter.txt", "dear Ben");
  ASSERT_TRUE(anna.hasSentAll());
  const CKShare share = anna.share("letter.txt", {{"ben", Permission::readWrite}});
  const std::string letter = ben.accept(share);
  EXPECT_EQ(ben.device.contents(letter), "dear Ben");
  ben.device.keld.stop();
  ben.device.keld.write(letter, "dear Anna");
  anna.takeBack(share);
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_EQ(ben.device.read("letter (no longer shared).txt"), "dear Anna");
}

TEST_F(SharesTakenBackTest, oneOfTwoGoesAlone) {
  anna.device.keld.write("letter.txt", "dear Ben");
  const CKShare project = shareProject(Permission::readWrite);
  const CKShare letter = anna.share("letter.txt", {{"ben", Permission::readWrite}});
  ben.accept(letter);
  anna.takeBack(project);
  EXPECT_TRUE(ben.device.losesSoon(ben.by("anna", "project")));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "letter.txt")), "dear Ben");
}

TEST_F(SharesTakenBackTest, whatIsStillSharedOfAFolderMovesToTheTopAndBack) {
  anna.device.keld.folder("project/inner");
  anna.device.keld.write("project/inner/deep.txt", "deep");
  const CKShare outer = shareProject(Permission::readWrite);
  const CKShare inner = anna.share("project/inner", {{"ben", Permission::readWrite}});
  EXPECT_EQ(ben.accept(inner), ben.by("anna", "project/inner"));
  ASSERT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/inner/deep.txt")));
  anna.takeBack(outer);
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "inner/deep.txt")));
  EXPECT_TRUE(ben.device.losesSoon(ben.by("anna", "project")));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "inner/deep.txt")), "deep");
  const CKShare again = anna.share("project", {{"ben", Permission::readWrite}});
  ben.accept(again);
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/inner/deep.txt")));
  EXPECT_TRUE(ben.device.losesSoon(ben.by("anna", "inner")));
}

TEST_F(SharesTakenBackTest, aZoneThatComesBackIsShownAgain) {
  const CKShare share = shareProject(Permission::readWrite);
  anna.takeBack(share);
  EXPECT_TRUE(hasNothingOf(ben, "anna"));
  EXPECT_EQ(ben.accept(anna.share("project", {{"ben", Permission::readWrite}})), ben.by("anna", "project"));
  EXPECT_TRUE(ben.device.saysSoon(ben.by("anna", "project/plan.txt"), "the plan"));
  ben.device.keld.write(ben.by("anna", "project/plan.txt"), "again");
  EXPECT_TRUE(anna.device.saysSoon("project/plan.txt", "again"));
}

// --- Restarts, and several owners.

TEST_F(SharesTakenBackTest, aRestartGoesOnWhereItWas) {
  shareProject(Permission::readWrite);
  const std::string plan = ben.by("anna", "project/plan.txt");
  const ItemNumber number = ben.device.keld.number(plan);
  ben.device.keld.stop();
  anna.device.keld.write("project/meanwhile.txt", "more");
  ASSERT_TRUE(anna.hasSentAll());
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/meanwhile.txt")));
  EXPECT_EQ(ben.device.keld.number(plan), number);
  EXPECT_EQ(ben.device.contents(plan), "the plan");
  EXPECT_TRUE(ben.hasSentAll());
}

TEST_F(SharesTakenBackTest, aRestartInTheMiddleOfALargeZoneGetsAllOfIt) {
  constexpr int kDocuments = 450;
  anna.device.keld.folder("project");
  for (int number = 0; number < kDocuments; ++number)
    anna.device.keld.write("project/" + std::to_string(number), std::to_string(number));
  ASSERT_TRUE(anna.hasSentAll());
  const CKShare share = anna.share("project", {{"ben", Permission::readWrite}});
  ASSERT_FALSE(ben.cloud->acceptShare(share.URL, {}).error);
  const auto count = [&] {
    std::error_code problem;
    const std::filesystem::directory_iterator begin(ben.by("anna", "project"), problem);
    return problem ? 0 : std::distance(begin, std::filesystem::directory_iterator());
  };
  EXPECT_TRUE(eventually([&] { return count() > 0; }));
  for (int time = 0; time < 3; ++time) {
    ben.device.keld.stop();
    ben.device.keld.start();
  }
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(eventually([&] { return count() == kDocuments; })) << count();
  EXPECT_EQ(ben.device.contents(ben.by("anna", "project/449")), "449");
  EXPECT_TRUE(ben.hasSentAll());
  EXPECT_EQ(anna.device.names("project").size(), std::size_t{kDocuments});
}

TEST_F(SharesTakenBackTest, aKillBeforeTheContainerIsMadeLeavesNothingHalfDone) {
  const CKShare share = shareProject(Permission::readWrite);
  ben.device.keld.stop();
  // As it was when only the database had been begun.
  std::filesystem::remove_all(ben.by("anna") + "/..");
  for (const char *suffix : {"", "-wal", "-shm"}) std::filesystem::remove(ben.stateOf("anna") + suffix);
  SyncStore(ben.stateOf("anna")).setText("zoneTitle", "Shared by anna");
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/plan.txt")));
  ben.device.keld.stop();
  // And when it knew the owner.
  std::filesystem::remove_all(ben.by("anna") + "/..");
  for (const char *suffix : {"", "-wal", "-shm"}) std::filesystem::remove(ben.stateOf("anna") + suffix);
  SyncStore(ben.stateOf("anna")).setText("zoneOwner", "anna");
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/plan.txt")));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "project/plan.txt")), "the plan");
}

TEST_F(SharesTakenBackTest, aContainerThatHasVanishedDeletesNothing) {
  shareProject(Permission::readWrite);
  ben.device.keld.stop();
  std::filesystem::remove_all(ben.by("anna") + "/..");
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  EXPECT_TRUE(eventually([&] { return ben.device.transfers().heldDeletions > 0; }));
  EXPECT_TRUE(anna.device.exists("project/plan.txt"));
  Once<NSError> answer("deletions");
  ben.device.keld.session()->confirmDeletions(false, answer.completion());
  EXPECT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/plan.txt")));
  ASSERT_TRUE(eventually([&] {
    return ben.device.status(ben.by("anna", "project/plan.txt")).upload == QVUploadState::inCloud;
  }));
  // What is deleted then is meant.
  ben.device.keld.remove(ben.by("anna", "project/plan.txt"));
  EXPECT_TRUE(anna.device.losesSoon("project/plan.txt"));
}

TEST_F(SharesTakenBackTest, aLostItemDatabaseAndALostDatabaseOfTheZoneAreFoundAnew) {
  shareProject(Permission::readWrite);
  const std::string plan = ben.by("anna", "project/plan.txt");
  EXPECT_EQ(ben.device.contents(plan), "the plan");
  for (const std::string &lost : {ben.device.keld.databasePath(), ben.stateOf("anna")}) {
    ben.device.keld.stop();
    for (const char *suffix : {"", "-wal", "-shm"}) std::filesystem::remove(lost + suffix);
    ben.device.keld.start();
    ben.device.keld.waitForFirstScan();
    EXPECT_TRUE(eventually([&] { return ben.device.status(plan).upload == QVUploadState::inCloud; })) << lost;
    EXPECT_TRUE(ben.hasSentAll());
    EXPECT_EQ(ben.device.names(ben.by("anna")), std::vector<std::string>{"project"});
    EXPECT_EQ(ben.device.names(ben.by("anna", "project")), std::vector<std::string>{"plan.txt"});
    EXPECT_EQ(anna.device.names("project"), std::vector<std::string>{"plan.txt"});
    EXPECT_EQ(ben.device.read(plan), "the plan");
  }
}

TEST_F(SharesTakenBackTest, aDamagedDatabaseOfAZoneLeavesTheDriveAlone) {
  shareProject(Permission::readWrite);
  ben.device.keld.stop();
  for (const char *suffix : {"-wal", "-shm"}) std::filesystem::remove(ben.stateOf("anna") + suffix);
  std::ofstream(ben.stateOf("anna"), std::ios::trunc) << std::string(10000, 'x');
  ben.device.keld.start();
  ben.device.keld.waitForFirstScan();
  ben.device.keld.write("own.txt", "Ben's own");
  EXPECT_TRUE(ben.hasSentAll("own.txt"));
  EXPECT_TRUE(ben.device.exists(ben.by("anna", "project/plan.txt")));
  EXPECT_TRUE(anna.device.exists("project/plan.txt"));
}

TEST_F(SharesTakenBackTest, severalOwnersHaveAPlaceEachWhateverTheirNames) {
  const std::string hostile = "../\n%2e " + std::string(200, 'x');
  AccountDevice clara(cloudFolder, hostile);
  shareProject(Permission::readWrite);
  clara.device.keld.folder("project");
  clara.device.keld.write("project/plan.txt", "Clara's plan");
  ASSERT_TRUE(clara.hasSentAll());
  const CKShare share = clara.share("project", {{"ben", Permission::readWrite}});
  EXPECT_EQ(ben.accept(share), ben.by(hostile, "project"));
  EXPECT_TRUE(ben.device.saysSoon(ben.by(hostile, "project/plan.txt"), "Clara's plan"));
  ben.device.keld.write(ben.by(hostile, "project/plan.txt"), "by Ben");
  EXPECT_TRUE(clara.device.saysSoon("project/plan.txt", "by Ben"));
  EXPECT_EQ(anna.device.read("project/plan.txt"), "the plan");
  clara.takeBack(share);
  EXPECT_TRUE(hasNothingOf(ben, hostile));
  EXPECT_EQ(ben.device.contents(ben.by("anna", "project/plan.txt")), "the plan");
}

TEST_F(SharesTakenBackTest, aFolderThatIsMovedFromOneOwnersToAnothersGoesThereWithEverything) {
  anna.device.keld.folder("project/sub/deep");
  anna.device.keld.write("project/sub/deep/one.txt", "one");
  shareProject(Permission::readWrite);
  AccountDevice clara(cloudFolder, "clara");
  clara.device.keld.folder("work");
  ASSERT_TRUE(clara.hasSentAll());
  ben.accept(clara.share("work", {{"ben", Permission::readWrite}}));
  ASSERT_TRUE(ben.device.knowsSoon(ben.by("anna", "project/sub/deep/one.txt")));
  ben.device.keld.rename(ben.by("anna", "project/sub"), ben.by("clara", "work/sub"));
  EXPECT_TRUE(clara.device.knowsSoon("work/sub/deep/one.txt"));
  EXPECT_TRUE(anna.device.losesSoon("project/sub"));
  EXPECT_TRUE(clara.device.saysSoon("work/sub/deep/one.txt", "one"));
  EXPECT_EQ(ben.device.contents(ben.by("clara", "work/sub/deep/one.txt")), "one");
  EXPECT_TRUE(ben.hasSentAll());
}

TEST(SharedContainerName, isAContainersWhateverTheOwnersNameAndEachOwnersOwn) {
  const std::vector<std::string> owners{
      "anna", ".", "..", "a.b", "a_2eb", "a/b", "\n", std::string(255, '.'), std::string(254, '.') + "x"};
  std::set<std::string> names;
  for (const std::string &owner : owners) {
    const std::string name = SharedContainerOf(owner);
    EXPECT_TRUE(IsContainerName(name)) << name;
    EXPECT_TRUE(IsSharedContainer(name)) << name;
    EXPECT_LE(name.size(), 200U);
    EXPECT_EQ(name.find('/'), std::string::npos);
    names.insert(name);
  }
  EXPECT_EQ(names.size(), owners.size());
}

}  // namespace
}  // namespace droxa::keld
