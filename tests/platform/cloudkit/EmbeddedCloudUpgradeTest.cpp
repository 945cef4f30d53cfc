#include <filesystem>
#include <sqlite3.h>
#include <thread>

#include "platform/cloudkit/embedded/RecordCoding.h"
#include "platform/cloudkit/embedded/Schema.h"
#include "tests/platform/cloudkit/EmbeddedWorld.h"
#include "tests/platform/cloudkit/contract/ShareCalls.h"

namespace droxa::contract {
namespace {

// The tables as the first version made them.
constexpr char kFirstFormat[] = R"(
CREATE TABLE cloud (uuid BLOB NOT NULL);
CREATE TABLE accounts (
  id INTEGER PRIMARY KEY AUTOINCREMENT, name BLOB NOT NULL UNIQUE, quota INTEGER, used INTEGER NOT NULL DEFAULT 0);
CREATE TABLE zones (
  id INTEGER PRIMARY KEY AUTOINCREMENT, account INTEGER NOT NULL, name BLOB NOT NULL,
  seq INTEGER NOT NULL DEFAULT 0, session INTEGER NOT NULL, UNIQUE (account, name));
CREATE TABLE records (
  zone INTEGER NOT NULL, name BLOB NOT NULL, seq INTEGER NOT NULL, type BLOB NOT NULL, tag BLOB NOT NULL,
  time INTEGER NOT NULL, device BLOB NOT NULL, session INTEGER NOT NULL, deleted INTEGER NOT NULL,
  fields BLOB NOT NULL, PRIMARY KEY (zone, name));
CREATE UNIQUE INDEX records_by_seq ON records (zone, seq);
CREATE TABLE record_assets (
  zone INTEGER NOT NULL, record BLOB NOT NULL, asset BLOB NOT NULL, size INTEGER NOT NULL,
  PRIMARY KEY (zone, record, asset)) WITHOUT ROWID;
CREATE INDEX record_assets_by_asset ON record_assets (asset);
CREATE TABLE assets (digest BLOB NOT NULL PRIMARY KEY, size INTEGER NOT NULL, touched INTEGER NOT NULL);
CREATE TABLE pieces (
  asset BLOB NOT NULL, number INTEGER NOT NULL, start INTEGER NOT NULL, chunk BLOB NOT NULL,
  size INTEGER NOT NULL, PRIMARY KEY (asset, number)) WITHOUT ROWID;
CREATE INDEX pieces_by_chunk ON pieces (chunk);
PRAGMA user_version = 1;
INSERT INTO cloud VALUES (x'00112233445566778899aabbccddeeff');
INSERT INTO accounts (name, quota, used) VALUES (CAST('alice' AS BLOB), 1000, 5), (CAST('bob' AS BLOB), NULL, 0);
INSERT INTO zones (account, name, seq, session) VALUES (1, CAST('documents' AS BLOB), 3, 7);
INSERT INTO assets VALUES (CAST('2cf24dba5fb0a30e26e83b2ac5b9e29e1b161e5c1fa7425e73043362938b9824' AS BLOB), 5, 9);
INSERT INTO record_assets VALUES (1, CAST('a' AS BLOB),
  CAST('2cf24dba5fb0a30e26e83b2ac5b9e29e1b161e5c1fa7425e73043362938b9824' AS BLOB), 5);
INSERT INTO assets VALUES (CAST('486ea46224d1bb4fb680f34f7c9ad96a8f24ec88be73ea8e5a6c65260e9cb8a7' AS BLOB), 5, 9);
)";
const CKAssetReference kHello{5, "2cf24dba5fb0a30e26e83b2ac5b9e29e1b161e5c1fa7425e73043362938b9824"};
const CKAssetReference kWorld{5, "486ea46224d1bb4fb680f34f7c9ad96a8f24ec88be73ea8e5a6c65260e9cb8a7"};

// A cloud as the first version left it: folder/a, where a refers to contents.
class EmbeddedCloudUpgrade : public testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::create_directories(world.folder());
    ASSERT_EQ(sqlite3_open((world.folder() + "/cloud.sqlite").c_str(), &database), SQLITE_OK);
    ASSERT_EQ(sqlite3_exec(database, kFirstFormat, nullptr, nullptr, nullptr), SQLITE_OK)
        << sqlite3_errmsg(database);
    put(1, child("folder", ""));
    CKRecord a = child("a", "folder");
    a.fields["contents"] = CKAsset::assetWithReference(kHello);
    put(2, a);
    put(3, item("outside"));
    sqlite3_close(database);
  }
  void put(int seq, const CKRecord &record) {
    const std::string fields = embedded::EncodeFields(record.fields);
    sqlite3_stmt *insert = nullptr;
    ASSERT_EQ(sqlite3_prepare_v2(database,
                                 "INSERT INTO records VALUES (1, ?, ?, CAST('Item' AS BLOB), x'41', 0,"
                                 " CAST('old' AS BLOB), 7, 0, ?)",
                                 -1, &insert, nullptr),
              SQLITE_OK);
    const std::string &name = record.recordID.recordName;
    sqlite3_bind_blob(insert, 1, name.data(), static_cast<int>(name.size()), SQLITE_STATIC);
    sqlite3_bind_int(insert, 2, seq);
    sqlite3_bind_blob(insert, 3, fields.data(), static_cast<int>(fields.size()), SQLITE_STATIC);
    EXPECT_EQ(sqlite3_step(insert), SQLITE_DONE) << sqlite3_errmsg(database);
    sqlite3_finalize(insert);
  }

  EmbeddedWorld world;
  sqlite3 *database = nullptr;
};

TEST_F(EmbeddedCloudUpgrade, whatAnEarlierVersionLeftIsThereAndCanBeShared) {
  const auto alice = world.openEmbedded("one", "alice");
  EXPECT_EQ(alice->cloudIdentifier().description(), "00112233-4455-6677-8899-AABBCCDDEEFF");
  EXPECT_EQ(changes(*alice).changedRecords.size(), 3U);
  EXPECT_EQ(alice->usage(patiently()).bytes, 5U);
  EXPECT_EQ(alice->usage(patiently()).quota, 1000U);
  const auto bob = world.openAs("bob", "two");
  const CKShare share = saveShare(*alice, shareOf("folder", {named("bob")}));
  EXPECT_OK(bob->acceptShare(share.URL, patiently()).error);
  EXPECT_EQ(changedNames(changesAtAlices(*bob->sharedDatabase())),
            (NameSet{"folder", "a", "share of folder"}));
  EXPECT_OK(alice->shareTokens(item("a").recordID, patiently()).error);
}

TEST_F(EmbeddedCloudUpgrade, contentsStayForThoseWhoReferToThemAndThoseOfNobodyForAll) {
  const auto alice = world.openAs("alice", "one");
  const auto bob = world.openAs("bob", "two");
  EXPECT_OK(bob->saveZone(kZone, patiently()));
  CKRecord record = item("b");
  record.fields["contents"] = CKAsset::assetWithReference(kWorld);
  EXPECT_OK(saveError(*bob, record));
  record = item("c");
  record.fields["contents"] = CKAsset::assetWithReference(kHello);
  EXPECT_CODE(saveError(*bob, record), assetFileNotFound);
  EXPECT_OK(saveError(*alice, record));
}

TEST_F(EmbeddedCloudUpgrade, manyWhoOpenItAtOnceUpgradeItOnce) {
  std::vector<std::thread> openers;
  for (int i = 0; i < 6; ++i) {
    openers.emplace_back([&, i] {
      const auto cloud = world.openAs("alice", "device " + std::to_string(i));
      ASSERT_TRUE(cloud);
      EXPECT_EQ(changes(*cloud).changedRecords.size(), 3U);
    });
  }
  for (std::thread &opener : openers) opener.join();
}

TEST_F(EmbeddedCloudUpgrade, anOldCloudThatComesIntoThePlaceOfAnOpenOneIsUpgradedToo) {
  const std::string file = world.folder() + "/cloud.sqlite";
  std::filesystem::rename(file, world.folder() + "/old");
  const auto alice = world.openAs("alice", "one");
  EXPECT_OK(alice->saveZone(kZone, patiently()));
  for (const char *suffix : {"-wal", "-shm"}) std::filesystem::remove(file + suffix);
  std::filesystem::rename(world.folder() + "/old", file);
  EXPECT_EQ(changes(*alice).changedRecords.size(), 3U);
  EXPECT_OK(saveShareError(*alice, shareOf("folder")));
}

TEST_F(EmbeddedCloudUpgrade, aLaterVersionsCloudIsLeftAlone) {
  const std::string file = world.folder() + "/cloud.sqlite";
  ASSERT_EQ(sqlite3_open(file.c_str(), &database), SQLITE_OK);
  const std::string later = "PRAGMA user_version = " + std::to_string(embedded::kFormat + 1);
  ASSERT_EQ(sqlite3_exec(database, later.c_str(), nullptr, nullptr, nullptr), SQLITE_OK);
  sqlite3_close(database);
  NSError error;
  EXPECT_FALSE(EmbeddedCloud::open(world.folder(), "alice", "one", &error));
  EXPECT_CODE(error, internalError);
}

TEST(EmbeddedCloudIdentity, aHandleIsOfOneAccountAlone) {
  EmbeddedWorld world;
  const auto alice = world.openEmbedded("one", "alice");
  const auto bob = world.openEmbedded("two", "bob");
  EXPECT_OK(alice->setUserIdentity("Alice", "a@droxa.test", patiently()));
  EXPECT_OK(alice->setUserIdentity("Alice A.", "a@droxa.test", patiently()));
  EXPECT_CODE(bob->setUserIdentity("Bob", "a@droxa.test", patiently()), invalidArguments);
  EXPECT_CODE(bob->setUserIdentity("Bob", "alice", patiently()), invalidArguments);
  EXPECT_CODE(bob->setUserIdentity(std::string(300, 'x'), "", patiently()), invalidArguments);
  EXPECT_OK(bob->setUserIdentity("Bob", "", patiently()));
  EXPECT_OK(world.openEmbedded("three", "eve")->setUserIdentity("Eve", "", patiently()));
  NSError error;
  EXPECT_FALSE(EmbeddedCloud::open(world.folder(), "a@droxa.test", "four", &error));
  EXPECT_CODE(error, invalidArguments);
}

}  // namespace
}  // namespace droxa::contract
