#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "tessaly/QVErrors.h"
#include "tessaly/QVItemActions.h"
#include "tessaly/QVItemMetadata.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/LogLines.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

constexpr std::int64_t kDate = 1'769'860'800'123'456'789;

// A drive of the fake daemon's with some of its files on the disk.
class ItemActions : public testing::Test {
 protected:
  ItemActions() {
    std::filesystem::create_directories(fake.daemon->url("").path());
    std::ofstream(document.path()) << "x";
    std::filesystem::create_symlink(document.path(), alias.path());
  }
  static QVItemMetadata read(const NSURL &url) {
    QVItemMetadata metadata;
    EXPECT_EQ(QVReadItemAttributes(url.path(), &metadata), 0);
    return metadata;
  }
  ScratchHome home;
  FakeDaemonScope fake;
  const QVFileObjectID documentID = fake.daemon->addDocument("a");
  const QVFileObjectID aliasID = fake.daemon->addAlias("alias");
  const NSURL document = fake.daemon->url("a");
  const NSURL alias = fake.daemon->url("alias");
  const NSURL missing = fake.daemon->url("").URLByAppendingPathComponent("missing");
  const NSFileManager *manager = NSFileManager::defaultManager();
};

}  // namespace

TEST_F(ItemActions, noteOnTheFileWithoutTheDaemon) {
  NSError error;
  EXPECT_TRUE(qv_setTagNames(document, {" Red", "Work", "Red"}, &error));
  qv_setLastOpenDate(manager, NSDate::dateWithNanosecondsSince1970(kDate), document);
  qv_setFavoriteRank(manager, 12, document);
  EXPECT_EQ(read(document), (QVItemMetadata{{"Red", "Work"}, kDate, 12}));
  EXPECT_FALSE(error);
  EXPECT_TRUE(fake.daemon->calls().empty());
}

TEST_F(ItemActions, removeWhatIsSetToNothing) {
  ASSERT_EQ(QVWriteItemAttributes(document.path(), {{{"Red"}}, kDate, 12}), 0);
  qv_setLastOpenDate(manager, NSDate(), document);
  EXPECT_EQ(read(document), (QVItemMetadata{{"Red"}, 0, 12}));
  qv_setFavoriteRank(manager, std::nullopt, document);
  EXPECT_EQ(read(document), (QVItemMetadata{{"Red"}, 0, 0}));
  EXPECT_TRUE(qv_setTagNames(document, {}, nullptr));
  EXPECT_TRUE(read(document).isEmpty());
}

TEST_F(ItemActions, askTheDaemonForWhatALinkCantBear) {
  EXPECT_TRUE(qv_setTagNames(alias, {"Red"}, nullptr));
  qv_setFavoriteRank(manager, 12, alias);
  EXPECT_EQ(fake.daemon->item("alias")->fields().tagData, QVTagDataOfNames({"Red"}));
  EXPECT_EQ(fake.daemon->item("alias")->fields().favoriteRank, 12U);
  EXPECT_TRUE(read(document).isEmpty()) << "the target was changed";
}

TEST_F(ItemActions, askTheDaemonForWhatIsntOnTheDisk) {
  fake.daemon->addDatalessDocument("dataless");
  qv_setFavoriteRank(manager, 12, fake.daemon->url("dataless"));
  EXPECT_EQ(fake.daemon->item("dataless")->fields().favoriteRank, 12U);
}

TEST_F(ItemActions, refuseTagsThatCantBeKept) {
  NSError error;
  EXPECT_FALSE(qv_setTagNames(document, {"Red", "a,b"}, &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorInvalidArgument));
  EXPECT_NE(error.localizedDescription().find("\"a,b\""), std::string::npos);
  EXPECT_TRUE(read(document).isEmpty());
}

TEST_F(ItemActions, tellWhyTagsCouldntBeSet) {
  NSError error;
  EXPECT_FALSE(qv_setTagNames(missing, {"Red"}, &error));
  EXPECT_TRUE(error.is(QVTessalyErrorDomain, QVErrorNoSuchItem)) << error.description();
  error = NSError();
  const NSError unreachable(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  fake.connection->setUnreachable(unreachable);
  EXPECT_FALSE(qv_setTagNames(alias, {"Red"}, &error));
  EXPECT_EQ(error, unreachable);
}

TEST_F(ItemActions, logWhatCouldntBeNotedWithoutAResult) {
  const OSLogCapture log;
  qv_setFavoriteRank(manager, 12, missing);
  qv_setLastOpenDate(manager, NSDate::now(), NSURL());
  const auto lines = logLines(log);
  ASSERT_EQ(lines.size(), 2U);
  EXPECT_EQ(lines[0].rfind("error: [ERROR] can't note the favorite rank of " + missing.absoluteString(), 0),
            0U);
  EXPECT_EQ(lines[1].rfind("error: [ERROR] can't note when (null) was last used", 0), 0U);
}

TEST_F(ItemActions, findWhatStandsForADocument) {
  EXPECT_EQ(qv_physicalURL(document), document);
  std::filesystem::remove(document.path());
  const NSURL promise =
      document.URLByDeletingLastPathComponent().URLByAppendingPathComponent(".a.droxafault");
  std::ofstream(promise.path()) << "droxa promise 1\n";
  EXPECT_EQ(qv_physicalURL(document), promise);
}

}  // namespace droxa
