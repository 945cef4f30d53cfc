// What may only be read.

#include "tests/keld/sync/TwoAccounts.h"

namespace droxa::keld {
namespace {

class ReadOnlySharesTest : public TwoAccounts {
 protected:
  std::string plan() { return ben.by("anna", "project/plan.txt"); }
  mode_t modeOfPlan() {
    struct stat status = {};
    return ::stat(plan().c_str(), &status) == 0 ? status.st_mode & 0777 : 0;
  }
};

TEST_F(ReadOnlySharesTest, theDocumentsBearNoWriteBitsAndReadWell) {
  shareProject(Permission::readOnly);
  EXPECT_EQ(modeOfPlan() & 0222U, 0U);
  EXPECT_EQ(ben.device.contents(plan()), "the plan");
  EXPECT_EQ(modeOfPlan() & 0222U, 0U);
  EXPECT_FALSE(ben.device.evict(plan()));
  anna.device.keld.write("project/plan.txt", "the new plan");
  EXPECT_TRUE(ben.device.saysSoon(plan(), "the new plan"));
  EXPECT_EQ(modeOfPlan() & 0222U, 0U);
}

TEST_F(ReadOnlySharesTest, whatIsWrittenIsKeptHereAndSaysSo) {
  shareProject(Permission::readOnly);
  EXPECT_EQ(ben.device.contents(plan()), "the plan");
  ben.device.keld.write(plan(), "Ben's plan");
  EXPECT_EQ(ben.refusalOf(plan()), QVErrorReadOnlyShare);
  EXPECT_TRUE(ben.device.waitForUploads(plan()).is(QVTessalyErrorDomain, QVErrorReadOnlyShare));
  EXPECT_EQ(ben.device.read(plan()), "Ben's plan");
  EXPECT_EQ(anna.device.read("project/plan.txt"), "the plan");
}

TEST_F(ReadOnlySharesTest, whatIsNewIsKeptHereAndSaysSo) {
  shareProject(Permission::readOnly);
  ben.device.keld.folder(ben.by("anna", "project/mine"));
  ben.device.keld.write(ben.by("anna", "project/mine/one.txt"));
  EXPECT_EQ(ben.refusalOf(ben.by("anna", "project/mine/one.txt")), QVErrorReadOnlyShare);
}

TEST_F(ReadOnlySharesTest, aRenamingIsUndone) {
  shareProject(Permission::readOnly);
  ben.device.keld.rename(plan(), ben.by("anna", "project/goals.txt"));
  EXPECT_TRUE(eventually([&] { return ben.device.exists(plan()); }));
  EXPECT_FALSE(ben.device.exists(ben.by("anna", "project/goals.txt")));
  EXPECT_TRUE(ben.hasSentAll());
}

TEST_F(ReadOnlySharesTest, aDeletionIsUndone) {
  shareProject(Permission::readOnly);
  ben.device.keld.remove(plan());
  EXPECT_TRUE(ben.device.knowsSoon(plan()));
  EXPECT_TRUE(eventually([&] { return ben.device.exists(plan()); }));
  EXPECT_EQ(ben.device.contents(plan()), "the plan");
  EXPECT_TRUE(anna.device.exists("project/plan.txt"));
}

TEST_F(ReadOnlySharesTest, aPermissionThatIsGivenLaterSendsWhatWaited) {
  const CKShare share = shareProject(Permission::readOnly);
  EXPECT_EQ(ben.device.contents(plan()), "the plan");
  ben.device.keld.write(plan(), "Ben's plan");
  EXPECT_EQ(ben.refusalOf(plan()), QVErrorReadOnlyShare);
  anna.change(share, {{"ben", Permission::readWrite}});
  EXPECT_TRUE(anna.device.saysSoon("project/plan.txt", "Ben's plan"));
  struct stat status = {};
  ASSERT_EQ(::stat(anna.device.keld.at("project/plan.txt").c_str(), &status), 0);
  EXPECT_NE(status.st_mode & 0222U, 0U);
}

TEST_F(ReadOnlySharesTest, aPermissionThatIsTakenTakesTheWriteBits) {
  const CKShare share = shareProject(Permission::readWrite);
  EXPECT_NE(modeOfPlan() & 0222U, 0U);
  anna.change(share, {{"ben", Permission::readOnly}});
  EXPECT_TRUE(eventually([&] { return (modeOfPlan() & 0222U) == 0; }));
  anna.change(share, {{"ben", Permission::readWrite}});
  EXPECT_TRUE(eventually([&] { return (modeOfPlan() & 0222U) != 0; }));
  anna.device.keld.settle();
  struct stat status = {};
  ASSERT_EQ(::stat(anna.device.keld.at("project/plan.txt").c_str(), &status), 0);
  EXPECT_NE(status.st_mode & 0222U, 0U);
}

TEST_F(ReadOnlySharesTest, nothingIsMovedIntoThem) {
  shareProject(Permission::readOnly);
  ben.device.keld.write("note.txt");
  ASSERT_TRUE(ben.hasSentAll());
  Once<std::uint64_t, NSError> answer("capability");
  ben.device.keld.session()->getMoveCapability(
      ben.device.url("note.txt"), ben.device.url(ben.by("anna", "project/note.txt")), answer.completion());
  EXPECT_EQ(answer.value<0>(), std::uint64_t{QVMoveToReadOnlyPlace});
}

}  // namespace
}  // namespace droxa::keld
