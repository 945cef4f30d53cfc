// What users note on items: seen on their files, kept in their rows, and set through the daemon.

#include <sys/xattr.h>

#include "KeldFixture.h"
#include "keld/Schema.h"
#include "tests/support/MountedFolder.h"

namespace droxa::keld {

namespace {

constexpr std::int64_t kDate = 1'769'860'800'123'456'789;
const QVItemMetadata kAll{{"Red", "Work"}, kDate, 12};

NSError set(KeldFixture &keld, const std::string &path, const QVItemMetadataChange &change) {
  Once<NSError> answer("metadata of " + path);
  keld.session()->setMetadataAtURL(NSURL::fileURLWithPath(keld.at(path)), change, answer.completion());
  return answer.value<0>();
}
void setRaw(KeldFixture &keld, const std::string &path, const char *name, const std::string &value) {
  ASSERT_EQ(::lsetxattr(keld.at(path).c_str(), name, value.data(), value.size(), 0), 0);
}
QVItemMetadata noted(KeldFixture &keld, const std::string &path) {
  const auto record = keld.record(path);
  return record ? record->metadata : QVItemMetadata();
}

}  // namespace

class Metadata : public testing::TestWithParam<WatcherKind> {
 protected:
  KeldFixture keld{WatchedBy(GetParam())};
};

INSTANTIATE_TEST_SUITE_P(Watchers, Metadata, testing::Values(WatcherKind::best, WatcherKind::inotify),
                         [](const auto &kind) {
                           return kind.param == WatcherKind::best ? std::string("Best")
                                                                  : std::string("Inotify");
                         });

TEST_P(Metadata, thatAnotherProgramWritesIsSeenAndGetsARank) {
  keld.write("a");
  keld.folder("f");
  keld.settle();
  for (const char *path : {"a", "f"}) {
    const std::uint64_t rank = keld.record(path)->rank;
    setRaw(keld, path, "user.xdg.tags", "Red,Work");
    setRaw(keld, path, "user.droxa.favorite-rank", "12");
    setRaw(keld, path, "user.droxa.last-used", "2026-01-31T12:00:00.123456789Z");
    EXPECT_TRUE(eventually([&] { return noted(keld, path) == kAll; })) << path;
    EXPECT_GT(keld.record(path)->rank, rank);
    const auto item = keld.item(path);
    EXPECT_EQ(item->fields().lastUsedDate, NSDate::dateWithNanosecondsSince1970(kDate));
    EXPECT_EQ(item->fields().favoriteRank, 12U);
    EXPECT_EQ(item->fields().tagData, QVTagDataOfNames({"Red", "Work"}));
  }
}

TEST_P(Metadata, isRemovedWithItsAttributes) {
  keld.write("a");
  keld.settle();
  setRaw(keld, "a", "user.xdg.tags", "Red");
  ASSERT_TRUE(eventually([&] { return !noted(keld, "a").isEmpty(); }));
  ASSERT_EQ(::lremovexattr(keld.at("a").c_str(), "user.xdg.tags"), 0);
  EXPECT_TRUE(eventually([&] { return noted(keld, "a").isEmpty(); }));
}

TEST_P(Metadata, ofAFileThatIsMovedGoesWithIt) {
  keld.write("a");
  keld.folder("f");
  setRaw(keld, "a", "user.xdg.tags", "Red");
  keld.settle();
  const ItemNumber number = keld.number("a");
  keld.rename("a", "f/b");
  ASSERT_TRUE(eventually([&] { return keld.knows("f/b"); }));
  EXPECT_EQ(keld.number("f/b"), number);
  EXPECT_EQ(noted(keld, "f/b").tags, std::vector<std::string>{"Red"});
}

TEST(MetadataAtStart, isFoundByTheFirstScanAndByALaterOne) {
  KeldFixture keld({}, false);
  keld.write("a");
  keld.write("b");
  setRaw(keld, "a", "user.xdg.tags", "Red");
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(noted(keld, "a").tags, std::vector<std::string>{"Red"});
  keld.stop();
  setRaw(keld, "b", "user.xdg.tags", "Work");
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(noted(keld, "b").tags, std::vector<std::string>{"Work"});
  EXPECT_EQ(noted(keld, "a").tags, std::vector<std::string>{"Red"});
}

TEST(MetadataAtStart, ofADatabaseOfTheFirstVersionIsReadAnew) {
  KeldFixture keld({}, false);
  keld.write("a");
  keld.start();
  keld.settle();
  const ItemNumber number = keld.number("a");
  keld.stop();
  {
    SqlDatabase database(keld.databasePath(), SqlDatabase::Access::readWrite, 1024);
    for (const char *column : {"tags", "used", "favorite"})
      database.execute(std::string("ALTER TABLE items DROP COLUMN ") + column);
    database.execute("PRAGMA user_version = 1");
  }
  struct stat before {};
  ASSERT_EQ(::stat(keld.at("a").c_str(), &before), 0);
  setRaw(keld, "a", "user.xdg.tags", "Red");
  // As if it had been there when the old version looked at the file.
  {
    SqlDatabase database(keld.databasePath(), SqlDatabase::Access::readWrite, 1024);
    struct stat now {};
    ASSERT_EQ(::stat(keld.at("a").c_str(), &now), 0);
    database.execute("UPDATE items SET changed = " +
                     std::to_string(now.st_ctim.tv_sec * 1'000'000'000 + now.st_ctim.tv_nsec) +
                     " WHERE id = " + std::to_string(number));
  }
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(keld.number("a"), number);
  EXPECT_EQ(noted(keld, "a").tags, std::vector<std::string>{"Red"});
}

TEST(MetadataThroughTheDaemon, isWrittenOnTheFile) {
  KeldFixture keld;
  keld.write("a");
  keld.settle();
  EXPECT_EQ(set(keld, "a", QVItemMetadataChange::to(kAll)), NSError());
  EXPECT_EQ(noted(keld, "a"), kAll) << "the reply came before it was shown";
  QVItemMetadata onDisk;
  ASSERT_EQ(QVReadItemAttributes(keld.at("a"), &onDisk), 0);
  EXPECT_EQ(onDisk, kAll);
  EXPECT_EQ(set(keld, "a", QVItemMetadataChange::to({})), NSError());
  EXPECT_TRUE(noted(keld, "a").isEmpty());
}

TEST(MetadataThroughTheDaemon, ofALinkIsKeptWithItsRowThroughMovesAndRestarts) {
  KeldFixture keld;
  keld.write("target");
  ASSERT_EQ(::symlink("target", keld.at("alias").c_str()), 0);
  ASSERT_EQ(::symlink("missing", keld.at("link").c_str()), 0);
  keld.settle();
  for (const char *path : {"alias", "link"}) {
    const std::uint64_t rank = keld.record(path)->rank;
    EXPECT_EQ(set(keld, path, QVItemMetadataChange::to(kAll)), NSError());
    EXPECT_EQ(noted(keld, path), kAll);
    EXPECT_GT(keld.record(path)->rank, rank);
  }
  EXPECT_TRUE(noted(keld, "target").isEmpty());
  keld.rename("alias", "renamed");
  ASSERT_TRUE(eventually([&] { return keld.knows("renamed"); }));
  EXPECT_EQ(noted(keld, "renamed"), kAll);
  keld.stop();
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(noted(keld, "renamed"), kAll);
  EXPECT_EQ(noted(keld, "link"), kAll);
  EXPECT_EQ(set(keld, "renamed", {{{"Work"}}, {}, {}}), NSError());
  EXPECT_EQ(noted(keld, "renamed"), (QVItemMetadata{{"Work"}, kDate, 12}));
}

TEST(MetadataThroughTheDaemon, thatChangesNothingGetsNoRank) {
  KeldFixture keld;
  keld.write("a");
  keld.settle();
  ASSERT_EQ(set(keld, "a", QVItemMetadataChange::to(kAll)), NSError());
  const std::uint64_t rank = keld.record("a")->rank;
  ASSERT_EQ(set(keld, "a", QVItemMetadataChange::to(kAll)), NSError());
  EXPECT_EQ(keld.record("a")->rank, rank);
}

TEST(MetadataThroughTheDaemon, isRefusedAfterItHasStopped) {
  KeldFixture keld;
  keld.write("a");
  keld.settle();
  const auto session = keld.session();
  keld.daemon().stop();
  Once<NSError> answer("metadata");
  session->setMetadataAtURL(NSURL::fileURLWithPath(keld.at("a")), QVItemMetadataChange::to(kAll),
                            answer.completion());
  EXPECT_TRUE(answer.value<0>().is(QVTessalyErrorDomain, QVErrorShuttingDown));
}

TEST(MetadataWithoutAttributes, isKeptWithTheRow) {
  KeldFixture keld({}, false);
  const MountedFolder mounted(keld.replica(), "ramfs");
  if (!mounted) GTEST_SKIP() << "this process may not mount file systems";
  keld.folder("");
  keld.write("a");
  keld.folder("f");
  keld.start();
  keld.settle();
  ASSERT_FALSE(QVKeepsItemAttributes(keld.at("a")));
  for (const char *path : {"a", "f"}) {
    EXPECT_EQ(set(keld, path, QVItemMetadataChange::to(kAll)), NSError());
    EXPECT_EQ(noted(keld, path), kAll);
  }
  keld.write("a", "other contents");
  EXPECT_TRUE(eventually([&] { return keld.record("a")->facts.size == 14; }));
  EXPECT_EQ(noted(keld, "a"), kAll);
  keld.stop();
  keld.start();
  keld.waitForFirstScan();
  EXPECT_EQ(noted(keld, "a"), kAll);
  EXPECT_EQ(noted(keld, "f"), kAll);
  EXPECT_EQ(set(keld, "a", QVItemMetadataChange::to({})), NSError());
  EXPECT_TRUE(noted(keld, "a").isEmpty());
}

}  // namespace droxa::keld
