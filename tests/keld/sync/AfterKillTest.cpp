// What a kill leaves behind, made by hand: the files, the databases and the cloud as they are then.

#include "keld/Sql.h"
#include "tests/keld/sync/TwoDevices.h"

namespace droxa::keld {
namespace {

class AfterKill : public TwoDevices {
 protected:
  // Changes a device's database while its daemon is stopped.
  void change(Device &device, const std::string &database, const char *sql) {
    SqlDatabase opened(DroxaHome(device.keld.home().root()).state() + "/" + database,
                       SqlDatabase::Access::readWrite, 100);
    opened.execute(sql);
  }
};

TEST_F(AfterKill, aVersionThatIsInPlaceAlreadyIsNoEdit) {
  share("notes.txt", "hello");
  ASSERT_EQ(ben.contents("notes.txt"), "hello");
  ben.keld.stop();
  change(ben, "sync.sqlite",
         "UPDATE rows SET newerTag = tag, newerSize = size, newerModified = modified, newerDigest = digest,"
         " newerMode = mode, tag = 'older', size = 1, digest = 'older', localSize = 1, localModified = 1,"
         " dataless = 1; UPDATE meta SET value = 0 WHERE key IN ('endedWell', 'examinedRank')");
  ben.keld.start();
  const NSError error = ben.waitForUploads();
  EXPECT_FALSE(error) << error.description();
  EXPECT_EQ(ben.read("notes.txt"), "hello");
  EXPECT_EQ(ben.keld.namesIn("").size(), anna.keld.namesIn("").size()) << "no copy was made";
}

TEST_F(AfterKill, whatTheTableDoesNotSayIsWorkedOutAnew) {
  share("notes.txt", "hello");
  ASSERT_TRUE(
      eventually([&] { return ben.keld.record("notes.txt")->flags == (kDatalessFlag | kUploadedFlag); }));
  ben.keld.stop();
  change(ben, "keld.sqlite", "UPDATE items SET flags = 0 WHERE name = CAST('notes.txt' AS BLOB)");
  change(ben, "sync.sqlite", "UPDATE meta SET value = 0 WHERE key = 'endedWell'");
  ben.keld.start();
  ben.keld.waitForFirstScan();
  EXPECT_TRUE(
      eventually([&] { return ben.keld.record("notes.txt")->flags == (kDatalessFlag | kUploadedFlag); }));
}

TEST_F(AfterKill, aMarkOfAWaitIsRemoved) {
  ben.keld.stop();
  const std::string mark = ben.keld.at("") + "/../.mark-1-1";
  ben.keld.write(mark);
  ben.keld.start();
  EXPECT_FALSE(std::filesystem::exists(mark));
}

TEST_F(AfterKill, whatWasMadeAndNotWrittenDownIsShownAsDataless) {
  share("notes.txt", "hello");
  ASSERT_TRUE(
      eventually([&] { return ben.keld.record("notes.txt")->flags == (kDatalessFlag | kUploadedFlag); }));
  ben.keld.stop();
  change(ben, "keld.sqlite", "UPDATE items SET flags = 0 WHERE name = CAST('notes.txt' AS BLOB)");
  change(ben, "sync.sqlite", "DELETE FROM rows; DELETE FROM meta WHERE key = 'changeToken'");
  ben.keld.start();
  ben.keld.waitForFirstScan();
  EXPECT_TRUE(
      eventually([&] { return ben.keld.record("notes.txt")->flags == (kDatalessFlag | kUploadedFlag); }));
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
}

TEST_F(TwoDevices, whatWasDeletedInARenamedFolderGoes) {
  anna.keld.folder("work");
  share("work/one.txt", "1");
  share("work/two.txt", "2");
  ben.keld.stop();
  anna.keld.rename("work", "plans");
  ASSERT_FALSE(anna.waitForUploads());
  anna.keld.remove("plans/one.txt");
  ASSERT_FALSE(anna.waitForUploads());
  anna.keld.write("plans/two.txt", "two");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.start();
  ASSERT_TRUE(ben.knowsSoon("plans/two.txt"));
  EXPECT_TRUE(ben.losesSoon("plans/one.txt"));
  EXPECT_TRUE(eventually([&] { return ben.status("plans/two.txt").size == 3; }));
  EXPECT_EQ(ben.contents("plans/two.txt"), "two");
}

TEST_F(TwoDevices, whatIsInAFolderThatWasDeletedElsewhereStaysOnBoth) {
  anna.keld.folder("shared");
  share("shared/old.txt", "old");
  anna.keld.stop();
  ben.keld.write("shared/new.txt", "new");
  ASSERT_FALSE(ben.waitForUploads());
  anna.keld.remove("shared");
  anna.keld.start();
  ASSERT_FALSE(anna.waitForUploads());
  ASSERT_TRUE(anna.knowsSoon("shared/new.txt"));
  EXPECT_EQ(anna.contents("shared/new.txt"), "new");
  EXPECT_TRUE(ben.losesSoon("shared/old.txt"));
  EXPECT_EQ(ben.read("shared/new.txt"), "new");
}

}  // namespace
}  // namespace droxa::keld
