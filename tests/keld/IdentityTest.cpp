// Which item a file is, after what programs do to files.

#include <sys/stat.h>
#include <unistd.h>

#include "tests/keld/KeldFixture.h"

namespace droxa::keld {

namespace {

class Identity : public testing::Test {
 protected:
  KeldFixture drive;
};

}  // namespace

TEST_F(Identity, survivesRenameAndMove) {
  drive.folder("a");
  drive.folder("b");
  drive.write("a/one");
  drive.settle();
  const ItemNumber one = drive.number("a/one");
  drive.rename("a/one", "a/two");
  drive.settle();
  EXPECT_EQ(drive.number("a/two"), one);
  drive.rename("a/two", "b/three");
  drive.settle();
  EXPECT_EQ(drive.number("b/three"), one);
  EXPECT_FALSE(drive.knows("a/one"));
}

TEST_F(Identity, ofAFolderTakesItsContentsAlong) {
  drive.folder("a/deep");
  drive.write("a/deep/file");
  drive.folder("b");
  drive.settle();
  const ItemNumber folder = drive.number("a"), file = drive.number("a/deep/file");
  drive.rename("a", "b/a");
  drive.settle();
  EXPECT_EQ(drive.number("b/a"), folder);
  EXPECT_EQ(drive.number("b/a/deep/file"), file);
}

TEST_F(Identity, survivesAnEditorsSaveByRename) {
  drive.write("notes.txt", "old");
  drive.settle();
  const ItemNumber notes = drive.number("notes.txt");
  drive.write(".notes.txt.new", "newer");
  drive.rename(".notes.txt.new", "notes.txt");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt"), notes);
  EXPECT_EQ(drive.record("notes.txt")->facts.size, 5U);
  EXPECT_FALSE(drive.knows(".notes.txt.new"));
}

TEST_F(Identity, survivesASaveByRenameWhoseTemporaryFileWasSeen) {
  drive.write("notes.txt", "old");
  drive.write("temporary", "newer");
  drive.settle();
  const ItemNumber notes = drive.number("notes.txt");
  drive.rename("temporary", "notes.txt");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt"), notes);
}

TEST_F(Identity, staysWithTheNameWhenAnEditorMakesABackup) {
  drive.write("notes.txt", "old");
  drive.settle();
  const ItemNumber notes = drive.number("notes.txt");
  drive.rename("notes.txt", "notes.txt~");
  drive.write("notes.txt", "new");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt"), notes);
  EXPECT_NE(drive.number("notes.txt~"), 0U);
  EXPECT_NE(drive.number("notes.txt~"), notes);
}

TEST_F(Identity, staysWithTheNameWhenTheBackupIsSeenFirst) {
  drive.write("notes.txt", "old");
  drive.settle();
  const ItemNumber notes = drive.number("notes.txt");
  drive.rename("notes.txt", "notes.txt~");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt~"), notes);
  drive.write("notes.txt", "new");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt"), notes);
  EXPECT_NE(drive.number("notes.txt~"), notes);
  drive.remove("notes.txt~");
  drive.settle();
  EXPECT_EQ(drive.number("notes.txt"), notes);
}

TEST_F(Identity, goesWithTheFileWhenTheNewNameIsNoBackup) {
  drive.write("a", "old");
  drive.settle();
  const ItemNumber a = drive.number("a");
  drive.rename("a", "b");
  drive.write("a", "another");
  drive.settle();
  EXPECT_EQ(drive.number("b"), a);
  EXPECT_NE(drive.number("a"), a);
}

TEST_F(Identity, ofTwoNamesOfOneFileIsTwo) {
  drive.folder("f");
  drive.write("f/a");
  drive.settle();
  const ItemNumber a = drive.number("f/a");
  ASSERT_EQ(::link(drive.at("f/a").c_str(), drive.at("f/b").c_str()), 0);
  drive.settle();
  const ItemNumber b = drive.number("f/b");
  EXPECT_EQ(drive.number("f/a"), a);
  EXPECT_NE(b, a);
  EXPECT_NE(b, 0U);
  drive.remove("f/a");
  drive.settle();
  EXPECT_EQ(drive.number("f/b"), b);
  EXPECT_FALSE(drive.knows("f/a"));
}

TEST_F(Identity, ofExchangedFoldersGoesWithTheFolders) {
  drive.folder("a");
  drive.folder("b");
  drive.write("a/in a");
  drive.write("b/in b");
  drive.settle();
  const ItemNumber a = drive.number("a"), b = drive.number("b");
  ASSERT_EQ(::renameat2(AT_FDCWD, drive.at("a").c_str(), AT_FDCWD, drive.at("b").c_str(), RENAME_EXCHANGE),
            0);
  drive.settle();
  EXPECT_EQ(drive.number("a"), b);
  EXPECT_EQ(drive.number("b"), a);
  EXPECT_TRUE(drive.knows("a/in b"));
  EXPECT_TRUE(drive.knows("b/in a"));
}

TEST_F(Identity, endsWhenAFolderTakesADocumentsName) {
  drive.write("a");
  drive.settle();
  const ItemNumber a = drive.number("a");
  drive.remove("a");
  drive.folder("a");
  drive.settle();
  EXPECT_NE(drive.number("a"), a);
  EXPECT_TRUE(drive.record("a")->isFolder());
}

TEST_F(Identity, ofWhatIsMovedToTheTrashStays) {
  drive.folder("f");
  drive.write("f/a");
  drive.settle();
  const ItemNumber f = drive.number("f"), a = drive.number("f/a");
  const std::string trash = drive.documents(QVUbiquitousTrashContainerID);
  drive.rename("f", trash + "/f");
  drive.settle();
  EXPECT_EQ(drive.number(trash + "/f"), f);
  EXPECT_EQ(drive.number(trash + "/f/a"), a);
  EXPECT_TRUE(drive.item(trash + "/f/a")->fields().isTrashed);
  drive.rename(trash + "/f", "f");
  drive.settle();
  EXPECT_FALSE(drive.item("f/a")->fields().isTrashed);
}

TEST_F(Identity, ofAFolderThatLeavesTheReplicaAndComesBackIsKeptForItsFiles) {
  drive.folder("f");
  drive.write("f/a");
  drive.settle();
  const ItemNumber a = drive.number("f/a");
  drive.rename("f", drive.home().root() + "/outside");
  drive.settle();
  EXPECT_FALSE(drive.knows("f/a"));
  drive.rename(drive.home().root() + "/outside", "g");
  drive.settle();
  EXPECT_EQ(drive.number("g/a"), a);
}

TEST_F(Identity, ofARenamedFolderChangesWhatItsContentsInherit) {
  drive.folder("f/g");
  drive.write("f/g/a");
  drive.settle();
  EXPECT_FALSE(drive.item("f/g/a")->fields().isExcludedFromSync);
  drive.rename("f", "f.nosync");
  drive.settle();
  EXPECT_TRUE(drive.item("f.nosync/g/a")->fields().isExcludedFromSync);
}

}  // namespace droxa::keld
