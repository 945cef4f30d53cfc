#include "platform/cloudkit/embedded/Schema.h"

#include "platform/cloudkit/embedded/RandomBytes.h"
#include "platform/foundation/UUID.h"

namespace droxa::embedded {
namespace {

// The tables of the first version; kSharing makes this version's of them.
//
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

// cloud.key         signs the tokens of shares
// zones.shares      how many shares the zone has; without any, nothing below says a word of the zone
// shares            where a share and its root are; the share itself is the record. Kept as the record says
// share_access      who sees what is shared: participants that have accepted it, with their permission
// hierarchy         the live records of zones with shares, but for the shares themselves, and their parents
// views             an account's feed of another's zone: the number of its last change
// view_records      what was told in it: the record's last change there, and whether the account sees it.
//                   Of a record that it doesn't see any more, the type and the device are those of that
//                   moment
// uploads           which account uploaded contents: it may refer to them before any record does
constexpr char kSharing[] = R"(
ALTER TABLE cloud ADD COLUMN key BLOB;
ALTER TABLE accounts ADD COLUMN display BLOB NOT NULL DEFAULT x'';
ALTER TABLE accounts ADD COLUMN handle BLOB;
CREATE UNIQUE INDEX accounts_by_handle ON accounts (handle);
ALTER TABLE zones ADD COLUMN shares INTEGER NOT NULL DEFAULT 0;
CREATE TABLE shares (
  id INTEGER PRIMARY KEY AUTOINCREMENT, zone INTEGER NOT NULL, record BLOB NOT NULL, root BLOB NOT NULL,
  url BLOB NOT NULL UNIQUE, UNIQUE (zone, record), UNIQUE (zone, root));
CREATE TABLE share_access (
  share INTEGER NOT NULL, account INTEGER NOT NULL, permission INTEGER NOT NULL, PRIMARY KEY (share, account))
  WITHOUT ROWID;
CREATE INDEX share_access_by_account ON share_access (account);
CREATE TABLE hierarchy (
  zone INTEGER NOT NULL, record BLOB NOT NULL, parent BLOB NOT NULL, PRIMARY KEY (zone, record)) WITHOUT ROWID;
CREATE INDEX hierarchy_by_parent ON hierarchy (zone, parent);
CREATE TABLE views (
  id INTEGER PRIMARY KEY AUTOINCREMENT, account INTEGER NOT NULL, zone INTEGER NOT NULL,
  seq INTEGER NOT NULL DEFAULT 0, UNIQUE (account, zone));
CREATE INDEX views_by_zone ON views (zone);
CREATE TABLE view_records (
  view INTEGER NOT NULL, record BLOB NOT NULL, seq INTEGER NOT NULL, visible INTEGER NOT NULL,
  type BLOB NOT NULL, device BLOB NOT NULL, session INTEGER NOT NULL, PRIMARY KEY (view, record));
CREATE UNIQUE INDEX view_records_by_seq ON view_records (view, seq);
CREATE TABLE uploads (asset BLOB NOT NULL, account INTEGER NOT NULL, PRIMARY KEY (asset, account)) WITHOUT ROWID;
INSERT INTO uploads SELECT digest, accounts.id FROM assets, accounts
  WHERE NOT EXISTS (SELECT 1 FROM record_assets WHERE asset = digest);
PRAGMA user_version = 2;
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

void UpgradeTables(SqlDatabase &database) {
  {
    SqlUse version = database.use("PRAGMA user_version");
    if (!version.step() || version.integer(0) != kOldestFormat) return;
  }
  database.execute(kSharing);
  database.use("UPDATE cloud SET key = ?").bind(RandomBytes(32)).run();
}

}  // namespace droxa::embedded
