// The database file: its versions, its damage, its reader connections.

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>

#include "keld/ItemEdits.h"
#include "keld/ItemQueries.h"
#include "keld/ReaderPool.h"
#include "keld/Schema.h"
#include "tests/support/ScratchHome.h"

namespace droxa::keld {

namespace {

class Database : public testing::Test {
 protected:
  std::string path() const { return DroxaHome(home.root()).state() + "/keld.sqlite"; }
  ScratchHome home;
};

}  // namespace

TEST_F(Database, isMadeWithTheNewestSchema) {
  const OpenedDatabase opened = DatabaseOpen(path());
  EXPECT_TRUE(opened.isNew);
  EXPECT_EQ(opened.database->integer("PRAGMA user_version"), static_cast<std::int64_t>(SchemaSteps().size()));
  EXPECT_EQ(opened.database->text("PRAGMA journal_mode"), "wal");
  EXPECT_EQ(opened.database->text("SELECT value FROM meta WHERE key = 'uuid'").size(), 36U);
}

TEST_F(Database, isLeftAsItIsWhenItIsUpToDate) {
  const std::string uuid = DatabaseOpen(path()).database->text("SELECT value FROM meta WHERE key = 'uuid'");
  const OpenedDatabase again = DatabaseOpen(path());
  EXPECT_FALSE(again.isNew);
  EXPECT_EQ(again.database->text("SELECT value FROM meta WHERE key = 'uuid'"), uuid);
}

TEST_F(Database, ofANewerVersionIsRefused) {
  DatabaseOpen(path()).database->execute("PRAGMA user_version = 1000");
  try {
    (void)DatabaseOpen(path());
    FAIL() << "it was opened";
  } catch (const SchemaTooNew &error) {
    EXPECT_NE(std::string(error.what()).find(path() + ": was written by a newer version (schema 1000"),
              std::string::npos)
        << error.what();
  }
  EXPECT_TRUE(std::filesystem::exists(path()));
}

TEST_F(Database, thatIsDamagedIsMovedAsideAndMadeAnew) {
  std::ofstream(path(), std::ios::binary) << std::string(10000, 'x');
  const OpenedDatabase opened = DatabaseOpen(path());
  EXPECT_TRUE(std::filesystem::exists(opened.damagedCopy));
  EXPECT_EQ(opened.database->integer("SELECT count(*) FROM items"), 0);
}

TEST_F(Database, whoseDamageWasMetInUseIsMovedAsideAtTheNextStart) {
  (void)DatabaseOpen(path());
  DatabaseMarkDamaged(path());
  EXPECT_FALSE(DatabaseOpen(path()).damagedCopy.empty());
  EXPECT_TRUE(DatabaseOpen(path()).damagedCopy.empty());
}

TEST_F(Database, readersSeeOneMoment) {
  const OpenedDatabase opened = DatabaseOpen(path());
  ItemEdits edits(*opened.database);
  ReaderPool readers(path());
  readers.read([&](ItemQueries &queries) {
    EXPECT_FALSE(queries.byName(7, "a"));
    ItemRecord record;
    record.parent = 7;
    record.name = "a";
    edits.insert(record);
    EXPECT_FALSE(queries.byName(7, "a"));
  });
  readers.read([](ItemQueries &queries) { EXPECT_TRUE(queries.byName(7, "a")); });
}

TEST_F(Database, numbersAreNeverUsedAgain) {
  ItemNumber last = 0;
  for (int run = 0; run < 3; ++run) {
    const OpenedDatabase opened = DatabaseOpen(path());
    ItemEdits edits(*opened.database);
    ItemRecord record;
    record.parent = 7;
    record.name = "a";
    edits.insert(record);
    EXPECT_GT(record.id, last);
    last = record.id;
    edits.remove(record, true);
    edits.writeCounters();
  }
}

TEST_F(Database, forgetsTheOldestDeathsAboveALimit) {
  const OpenedDatabase opened = DatabaseOpen(path());
  ItemEdits edits(*opened.database);
  for (int i = 0; i < 100; ++i) {
    ItemRecord record;
    record.parent = 7;
    record.name = std::to_string(i);
    edits.insert(record);
    edits.remove(record, true);
  }
  edits.compactTombstones(40);
  EXPECT_LE(opened.database->integer("SELECT count(*) FROM tombstones"), 40);
  EXPECT_GT(edits.counters().tombstoneFloor, 0U);
  EXPECT_EQ(opened.database->integer("SELECT count(*) FROM tombstones WHERE rank <= " +
                                     std::to_string(edits.counters().tombstoneFloor)),
            0);
}

}  // namespace droxa::keld
