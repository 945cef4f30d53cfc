// What a kill leaves behind, made by hand: the files, the databases and the cloud as they are then.

#include <sys/stat.h>
#include <sys/xattr.h>

#include "keld/Sql.h"
#include "keld/contents/DocumentMarker.h"
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

TEST_F(AfterKill, anEvictionThatWasCutShortIsEnded) {
  share("notes.txt", "hello");
  const std::string path = ben.keld.at("notes.txt");
  for (const bool isMarkedOnly : {false, true}) {
    ASSERT_EQ(ben.contents("notes.txt"), "hello");
    ASSERT_FALSE(ben.evict("notes.txt"));
    ben.keld.stop();
    std::string mark(1000, '\0');
    const ssize_t length = ::getxattr(path.c_str(), kMarkerAttribute, mark.data(), mark.size());
    ASSERT_GT(length, 0);
    mark.resize(static_cast<std::size_t>(length));
    if (isMarkedOnly) mark.replace(mark.find(" d "), 3, " e ");
    ASSERT_EQ(::setxattr(path.c_str(), kMarkerAttribute, mark.data(), mark.size(), 0), 0);
    change(ben, "keld.sqlite",
           ("UPDATE items SET flags = " + std::to_string(kUploadedFlag) +
            " WHERE name = CAST('notes.txt' AS BLOB)")
               .c_str());
    change(
        ben, "sync.sqlite",
        "UPDATE rows SET dataless = 0, localChanged = 1; UPDATE meta SET value = 0 WHERE key = 'endedWell'");
    ben.keld.start();
    ben.keld.waitForFirstScan();
    EXPECT_TRUE(eventually([&] {
      return ben.keld.record("notes.txt")->flags == (kDatalessFlag | kUploadedFlag);
    })) << isMarkedOnly;
    EXPECT_TRUE(ben.isDataless("notes.txt"));
  }
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
  EXPECT_EQ(anna.read("notes.txt"), "hello");
}

TEST_F(AfterKill, aSecondNameIsWrittenDownBeforeItIsGiven) {
  share("notes.txt", "hello");
  ASSERT_EQ(ben.contents("notes.txt"), "hello");
  ben.keld.stop();
  change(ben, "sync.sqlite",
         "CREATE TABLE noted(name); CREATE TRIGGER notes AFTER INSERT ON meta WHEN NEW.key = 'asideName'"
         " BEGIN INSERT INTO noted VALUES (CAST(NEW.value AS TEXT)); END");
  anna.keld.write("notes.txt", "written by anna");
  ASSERT_FALSE(anna.waitForUploads());
  ben.keld.write("notes.txt", "and by ben");
  ben.keld.start();
  ASSERT_TRUE(
      eventually([&] { return ben.names().size() == 2 && ben.read("notes.txt") == "written by anna"; }));
  ASSERT_FALSE(ben.waitForUploads());
  ben.keld.stop();
  SqlDatabase opened(DroxaHome(ben.keld.home().root()).state() + "/sync.sqlite",
                     SqlDatabase::Access::readWrite, 100);
  EXPECT_EQ(opened.integer(("SELECT count(*) FROM noted WHERE name = '" + ben.names().front() + "'").c_str()),
            1)
      << ben.names().front();
  EXPECT_EQ(opened.integer("SELECT value FROM meta WHERE key = 'asideItem'"), 0) << "it is over";
}

// Ben's daemon ends while it gives a document that both changed a second name.
class WhileNamingAside : public AfterKill {
 protected:
  static constexpr char kCopy[] = "notes (conflict, ben 2026-11-21).txt";
  void SetUp() override {
    share("notes.txt", "hello");
    ASSERT_EQ(ben.contents("notes.txt"), "hello");
    ben.keld.stop();
    struct stat status = {};
    ASSERT_EQ(::stat(ben.keld.at("notes.txt").c_str(), &status), 0);
    std::filesystem::create_hard_link(ben.keld.at("notes.txt"), ben.keld.at(kCopy));
    const std::string note =
        "INSERT OR REPLACE INTO meta VALUES ('asideItem', (SELECT item FROM rows)), ('asideInode', " +
        std::to_string(status.st_ino) + "), ('asideName', CAST('" + kCopy + "' AS BLOB))";
    change(ben, "sync.sqlite", note.c_str());
  }
  void expectNames(const std::vector<std::string> &names) {
    ben.keld.start();
    ben.keld.waitForFirstScan();
    EXPECT_TRUE(eventually([&] { return ben.names() == names; })) << testing::PrintToString(ben.names());
    const NSError error = ben.waitForUploads();
    EXPECT_FALSE(error) << error.description();
    EXPECT_TRUE(eventually([&] { return anna.names() == names; })) << testing::PrintToString(anna.names());
    EXPECT_EQ(ben.names(), names);
    EXPECT_EQ(ben.read("notes.txt"), "hello");
  }
};

TEST_F(WhileNamingAside, theSecondNameGoes) {
  expectNames({"notes.txt"});
}

TEST_F(WhileNamingAside, whatAPersonHasPutThereSinceStays) {
  std::filesystem::remove(ben.keld.at(kCopy));
  ben.keld.write(kCopy, "of a person");
  expectNames({kCopy, "notes.txt"});
  EXPECT_EQ(ben.read(kCopy), "of a person");
}

TEST_F(WhileNamingAside, theSecondNameStaysWhereItIsTheOnlyOne) {
  std::filesystem::remove(ben.keld.at("notes.txt"));
  ben.keld.start();
  ben.keld.waitForFirstScan();
  (void)ben.waitForUploads();
  EXPECT_EQ(ben.read(kCopy), "hello");
}

// Ben's device makes what the cloud tells of, and never gets to write down that it did.
class WhileMaking : public AfterKill {
 protected:
  // Does what anna does, and ends ben's daemon when it has made `path`, in a transaction that can't end.
  void makeAndEnd(const std::string &path, const std::function<void()> &annaDoes) {
    ben.keld.stop();
    const std::string name = std::filesystem::path(path).filename();
    const std::string trigger = "CREATE TRIGGER fails BEFORE INSERT ON rows WHEN NEW.name = CAST('" + name +
                                "' AS BLOB) BEGIN SELECT RAISE(ABORT, 'no more'); END";
    change(ben, "sync.sqlite", trigger.c_str());
    annaDoes();
    ASSERT_FALSE(anna.waitForUploads());
    ben.keld.start();
    ASSERT_TRUE(eventually([&] { return isMarked(path); }));
    ben.keld.stop();
    ASSERT_TRUE(isMarked(path));
    change(ben, "sync.sqlite", "DROP TRIGGER fails");
  }
  bool isMarked(const std::string &path) {
    return ::lgetxattr(ben.keld.at(path).c_str(), kMarkerAttribute, nullptr, 0) > 0;
  }
  void makeAndEnd(const std::string &path, const std::string &contents) {
    makeAndEnd(path, [&] { anna.keld.write(path, contents); });
  }
  // Both have the same, and ben has nothing to send.
  void expectBothHave(const std::vector<std::string> &names) {
    ben.keld.start();
    ben.keld.waitForFirstScan();
    EXPECT_TRUE(eventually([&] { return ben.names() == names; })) << testing::PrintToString(ben.names());
    const NSError error = ben.waitForUploads();
    EXPECT_FALSE(error) << error.description();
    anna.keld.write("after", "after");
    ASSERT_FALSE(anna.waitForUploads());
    ASSERT_TRUE(ben.knowsSoon("after"));
    anna.keld.remove("after");
    ASSERT_FALSE(anna.waitForUploads());
    ASSERT_TRUE(ben.losesSoon("after"));
    EXPECT_EQ(ben.names(), names);
    EXPECT_EQ(anna.names(), names);
  }
};

TEST_F(WhileMaking, whatIsStillInTheCloudIsThere) {
  makeAndEnd("notes.txt", "hello");
  expectBothHave({"notes.txt"});
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
}

TEST_F(WhileMaking, whatWasDeletedMeanwhileGoes) {
  makeAndEnd("saving 1", "hello");
  anna.keld.remove("saving 1");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({});
}

TEST_F(WhileMaking, anEmptyDocumentThatWasDeletedMeanwhileGoes) {
  makeAndEnd("saving 1", "");
  anna.keld.remove("saving 1");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({});
}

TEST_F(WhileMaking, whatWasRenamedMeanwhileIsThereOnce) {
  makeAndEnd("saving 1", "hello");
  anna.keld.rename("saving 1", "notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({"notes.txt"});
  EXPECT_EQ(ben.contents("notes.txt"), "hello");
}

TEST_F(WhileMaking, aFolderThatWasDeletedMeanwhileGoesWithWhatWasMadeInIt) {
  makeAndEnd("work/one.txt", [&] {
    anna.keld.folder("work");
    anna.keld.write("work/one.txt", "1");
  });
  anna.keld.remove("work");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({});
}

TEST_F(WhileMaking, whatWasWrittenIntoItSinceStays) {
  makeAndEnd("notes.txt", "hello");
  ben.keld.write("notes.txt", "written by ben");
  anna.keld.remove("notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({"notes.txt"});
  EXPECT_EQ(ben.read("notes.txt"), "written by ben");
  EXPECT_EQ(anna.contents("notes.txt"), "written by ben");
}

TEST_F(WhileMaking, aPersonsOwnDocumentOfTheSameContentsStays) {
  makeAndEnd("notes.txt", [&] {
    ben.keld.write("notes.txt", "hello");
    anna.keld.write("notes.txt", "hello");
  });
  anna.keld.remove("notes.txt");
  ASSERT_FALSE(anna.waitForUploads());
  expectBothHave({"notes.txt"});
  EXPECT_EQ(ben.read("notes.txt"), "hello");
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
