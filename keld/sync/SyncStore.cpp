#include "keld/sync/SyncStore.h"

#include <utility>

namespace droxa::keld {

namespace {

constexpr std::int64_t kLongestDelay = 3'600'000;  // milliseconds

constexpr char kSchema[] = R"sql(
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
PRAGMA user_version = 1;
)sql";

#define ROW_COLUMNS                                                                                        \
  "record, item, tag, parent, name, kind, size, modified, digest, mode, inode, localSize, localModified, " \
  "localChanged, dataless, newerTag, newerSize, newerModified, newerDigest, newerMode"
#define UPLOAD_COLUMNS \
  "sequence, item, generation, attempts, deletion, held, errorDomain, errorCode, errorText"

}  // namespace

SyncStore::SyncStore(const std::string &path) : database_(path, SqlDatabase::Access::readWrite, 8192) {
  const RecursiveLock lock(mutex_);
  database_.execute("PRAGMA journal_mode = WAL");
  // What was acknowledged to a person or to the cloud stays known through a power cut.
  database_.execute("PRAGMA synchronous = NORMAL");
  const std::int64_t version = database_.integer("PRAGMA user_version");
  if (version > 1)
    throw SqlError(
        0, path + ": was written by a newer version (" + std::to_string(version) + "). Update this program.");
  database_.execute(kSchema);
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

// --- Rows.

SyncRow SyncStore::read(const SqlStatement &row) {
  SyncRow result;
  result.record = row.bytes(0);
  result.item = row.number(1);
  result.tag = row.bytes(2);
  result.parent = row.bytes(3);
  result.name = row.bytes(4);
  result.kind = static_cast<NSFileProviderItemKind>(row.integer(5));
  result.content.size = row.number(6);
  result.content.modified = row.integer(7);
  result.content.digest = row.bytes(8);
  result.content.mode = static_cast<std::uint32_t>(row.integer(9));
  result.local = {row.number(10), row.number(11), row.integer(12), row.integer(13)};
  result.isDataless = row.integer(14) != 0;
  result.newerTag = row.bytes(15);
  result.newer.size = row.number(16);
  result.newer.modified = row.integer(17);
  result.newer.digest = row.bytes(18);
  result.newer.mode = static_cast<std::uint32_t>(row.integer(19));
  return result;
}

std::optional<SyncRow> SyncStore::one(SqlStatement &asked) {
  std::optional<SyncRow> row;
  if (asked.step()) row = read(asked);
  asked.reset();
  return row;
}

std::vector<SyncRow> SyncStore::all(SqlStatement &asked) {
  std::vector<SyncRow> rows;
  while (asked.step()) rows.push_back(read(asked));
  asked.reset();
  return rows;
}

std::optional<SyncRow> SyncStore::byRecord(const std::string &record) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE record = ?");
  asked.bindText(1, record);
  return one(asked);
}

std::optional<SyncRow> SyncStore::byItem(ItemNumber item) {
  if (item == 0) return std::nullopt;
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE item = ? AND item <> 0");
  asked.bind(1, item);
  return one(asked);
}

std::optional<SyncRow> SyncStore::byName(const std::string &parent, const std::string &name) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE parent = ? AND name = ?");
  asked.bindText(1, parent).bindBlob(2, name);
  return one(asked);
}

std::vector<SyncRow> SyncStore::childrenOf(const std::string &parent, std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE parent = ? LIMIT ?");
  asked.bindText(1, parent).bind(2, limit);
  return all(asked);
}

std::optional<SyncRow> SyncStore::byNewerTag(const std::string &tag) {
  if (tag.empty()) return std::nullopt;
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE newerTag = ? AND newerTag <> ''");
  asked.bindText(1, tag);
  return one(asked);
}

std::vector<SyncRow> SyncStore::unbound(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE item = 0 AND tag <> '' LIMIT ?");
  asked.bind(1, limit);
  return all(asked);
}

std::vector<SyncRow> SyncStore::withNewerVersion(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " ROW_COLUMNS " FROM rows WHERE newerTag <> '' LIMIT ?");
  asked.bind(1, limit);
  return all(asked);
}

void SyncStore::put(const SyncRow &row) {
  const RecursiveLock lock(mutex_);
  if (row.item != 0) {
    SqlStatement &unbind = statement("UPDATE rows SET item = 0 WHERE item = ? AND item <> 0 AND record <> ?");
    unbind.bind(1, row.item).bindText(2, row.record);
    unbind.run();
    statement("UPDATE OR REPLACE pins SET item = ?, record = '' WHERE record = ? AND record <> ''")
        .bind(1, row.item)
        .bindText(2, row.record)
        .run();
  }
  SqlStatement &put = statement(
      "INSERT INTO rows(" ROW_COLUMNS
      ") VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15, ?16, ?17, ?18, ?19, ?20)"
      " ON CONFLICT(record) DO UPDATE SET item = ?2, tag = ?3, parent = ?4, name = ?5, kind = ?6, size = ?7,"
      " modified = ?8, digest = ?9, mode = ?10, inode = ?11, localSize = ?12, localModified = ?13,"
      " localChanged = ?14, dataless = ?15, newerTag = ?16, newerSize = ?17, newerModified = ?18,"
      " newerDigest = ?19, newerMode = ?20");
  put.bindText(1, row.record).bind(2, row.item).bindText(3, row.tag).bindText(4, row.parent);
  put.bindBlob(5, row.name).bind(6, static_cast<std::int64_t>(row.kind));
  put.bind(7, row.content.size).bind(8, row.content.modified).bindText(9, row.content.digest);
  put.bind(10, static_cast<std::int64_t>(row.content.mode)).bind(11, row.local.inode);
  put.bind(12, row.local.size).bind(13, row.local.modified).bind(14, row.local.changed);
  put.bind(15, static_cast<std::int64_t>(row.isDataless)).bindText(16, row.newerTag);
  put.bind(17, row.newer.size).bind(18, row.newer.modified).bindText(19, row.newer.digest);
  put.bind(20, static_cast<std::int64_t>(row.newer.mode));
  put.run();
}

void SyncStore::erase(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM rows WHERE record = ?").bindText(1, record).run();
}

std::uint64_t SyncStore::countRows() {
  return count("SELECT count(*) FROM rows");
}

std::vector<std::string> SyncStore::recordsInCloud() {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT record FROM rows WHERE tag <> ''");
  std::vector<std::string> records;
  while (asked.step()) records.emplace_back(asked.bytes(0));
  asked.reset();
  return records;
}

void SyncStore::unbindAll() {
  const RecursiveLock lock(mutex_);
  transaction([this]() NO_THREAD_SAFETY_ANALYSIS {
    // A pin waits under its record until that has an item again; the negative numbers are no items.
    database_.execute(
        "UPDATE pins SET record = (SELECT record FROM rows WHERE rows.item = pins.item), item = -1 - item"
        " WHERE record = '' AND EXISTS (SELECT 1 FROM rows WHERE rows.item = pins.item AND rows.item <> 0)");
    database_.execute("DELETE FROM pins WHERE record = ''");
    database_.execute("DELETE FROM rows WHERE tag = '' AND item <> 0");
    database_.execute("UPDATE rows SET item = 0");
    database_.execute("DELETE FROM uploads");
  });
}

std::vector<std::string> SyncStore::unboundInCloud() {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT record FROM rows WHERE item = 0 AND tag <> ''");
  std::vector<std::string> records;
  while (asked.step()) records.emplace_back(asked.bytes(0));
  asked.reset();
  return records;
}

std::vector<SyncRow> SyncStore::datalessRows() {
  const RecursiveLock lock(mutex_);
  return all(statement("SELECT " ROW_COLUMNS " FROM rows WHERE dataless = 1 AND item <> 0"));
}

// --- Saves whose outcome isn't known.

void SyncStore::noteSent(const std::string &record, const std::string &digest) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO sent VALUES (?, ?)").bindText(1, record).bindText(2, digest).run();
}

void SyncStore::forgetSent(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM sent WHERE record = ?").bindText(1, record).run();
}

bool SyncStore::wasSent(const std::string &record, const std::string &digest) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT 1 FROM sent WHERE record = ? AND digest = ?");
  asked.bindText(1, record).bindText(2, digest);
  const bool found = asked.step();
  asked.reset();
  return found;
}

// --- Orphans.

void SyncStore::keepOrphan(const std::string &record, const std::string &parent) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO orphans VALUES (?, ?)").bindText(1, record).bindText(2, parent).run();
}

void SyncStore::dropOrphan(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM orphans WHERE record = ?").bindText(1, record).run();
}

void SyncStore::fetchAgain(const std::string &record) {
  keepOrphan(record, "");
}

std::uint64_t SyncStore::fetchOrphansOf(const std::string &parent) {
  const RecursiveLock lock(mutex_);
  const std::uint64_t before = countToFetch();
  statement("UPDATE orphans SET parent = '' WHERE parent = ?").bindText(1, parent).run();
  return countToFetch() - before;
}

std::vector<std::string> SyncStore::toFetch(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT record FROM orphans WHERE parent = '' LIMIT ?");
  asked.bind(1, limit);
  std::vector<std::string> records;
  while (asked.step()) records.emplace_back(asked.bytes(0));
  asked.reset();
  return records;
}

void SyncStore::fetched(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM orphans WHERE record = ? AND parent = ''").bindText(1, record).run();
}

std::uint64_t SyncStore::countToFetch() {
  return count("SELECT count(*) FROM orphans WHERE parent = ''");
}

std::uint64_t SyncStore::countOrphans() {
  return count("SELECT count(*) FROM orphans WHERE parent <> ''");
}

// --- Uploads.

QueuedUpload SyncStore::readQueued(const SqlStatement &row) {
  QueuedUpload upload;
  upload.sequence = row.integer(0);
  upload.item = row.number(1);
  upload.generation = row.integer(2);
  upload.attempts = row.integer(3);
  upload.isDeletion = row.integer(4) != 0;
  upload.isHeld = row.integer(5) != 0;
  const std::string domain(row.bytes(6));
  const std::string text(row.bytes(8));
  if (!domain.empty()) upload.error = NSError(domain, row.integer(7), {{NSLocalizedDescriptionKey, text}});
  return upload;
}

std::vector<QueuedUpload> SyncStore::queuedOf(SqlStatement &asked) {
  std::vector<QueuedUpload> uploads;
  while (asked.step()) uploads.push_back(readQueued(asked));
  asked.reset();
  return uploads;
}

void SyncStore::enqueue(ItemNumber item, bool isDeletion, bool isHeld, std::int64_t notBefore) {
  const RecursiveLock lock(mutex_);
  statement(
      "INSERT INTO uploads(item, generation, attempts, retry, deletion, held, errorDomain, errorCode, "
      "errorText)"
      " VALUES (?1, 1, 0, ?4, ?2, ?3, '', 0, '') ON CONFLICT(item) DO UPDATE SET generation = generation + 1,"
      " attempts = 0, retry = ?4, deletion = ?2, held = ?3, errorDomain = '', errorCode = 0, errorText = ''")
      .bind(1, item)
      .bind(2, static_cast<std::int64_t>(isDeletion))
      .bind(3, static_cast<std::int64_t>(isHeld))
      .bind(4, notBefore)
      .run();
}

std::optional<QueuedUpload> SyncStore::queued(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " UPLOAD_COLUMNS " FROM uploads WHERE item = ?");
  asked.bind(1, item);
  auto uploads = queuedOf(asked);
  if (uploads.empty()) return std::nullopt;
  return std::move(uploads.front());
}

std::vector<QueuedUpload> SyncStore::due(std::int64_t now, std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " UPLOAD_COLUMNS
                                  " FROM uploads WHERE held = 0 AND (retry <= ?1 OR retry > ?2)"
                                  " ORDER BY sequence LIMIT ?3");
  // Nothing is put off for so long: the clock was put back.
  asked.bind(1, now).bind(2, now + kLongestDelay).bind(3, limit);
  return queuedOf(asked);
}

std::vector<QueuedUpload> SyncStore::allQueued(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT " UPLOAD_COLUMNS " FROM uploads ORDER BY sequence LIMIT ?");
  asked.bind(1, limit);
  return queuedOf(asked);
}

std::vector<QueuedUpload> SyncStore::held(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked =
      statement("SELECT " UPLOAD_COLUMNS " FROM uploads WHERE held = 1 ORDER BY sequence LIMIT ?");
  asked.bind(1, limit);
  return queuedOf(asked);
}

std::optional<std::int64_t> SyncStore::nextRetry() {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT min(retry) FROM uploads WHERE retry <> 0 AND held = 0");
  std::optional<std::int64_t> next;
  if (asked.step() && asked.integer(0) != 0) next = asked.integer(0);
  asked.reset();
  return next;
}

void SyncStore::uploaded(const QueuedUpload &upload) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM uploads WHERE item = ? AND generation = ?")
      .bind(1, upload.item)
      .bind(2, upload.generation)
      .run();
}

void SyncStore::dropQueued(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM uploads WHERE item = ?").bind(1, item).run();
}

void SyncStore::uploadFailed(const QueuedUpload &upload, const NSError &error, std::int64_t retry) {
  const RecursiveLock lock(mutex_);
  statement(
      "UPDATE uploads SET attempts = attempts + (?2 <> ''), retry = ?1, errorDomain = ?2, errorCode = ?3,"
      " errorText = ?4 WHERE item = ?5 AND generation = ?6")
      .bind(1, retry)
      .bindText(2, error.domain())
      .bind(3, error.code())
      .bindText(4, error.localizedDescription())
      .bind(5, upload.item)
      .bind(6, upload.generation)
      .run();
}

void SyncStore::retryNow(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET retry = 0 WHERE item = ?").bind(1, item).run();
}

void SyncStore::retryAllNow() {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET retry = 0 WHERE retry <> 0 AND deletion = 0").run();
}

std::uint64_t SyncStore::countQueued() {
  return count("SELECT count(*) FROM uploads WHERE held = 0");
}
std::uint64_t SyncStore::countFailed() {
  return count("SELECT count(*) FROM uploads WHERE errorDomain <> ''");
}
std::uint64_t SyncStore::countHeld() {
  return count("SELECT count(*) FROM uploads WHERE held = 1");
}

std::uint64_t SyncStore::countDeletions() {
  return count("SELECT count(*) FROM uploads WHERE deletion = 1");
}

void SyncStore::holdDeletions() {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET held = 1 WHERE deletion = 1").run();
}

void SyncStore::releaseHeld() {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET held = 0 WHERE held = 1").run();
}

// --- Pins.

void SyncStore::setPinned(ItemNumber item, bool isPinned) {
  const RecursiveLock lock(mutex_);
  statement(isPinned ? "INSERT OR IGNORE INTO pins VALUES (?, '')" : "DELETE FROM pins WHERE item = ?")
      .bind(1, item)
      .run();
}

bool SyncStore::isPinned(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT 1 FROM pins WHERE item = ?");
  asked.bind(1, item);
  const bool found = asked.step();
  asked.reset();
  return found;
}

std::vector<ItemNumber> SyncStore::pins() {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT item FROM pins WHERE item > 0");
  std::vector<ItemNumber> items;
  while (asked.step()) items.push_back(asked.number(0));
  asked.reset();
  return items;
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
