#include "platform/cloudkit/embedded/Schema.h"

#include "platform/foundation/UUID.h"

namespace droxa::embedded {
namespace {

// accounts.used   bytes of assets that the account's records refer to, each record's counted
// zones.seq       the number of the zone's last change; a number is given inside the transaction that writes
// records         one row a record; a deleted one stays as a row without fields, for the feed of changes
// record_assets   which contents a record refers to
// assets.touched  seconds since 1970; when it was uploaded or referred to last
constexpr char kTables[] = R"(
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
)";

}  // namespace

void ConfigureConnection(SqlDatabase &database) {
  // FULL: what a commit acknowledged survives the loss of power, too.
  database.execute(
      "PRAGMA journal_mode = WAL; PRAGMA synchronous = FULL; PRAGMA cache_size = -8192;"
      "PRAGMA temp_store = MEMORY; PRAGMA journal_size_limit = 67108864");
}

void CreateTables(SqlDatabase &database) {
  database.execute(kTables);
  const UUID uuid = UUID::generate();
  database.use("INSERT INTO cloud (uuid) VALUES (?)")
      .bind(std::string_view(reinterpret_cast<const char *>(uuid.bytes.data()), uuid.bytes.size()))
      .run();
}

}  // namespace droxa::embedded
