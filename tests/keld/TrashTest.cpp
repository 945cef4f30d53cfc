// The trash: the client library's operations with the daemon in the same process, on real folders.

#include <sys/file.h>
#include <sys/mount.h>
#include <sys/time.h>
#include <thread>

#include "KeldFixture.h"
#include "keld/contents/PromiseFile.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVDaemonConnectionInProcess.h"
#include "tessaly/QVItemActions.h"
#include "tessaly/QVTrashInfo.h"
#include "tests/support/MountedFolder.h"

namespace droxa::keld {

namespace {

class Trash : public testing::Test {
 protected:
  explicit Trash(KeldOptions options = {}) : keld(std::move(options)) { connect(); }
  ~Trash() override { disconnect(); }
  // The connection keeps the daemon alive.
  static void disconnect() {
    QVDaemonConnection::setDefaultConnection(nullptr);
    QVContainerCache::forget();
  }
  void connect() {
    QVDaemonConnection::setDefaultConnection(std::make_shared<QVDaemonConnectionInProcess>(keld.session()));
    QVContainerCache::forget();
  }
  NSURL url(const std::string &path) const { return NSURL::fileURLWithPath(keld.at(path)); }
  std::string files(const std::string &name = "") const {
    return keld.documents(QVUbiquitousTrashContainerID) + (name.empty() ? "" : "/" + name);
  }
  std::string note(const std::string &name) const {
    return keld.replica() + "/" + QVUbiquitousTrashContainerID + "/info/" + name + ".trashinfo";
  }
  static bool exists(const std::string &path) {
    return std::filesystem::symlink_status(path).type() != std::filesystem::file_type::not_found;
  }
  static std::string contents(const std::string &path) {
    std::ifstream stream(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(stream), {}};
  }
  // The name under which it is in the trash.
  std::string trash(const std::string &path) {
    NSURL result;
    NSError error;
    EXPECT_TRUE(qv_trashItemAtURL(manager, url(path), &result, &error)) << error.description();
    EXPECT_EQ(result.URLByDeletingLastPathComponent().path(), files());
    EXPECT_FALSE(exists(keld.at(path)));
    return result.lastPathComponent();
  }
  NSError refusalOf(const NSURL &item) {
    NSURL result;
    NSError error;
    EXPECT_FALSE(qv_trashItemAtURL(manager, item, &result, &error));
    EXPECT_FALSE(result);
    return error;
  }
  NSURL putBack(const std::string &name, NSError *error = nullptr) {
    return qv_putBackURLForTrashedItemAtURL(manager, NSURL::fileURLWithPath(files(name)), error);
  }
  std::size_t notes() const {
    const std::string info = keld.replica() + "/" + QVUbiquitousTrashContainerID + "/info";
    if (!exists(info)) return 0;
    const auto all = std::filesystem::directory_iterator(info);
    return static_cast<std::size_t>(std::distance(begin(all), end(all)));
  }

  KeldFixture keld;
  const NSFileManager *manager = NSFileManager::defaultManager();
};

// On a file system without extended attributes.
class TrashOfPromises : public Trash {
 protected:
  TrashOfPromises() : Trash(options()) {}
  static KeldOptions options() {
    KeldOptions options;
    options.sync.contents.assume = ContentsCapabilities{false, false, true, true};
    return options;
  }
  static PromiseFile promise(const std::string &name) {
    PromiseFile promise;
    promise.name = name;
    promise.marker.state = MarkerState::dataless;
    promise.marker.recordName = "record";
    promise.marker.digest = std::string(64, 'b');
    promise.marker.size = 5;
    return promise;
  }
};

}  // namespace

TEST_F(Trash, takesAnItemWithANoteOfWhereItWas) {
  keld.folder("f");
  keld.write("f/\xc3\xa4 100%.txt", "text");
  keld.settle();
  const ItemNumber number = keld.number("f/\xc3\xa4 100%.txt");
  const std::string path = keld.at("f/\xc3\xa4 100%.txt");
  const std::string name = trash("f/\xc3\xa4 100%.txt");
  EXPECT_EQ(name, "\xc3\xa4 100%.txt");
  EXPECT_EQ(contents(files(name)), "text");
  const auto info = QVParseTrashInfo(contents(note(name)));
  ASSERT_TRUE(info);
  EXPECT_EQ(info->path, path);
  EXPECT_EQ(info->folder, QVFileObjectID::folderOrAliasID(keld.number("f")));
  ASSERT_TRUE(eventually([&] { return keld.knows(files(name)); }));
  EXPECT_EQ(keld.number(files(name)), number);
  EXPECT_TRUE(keld.item(files(name))->fields().isTrashed);
}

TEST_F(Trash, givesEachItemANameOfItsOwn) {
  for (const char *folder : {"a", "b", "c"}) {
    keld.folder(folder);
    keld.write(std::string(folder) + "/notes.tar.gz", folder);
    keld.folder(std::string(folder) + "/v1.2");
    keld.write(std::string(folder) + "/.hidden", folder);
  }
  keld.settle();
  EXPECT_EQ(trash("a/notes.tar.gz"), "notes.tar.gz");
  EXPECT_EQ(trash("b/notes.tar.gz"), "notes.tar 2.gz");
  EXPECT_EQ(trash("c/notes.tar.gz"), "notes.tar 3.gz");
  EXPECT_EQ(trash("a/v1.2"), "v1.2");
  EXPECT_EQ(trash("b/v1.2"), "v1.2 2");
  EXPECT_EQ(trash("a/.hidden"), ".hidden");
  EXPECT_EQ(trash("b/.hidden"), ".hidden 2");
  EXPECT_EQ(contents(files("notes.tar 3.gz")), "c");
  EXPECT_EQ(putBack("notes.tar 2.gz"), url("b/notes.tar.gz"));
}

TEST_F(Trash, neverPutsAnItemOverAnother) {
  keld.write("a", "mine");
  keld.write(files("a"), "another program's, without a note");
  keld.settle();
  EXPECT_EQ(trash("a"), "a 2");
  EXPECT_EQ(contents(files("a")), "another program's, without a note");
  EXPECT_FALSE(exists(note("a")));
}

TEST_F(Trash, takesLongNames) {
  std::string name;
  while (name.size() < 250) name += "\xc3\xa4";
  name += ".txt";
  keld.write(name);
  keld.settle();
  const std::string trashed = trash(name);
  EXPECT_LE(trashed.size(), 240U);
  EXPECT_EQ(trashed.substr(trashed.size() - 4), ".txt");
  EXPECT_EQ(putBack(trashed), url(name));
}

TEST_F(Trash, takesALinkItselfAndLeavesItsTarget) {
  keld.write("target");
  ASSERT_EQ(::symlink("target", keld.at("link").c_str()), 0);
  keld.settle();
  trash("link");
  EXPECT_TRUE(exists(keld.at("target")));
  EXPECT_TRUE(std::filesystem::is_symlink(files("link")));
}

TEST_F(Trash, refusesWhatIsNoItemOfTheDrive) {
  keld.write(files("a"));
  keld.settle();
  const std::string outside = keld.home().write("outside", "x");
  const NSURL documents = url("");
  const NSURL hidden = documents.URLByDeletingLastPathComponent().URLByAppendingPathComponent("private");
  keld.write(hidden.path());
  for (const NSURL &item :
       {NSURL::fileURLWithPath(outside), documents, hidden, NSURL::fileURLWithPath(files("a")),
        NSURL::fileURLWithPath(files()), NSURL::fileURLWithPath(keld.replica())}) {
    const NSError error = refusalOf(item);
    EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument)) << error.description();
    EXPECT_NE(error.localizedDescription().find(item.path()), std::string::npos);
    EXPECT_TRUE(exists(item.path()));
  }
  EXPECT_TRUE(refusalOf(url("missing")).is(NSCocoaErrorDomain, NSFileNoSuchFileError));
  EXPECT_EQ(notes(), 0U);
}

TEST_F(Trash, refusesWhatIsOnAnotherFileSystem) {
  keld.folder("mounted");
  const MountedFolder mounted(keld.at("mounted"), "ramfs");
  if (!mounted) GTEST_SKIP() << "this process may not mount file systems";
  keld.write("mounted/a");
  const NSError error = refusalOf(url("mounted/a"));
  EXPECT_NE(error.localizedDescription().find("another file system"), std::string::npos);
  EXPECT_TRUE(exists(keld.at("mounted/a")));
  EXPECT_EQ(notes(), 0U);
}

TEST_F(Trash, aFailureLeavesNeitherNoteNorItem) {
  keld.folder("a");
  keld.settle();
  // A folder that something is mounted on can't be moved.
  const MountedFolder mounted(keld.at("a"), "ramfs");
  if (!mounted) GTEST_SKIP() << "this process may not mount file systems";
  EXPECT_TRUE(refusalOf(url("a")));
  EXPECT_TRUE(exists(keld.at("a")));
  EXPECT_EQ(notes(), 0U);
}

TEST_F(Trash, isUsedByManyAtOnce) {
  constexpr int kThreads = 4, kItems = 10;
  for (int thread = 0; thread < kThreads; ++thread)
    for (int item = 0; item < kItems; ++item) {
      const std::string folder = std::to_string(thread) + "/" + std::to_string(item);
      keld.folder(folder);
      keld.write(folder + "/a", folder);
    }
  keld.settle();
  std::vector<std::thread> threads;
  for (int thread = 0; thread < kThreads; ++thread)
    threads.emplace_back([this, thread] {
      for (int item = 0; item < kItems; ++item)
        trash(std::to_string(thread) + "/" + std::to_string(item) + "/a");
    });
  for (std::thread &thread : threads) thread.join();
  EXPECT_EQ(notes(), static_cast<std::size_t>(kThreads * kItems));
  for (int number = 1; number <= kThreads * kItems; ++number) {
    const std::string name = number == 1 ? "a" : "a " + std::to_string(number);
    EXPECT_EQ(putBack(name), url(contents(files(name)) + "/a")) << name;
  }
}

TEST_F(Trash, leadsBackToTheFolderWhereverThatIsNow) {
  keld.folder("f/g");
  keld.write("f/g/a");
  keld.settle();
  trash("f/g/a");
  EXPECT_EQ(putBack("a"), url("f/g/a"));
  keld.rename("f/g", "moved");
  ASSERT_TRUE(eventually([&] { return keld.knows("moved"); }));
  EXPECT_EQ(putBack("a"), url("moved/a"));
}

TEST_F(Trash, leadsBackByThePathWhereTheFolderIsGone) {
  keld.folder("f");
  keld.write("f/a");
  keld.settle();
  trash("f/a");
  keld.remove("f");
  ASSERT_TRUE(eventually([&] { return !keld.knows("f"); }));
  EXPECT_EQ(putBack("a"), url("f/a"));
}

TEST_F(Trash, leadsBackByThePathWhereTheIdentifierMeansAnotherFolder) {
  keld.folder("f");
  keld.folder("other");
  keld.write("f/a");
  keld.settle();
  trash("f/a");
  auto info = *QVParseTrashInfo(contents(note("a")));
  info.folder = QVFileObjectID::folderOrAliasID(keld.number("other"));
  keld.write(note("a"), QVEncodeTrashInfo(info));
  EXPECT_EQ(putBack("a"), url("f/a"));
}

TEST_F(Trash, leadsBackByThePathWhereTheFolderIsInTheTrashToo) {
  keld.folder("f");
  keld.write("f/a");
  keld.settle();
  trash("f/a");
  trash("f");
  ASSERT_TRUE(eventually([&] { return keld.knows(files("f")); }));
  EXPECT_EQ(putBack("a"), url("f/a"));
}

TEST_F(Trash, leadsBackWhatIsInATrashedFolder) {
  keld.folder("f/g");
  keld.write("f/g/a");
  keld.settle();
  trash("f/g");
  EXPECT_EQ(putBack("g/a"), url("f/g/a"));
}

TEST_F(Trash, leadsNowhereWithoutAUsableNote) {
  const std::string replica = keld.replica();
  const std::pair<std::string, std::string> texts[] = {
      {"empty", ""},
      {"junk", std::string(10'000, '\xff')},
      {"outside", QVEncodeTrashInfo({"/etc/passwd", "", std::nullopt, 0})},
      {"dots", "[Trash Info]\nPath=" + replica + "/com.quorva.Tessaly.default/Documents/../../../x\n"},
      {"private", QVEncodeTrashInfo({replica + "/com.quorva.Tessaly.default/private/x", "", {}, 0})},
      {"inTrash", QVEncodeTrashInfo({files("x"), "", {}, 0})},
      {"huge", "[Trash Info]\nPath=/a\n" + std::string(100'000, '#')}};
  keld.write("first");
  keld.settle();
  trash("first");
  for (const auto &[name, text] : texts) {
    keld.write(files(name));
    keld.write(note(name), text);
  }
  keld.write(files("none"));
  keld.write(files("link"));
  ASSERT_EQ(::symlink(note("first").c_str(), note("link").c_str()), 0);
  for (const char *name :
       {"none", "link", "empty", "junk", "outside", "dots", "private", "inTrash", "huge"}) {
    NSError error;
    EXPECT_FALSE(putBack(name, &error)) << name;
    EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileReadNoSuchFileError)) << name;
    EXPECT_NE(error.localizedDescription().find(name), std::string::npos);
  }
  NSError error;
  EXPECT_FALSE(qv_putBackURLForTrashedItemAtURL(manager, url("first"), &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument));
}

TEST_F(Trash, removesTheNoteOfWhatLeftItByWhoever) {
  for (const char *name : {"back", "gone", "renamed"}) keld.write(name);
  keld.settle();
  for (const char *name : {"back", "gone", "renamed"}) trash(name);
  ASSERT_TRUE(eventually([&] { return keld.knows(files("renamed")); }));
  ASSERT_EQ(notes(), 3U);
  keld.rename(files("back"), "back");
  keld.remove(files("gone"));
  EXPECT_TRUE(eventually([&] { return !exists(note("back")) && !exists(note("gone")); }));
  EXPECT_TRUE(exists(note("renamed")));
  // A note belongs to a name.
  keld.rename(files("renamed"), files("other"));
  EXPECT_TRUE(eventually([&] { return !exists(note("renamed")); }));
}

TEST_F(Trash, removesTheNoteOfWhatLeftItWhileNobodyWatched) {
  keld.write("a");
  keld.write("b");
  keld.settle();
  trash("a");
  trash("b");
  ASSERT_TRUE(eventually([&] { return keld.knows(files("b")); }));
  disconnect();
  keld.stop();
  keld.remove(files("a"));
  keld.start();
  connect();
  EXPECT_TRUE(eventually([&] { return !exists(note("a")); }));
  EXPECT_TRUE(exists(note("b")));
}

TEST_F(Trash, leavesANoteThatSomebodyIsWriting) {
  keld.write("a");
  keld.settle();
  trash("a");
  ASSERT_TRUE(eventually([&] { return keld.knows(files("a")); }));
  const std::string info = keld.replica() + "/" + QVUbiquitousTrashContainerID + "/info";
  const int folder = ::open(info.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  ASSERT_EQ(::flock(folder, LOCK_SH), 0);
  keld.rename(files("a"), "a");
  keld.settle();
  EXPECT_TRUE(exists(note("a")));
  ::close(folder);
  keld.settle();
  EXPECT_TRUE(eventually([&] { return !exists(note("a")); }));
}

TEST_F(Trash, removesANoteWithoutAnItemOnlyWhenItIsOld) {
  keld.write("a");
  keld.settle();
  trash("a");
  ASSERT_TRUE(eventually([&] { return keld.knows(files("a")); }));
  keld.write(note("young"), "x");
  keld.write(note("old"), "x");
  keld.write(keld.replica() + "/" + QVUbiquitousTrashContainerID + "/info/old.txt", "x");
  const auto longAgo = std::filesystem::file_time_type::clock::now() - std::chrono::hours(25);
  for (const std::string &path :
       {note("old"), note("a"), note("old").replace(note("old").size() - 9, 9, "txt")})
    std::filesystem::last_write_time(path, longAgo);
  disconnect();
  keld.stop();
  keld.start();
  connect();
  keld.settle();
  EXPECT_TRUE(exists(note("young")));
  EXPECT_TRUE(exists(note("a")));
  EXPECT_FALSE(exists(note("old")));
  EXPECT_EQ(notes(), 3U);
}

TEST_F(Trash, showsAndLeadsBackWhatAnotherProgramPutThere) {
  keld.folder("f");
  keld.folder(keld.replica() + "/" + QVUbiquitousTrashContainerID + "/info");
  keld.write(note("by another"),
             "[Trash Info]\nPath=" + keld.at("f") + "/was%20here\nDeletionDate=2026-01-31T12:00:00\n");
  keld.write(files("by another"), "x");
  keld.settle();
  EXPECT_TRUE(keld.item(files("by another"))->fields().isTrashed);
  EXPECT_EQ(putBack("by another"), url("f/was here"));
}

TEST_F(TrashOfPromises, takesThePromiseOfADocumentThatIsntHere) {
  keld.write(PromiseNameFor("a"), EncodePromise(promise("a")));
  keld.folder("f");
  keld.write("f/" + PromiseNameFor("a"), EncodePromise(promise("a")));
  keld.settle();
  const ItemNumber number = keld.number("f/a");
  ASSERT_NE(number, 0U);
  EXPECT_EQ(trash("a"), "a");
  EXPECT_EQ(trash("f/a"), "a 2");
  EXPECT_TRUE(exists(files(PromiseNameFor("a 2"))));
  EXPECT_FALSE(exists(keld.at("f/" + PromiseNameFor("a"))));
  ASSERT_TRUE(eventually([&] { return keld.number(files("a 2")) == number; }));
  EXPECT_FALSE(keld.item(files("a 2"))->fields().isDownloaded);
  EXPECT_EQ(putBack("a 2"), url("f/a"));
  keld.remove(files(PromiseNameFor("a")));
  EXPECT_TRUE(eventually([&] { return !exists(note("a")); }));
  EXPECT_TRUE(exists(note("a 2")));
}

TEST(TrashOfOldLayout, isMovedOverAtTheStartWithItsItemsAsTheyWere) {
  KeldFixture keld({}, false);
  const std::string trash = keld.replica() + "/" + QVUbiquitousTrashContainerID;
  keld.folder(trash + "/Documents/f");
  keld.write(trash + "/Documents/f/a", "1");
  keld.write(trash + "/Documents/b", "2");
  keld.folder(trash + "/files");
  keld.write(trash + "/files/b", "3");
  keld.start();
  keld.settle();
  EXPECT_FALSE(std::filesystem::exists(trash + "/Documents"));
  EXPECT_TRUE(keld.knows(trash + "/files/f/a"));
  EXPECT_TRUE(keld.knows(trash + "/files/b"));
  EXPECT_TRUE(keld.knows(trash + "/files/b 2"));
  const ItemNumber a = keld.number(trash + "/files/f/a");
  const ItemNumber files = keld.number(trash + "/files");
  keld.stop();
  // As a run of an older version left it.
  std::filesystem::rename(trash + "/files", trash + "/Documents");
  {
    SqlDatabase database(keld.databasePath(), SqlDatabase::Access::readWrite, 1024);
    database.execute("UPDATE items SET name = CAST('Documents' AS BLOB) WHERE id = " + std::to_string(files));
  }
  keld.start();
  keld.settle();
  EXPECT_EQ(keld.number(trash + "/files/f/a"), a);
  EXPECT_EQ(keld.number(trash + "/files"), files);
  EXPECT_TRUE(keld.item(trash + "/files/f/a")->fields().isTrashed);
  EXPECT_EQ(keld.daemon().containers()->byID(QVUbiquitousTrashContainerID)->documents, files);
}

}  // namespace droxa::keld
