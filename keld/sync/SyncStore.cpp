#include "keld/sync/SyncStore.h"

#include <iterator>

namespace droxa::keld {

namespace {

constexpr char kTables[] = R"sql(
CREATE TABLE IF NOT EXISTS rows(
  record TEXT PRIMARY KEY,
  item INTEGER NOT NULL,
  tag TEXT NOT NULL,
  parent TEXT NOT NULL,
  name BLOB NOT NULL,
  kind INTEGER NOT NULL,
  size INTEGER NOT NULL,
  modified INTEGER NOT NULL,
  digest TEXT NOT NULL,
  mode INTEGER NOT NULL,
  inode INTEGER NOT NULL,
  localSize INTEGER NOT NULL,
  localModified INTEGER NOT NULL,
  localChanged INTEGER NOT NULL,
  dataless INTEGER NOT NULL,
  newerTag TEXT NOT NULL,
  newerSize INTEGER NOT NULL,
  newerModified INTEGER NOT NULL,
  newerDigest TEXT NOT NULL,
  newerMode INTEGER NOT NULL
) WITHOUT ROWID;
CREATE UNIQUE INDEX IF NOT EXISTS rows_item ON rows(item) WHERE item <> 0;
CREATE INDEX IF NOT EXISTS rows_name ON rows(parent, name);
CREATE INDEX IF NOT EXISTS rows_unbound ON rows(record) WHERE item = 0;
CREATE INDEX IF NOT EXISTS rows_newer ON rows(newerTag) WHERE newerTag <> '';
CREATE TABLE IF NOT EXISTS orphans(record TEXT PRIMARY KEY, parent TEXT NOT NULL) WITHOUT ROWID;
CREATE INDEX IF NOT EXISTS orphans_parent ON orphans(parent);
CREATE TABLE IF NOT EXISTS sent(
  record TEXT NOT NULL,
  digest TEXT NOT NULL,
  PRIMARY KEY(record, digest)
) WITHOUT ROWID;
CREATE TABLE IF NOT EXISTS uploads(
  sequence INTEGER PRIMARY KEY AUTOINCREMENT,
  item INTEGER NOT NULL UNIQUE,
  generation INTEGER NOT NULL,
  attempts INTEGER NOT NULL,
  retry INTEGER NOT NULL,
  deletion INTEGER NOT NULL,
  held INTEGER NOT NULL,
  errorDomain TEXT NOT NULL,
  errorCode INTEGER NOT NULL,
  errorText TEXT NOT NULL
);
CREATE INDEX IF NOT EXISTS uploads_held ON uploads(sequence) WHERE held = 1;
CREATE INDEX IF NOT EXISTS uploads_failed ON uploads(retry) WHERE retry <> 0;
CREATE TABLE IF NOT EXISTS pins(item INTEGER PRIMARY KEY, record TEXT NOT NULL);
CREATE INDEX IF NOT EXISTS pins_record ON pins(record) WHERE record <> '';
CREATE TABLE IF NOT EXISTS meta(key TEXT PRIMARY KEY, value) WITHOUT ROWID;
)sql";

// What the cloud has and this device is about to make.
constexpr char kUnfinished[] = R"sql(
CREATE TABLE unfinished(
  record TEXT PRIMARY KEY,
  parent TEXT NOT NULL,
  name BLOB NOT NULL,
  kind INTEGER NOT NULL
) WITHOUT ROWID;
)sql";

// Deletions that a person asked for; and what users note on items.
constexpr char kMeant[] = R"sql(
CREATE TABLE meant(item INTEGER PRIMARY KEY);
ALTER TABLE rows ADD COLUMN tags TEXT NOT NULL DEFAULT '';
ALTER TABLE rows ADD COLUMN lastUsed INTEGER NOT NULL DEFAULT 0;
ALTER TABLE rows ADD COLUMN favoriteRank INTEGER NOT NULL DEFAULT 0;
)sql";

// Until when the announcement of a deletion stands, in milliseconds since 1970; 0: it was carried out in
// time. Those that were made before say nothing of when.
constexpr char kMeantUntil[] = R"sql(
ALTER TABLE meant ADD COLUMN until INTEGER NOT NULL DEFAULT 1;
)sql";

// Shares. Those that were made before this device looked at them have been passed over, so that everything
// is read once more.
constexpr char kShares[] = R"sql(
CREATE TABLE shares(
  zone TEXT NOT NULL,
  zoneOwner TEXT NOT NULL,
  record TEXT NOT NULL,
  root TEXT NOT NULL,
  owner TEXT NOT NULL,
  PRIMARY KEY(zone, zoneOwner, record)
) WITHOUT ROWID;
CREATE INDEX shares_root ON shares(root);
DELETE FROM meta WHERE key = 'changeToken';
)sql";

// Thumbnails that are still to be made.
constexpr char kThumbnails[] = R"sql(
CREATE TABLE thumbnails(
  record TEXT PRIMARY KEY,
  digest TEXT NOT NULL,
  source BLOB NOT NULL,
  inode INTEGER NOT NULL,
  size INTEGER NOT NULL,
  modified INTEGER NOT NULL
) WITHOUT ROWID;
)sql";

// What a zone of another account needs: what may be done in it, what hangs at its top, and what was refused
// for good.
constexpr char kOthersZones[] = R"sql(
CREATE TABLE accesses(share TEXT PRIMARY KEY, root TEXT NOT NULL, writable INTEGER NOT NULL) WITHOUT ROWID;
CREATE INDEX accesses_root ON accesses(root);
CREATE TABLE tops(record TEXT PRIMARY KEY, parent TEXT NOT NULL) WITHOUT ROWID;
CREATE INDEX tops_parent ON tops(parent);
ALTER TABLE uploads ADD COLUMN refused INTEGER NOT NULL DEFAULT 0;
)sql";

// Each step leads from the version of its place to the next; version 0 is an empty database.
constexpr const char *kSteps[] = {kTables, kUnfinished, kMeant,      kMeantUntil,
                                  kShares, kThumbnails, kOthersZones};

}  // namespace

SyncStore::SyncStore(const std::string &path) : database_(path, SqlDatabase::Access::readWrite, 8192) {
  const RecursiveLock lock(mutex_);
  database_.execute("PRAGMA journal_mode = WAL");
  // What was acknowledged to a person or to the cloud stays known through a power cut.
  database_.execute("PRAGMA synchronous = NORMAL");
  const std::int64_t version = database_.integer("PRAGMA user_version");
  const auto newest = static_cast<std::int64_t>(std::size(kSteps));
  if (version > newest)
    throw SqlError(
        0, path + ": was written by a newer version (" + std::to_string(version) + "). Update this program.");
  if (version == newest) return;
  SqlTransaction transaction(database_);
  for (auto step = static_cast<std::size_t>(version); step < std::size(kSteps); ++step)
    database_.execute(kSteps[step]);
  database_.execute("PRAGMA user_version = " + std::to_string(newest));
  transaction.commit();
}

void SyncStore::transaction(const std::function<void()> &work) {
  const RecursiveLock lock(mutex_);
  if (depth_ > 0) return work();
  struct Depth {
    int &depth;
    explicit Depth(int &counter) : depth(counter) { ++depth; }
    ~Depth() { --depth; }
  };
  SqlTransaction transaction(database_);
  {
    const Depth inside(depth_);
    work();
  }
  transaction.commit();
}

SqlStatement &SyncStore::statement(const char *sql) {
  auto &kept = statements_[sql];
  if (!kept) kept = std::make_unique<SqlStatement>(database_.handle(), sql);
  kept->reset();
  return *kept;
}

// --- Numbers and texts.

std::uint64_t SyncStore::count(const char *sql) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement(sql);
  const std::uint64_t number = asked.step() ? asked.number(0) : 0;
  asked.reset();
  return number;
}

std::uint64_t SyncStore::number(const char *key) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT value FROM meta WHERE key = ?");
  asked.bindText(1, key);
  const std::uint64_t value = asked.step() ? asked.number(0) : 0;
  asked.reset();
  return value;
}

void SyncStore::setNumber(const char *key, std::uint64_t value) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO meta VALUES (?, ?)").bindText(1, key).bind(2, value).run();
}

std::string SyncStore::text(const char *key) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT value FROM meta WHERE key = ?");
  asked.bindText(1, key);
  std::string value;
  if (asked.step()) value = asked.bytes(0);
  asked.reset();
  return value;
}

void SyncStore::setText(const char *key, std::string_view value) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO meta VALUES (?, ?)").bindText(1, key).bindBlob(2, value).run();
}

}  // namespace droxa::keld
