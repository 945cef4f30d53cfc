// The queue of uploads, and the pins.

#include <utility>

#include "keld/sync/SyncStore.h"

namespace droxa::keld {

namespace {

constexpr std::int64_t kLongestDelay = 3'600'000;  // milliseconds

// Of the announcements that stand at ?1. None is made for longer than until ?2: the clock was put back.
#define STANDS "(until = 0 OR (until > ?1 AND until <= ?2))"

#define UPLOAD_COLUMNS \
  "sequence, item, generation, attempts, deletion, held, errorDomain, errorCode, errorText, refused"

}  // namespace

QueuedUpload SyncStore::readQueued(const SqlStatement &row) {
  QueuedUpload upload;
  upload.sequence = row.integer(0);
  upload.item = row.number(1);
  upload.generation = row.integer(2);
  upload.attempts = row.integer(3);
  upload.isDeletion = row.integer(4) != 0;
  upload.isHeld = row.integer(5) != 0;
  upload.isRefused = row.integer(9) != 0;
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
      " attempts = 0, retry = ?4, deletion = ?2, held = ?3, errorDomain = '', errorCode = 0, errorText = '',"
      " refused = 0")
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
  SqlStatement &asked =
      statement("SELECT " UPLOAD_COLUMNS
                " FROM uploads WHERE held = 0 AND refused = 0 AND (retry <= ?1 OR retry > ?2)"
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
  SqlStatement &asked =
      statement("SELECT min(retry) FROM uploads WHERE retry <> 0 AND held = 0 AND refused = 0");
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

void SyncStore::uploadRefused(const QueuedUpload &upload, const NSError &error) {
  const RecursiveLock lock(mutex_);
  uploadFailed(upload, error, 0);
  statement("UPDATE uploads SET refused = 1 WHERE item = ? AND generation = ?")
      .bind(1, upload.item)
      .bind(2, upload.generation)
      .run();
}

void SyncStore::retryRefused() {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET refused = 0, retry = 0 WHERE refused = 1").run();
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

std::uint64_t SyncStore::countDeletions(std::int64_t now) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement(
      "SELECT count(*) FROM uploads WHERE deletion = 1"
      " AND item NOT IN (SELECT item FROM meant WHERE " STANDS ")");
  asked.bind(1, now).bind(2, now + kLongestDelay);
  const std::uint64_t number = asked.step() ? asked.number(0) : 0;
  asked.reset();
  return number;
}

void SyncStore::holdDeletions(std::int64_t now) {
  const RecursiveLock lock(mutex_);
  statement(
      "UPDATE uploads SET held = 1 WHERE deletion = 1"
      " AND item NOT IN (SELECT item FROM meant WHERE " STANDS ")")
      .bind(1, now)
      .bind(2, now + kLongestDelay)
      .run();
}

void SyncStore::releaseHeld() {
  const RecursiveLock lock(mutex_);
  statement("UPDATE uploads SET held = 0 WHERE held = 1").run();
}

// --- Deletions that were asked for.

void SyncStore::allowDeletions(const std::vector<ItemNumber> &items, std::int64_t now, std::int64_t until) {
  const RecursiveLock lock(mutex_);
  transaction([&]() NO_THREAD_SAFETY_ANALYSIS {
    statement("DELETE FROM meant WHERE NOT " STANDS).bind(1, now).bind(2, now + kLongestDelay).run();
    for (const ItemNumber item : items)
      statement(
          "INSERT INTO meant(item, until) VALUES (?1, ?2)"
          " ON CONFLICT(item) DO UPDATE SET until = ?2 WHERE until <> 0")
          .bind(1, item)
          .bind(2, until)
          .run();
  });
}

void SyncStore::keepAllowedDeletion(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  statement("UPDATE meant SET until = 0 WHERE item = ?").bind(1, item).run();
}

bool SyncStore::isDeletionAllowed(ItemNumber item, std::int64_t now) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT 1 FROM meant WHERE item = ?3 AND " STANDS);
  asked.bind(1, now).bind(2, now + kLongestDelay).bind(3, item);
  const bool found = asked.step();
  asked.reset();
  return found;
}

void SyncStore::forgetAllowedDeletion(ItemNumber item) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM meant WHERE item = ?").bind(1, item).run();
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

}  // namespace droxa::keld
