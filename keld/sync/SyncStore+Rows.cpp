// What is known of the records, and which of them are to be asked for or made.

#include <utility>

#include "keld/sync/SyncStore.h"

namespace droxa::keld {

namespace {

#define ROW_COLUMNS                                                                                        \
  "record, item, tag, parent, name, kind, size, modified, digest, mode, inode, localSize, localModified, " \
  "localChanged, dataless, newerTag, newerSize, newerModified, newerDigest, newerMode, tags, lastUsed, "   \
  "favoriteRank"

}  // namespace

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
  result.metadata = {QVDecodeTagNames(row.bytes(20)), row.integer(21), row.number(22)};
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
      ") VALUES (?1, ?2, ?3, ?4, ?5, ?6, ?7, ?8, ?9, ?10, ?11, ?12, ?13, ?14, ?15, ?16, ?17, ?18, ?19, ?20, "
      "?21, ?22, ?23)"
      " ON CONFLICT(record) DO UPDATE SET item = ?2, tag = ?3, parent = ?4, name = ?5, kind = ?6, size = ?7,"
      " modified = ?8, digest = ?9, mode = ?10, inode = ?11, localSize = ?12, localModified = ?13,"
      " localChanged = ?14, dataless = ?15, newerTag = ?16, newerSize = ?17, newerModified = ?18,"
      " newerDigest = ?19, newerMode = ?20, tags = ?21, lastUsed = ?22, favoriteRank = ?23");
  put.bindText(1, row.record).bind(2, row.item).bindText(3, row.tag).bindText(4, row.parent);
  put.bindBlob(5, row.name).bind(6, static_cast<std::int64_t>(row.kind));
  put.bind(7, row.content.size).bind(8, row.content.modified).bindText(9, row.content.digest);
  put.bind(10, static_cast<std::int64_t>(row.content.mode)).bind(11, row.local.inode);
  put.bind(12, row.local.size).bind(13, row.local.modified).bind(14, row.local.changed);
  put.bind(15, static_cast<std::int64_t>(row.isDataless)).bindText(16, row.newerTag);
  put.bind(17, row.newer.size).bind(18, row.newer.modified).bindText(19, row.newer.digest);
  put.bind(20, static_cast<std::int64_t>(row.newer.mode)).bindText(21, QVEncodeTagNames(row.metadata.tags));
  put.bind(22, row.metadata.lastUsed).bind(23, row.metadata.favoriteRank);
  put.run();
}

void SyncStore::erase(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM rows WHERE record = ?").bindText(1, record).run();
  statement("DELETE FROM thumbnails WHERE record = ?").bindText(1, record).run();
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
    database_.execute("DELETE FROM meant");
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

// --- What is being made.

void SyncStore::beginUnfinished(const std::vector<UnfinishedRecord> &records) {
  if (records.empty()) return;
  const RecursiveLock lock(mutex_);
  // The files are on the disk before their names are shown; so this has to be, too.
  database_.execute("PRAGMA synchronous = FULL");
  transaction([&]() NO_THREAD_SAFETY_ANALYSIS {
    for (const UnfinishedRecord &each : records)
      statement("INSERT OR REPLACE INTO unfinished VALUES (?, ?, ?, ?)")
          .bindText(1, each.record)
          .bindText(2, each.parent)
          .bindBlob(3, each.name)
          .bind(4, static_cast<std::int64_t>(each.kind))
          .run();
  });
  database_.execute("PRAGMA synchronous = NORMAL");
}

void SyncStore::finished(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM unfinished WHERE record = ?").bindText(1, record).run();
}

std::vector<UnfinishedRecord> SyncStore::readUnfinished(SqlStatement &asked) {
  std::vector<UnfinishedRecord> records;
  while (asked.step())
    records.push_back({std::string(asked.bytes(0)), std::string(asked.bytes(1)), std::string(asked.bytes(2)),
                       static_cast<NSFileProviderItemKind>(asked.integer(3))});
  asked.reset();
  return records;
}

std::vector<UnfinishedRecord> SyncStore::unfinished() {
  const RecursiveLock lock(mutex_);
  return readUnfinished(statement("SELECT record, parent, name, kind FROM unfinished"));
}

std::optional<UnfinishedRecord> SyncStore::unfinished(const std::string &record) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT record, parent, name, kind FROM unfinished WHERE record = ?");
  asked.bindText(1, record);
  auto records = readUnfinished(asked);
  if (records.empty()) return std::nullopt;
  return std::move(records.front());
}

void SyncStore::forgetUnfinished() {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM unfinished").run();
}

}  // namespace droxa::keld
