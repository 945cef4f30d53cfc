// Which documents are to have a thumbnail that they don't have yet.

#include "keld/sync/SyncStore.h"

namespace droxa::keld {

void SyncStore::wantThumbnail(const WantedThumbnail &wanted) {
  const RecursiveLock lock(mutex_);
  ++thumbnailNews_;
  statement(
      "INSERT OR REPLACE INTO thumbnails(record, digest, source, inode, size, modified)"
      " VALUES (?1, ?2, ?3, ?4, ?5, ?6)")
      .bindText(1, wanted.record)
      .bindText(2, wanted.digest)
      .bindBlob(3, wanted.source)
      .bind(4, wanted.sourceFile.inode)
      .bind(5, wanted.sourceFile.size)
      .bind(6, wanted.sourceFile.modified)
      .run();
}

std::vector<WantedThumbnail> SyncStore::dueThumbnails(std::uint64_t limit) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement(
      "SELECT t.record, t.digest, t.source, t.inode, t.size, t.modified FROM thumbnails t"
      " JOIN rows r ON r.record = t.record"
      " WHERE r.tag <> '' AND r.digest = t.digest AND r.newerTag = '' AND r.item <> 0 LIMIT ?");
  asked.bind(1, limit);
  std::vector<WantedThumbnail> due;
  while (asked.step()) {
    WantedThumbnail wanted;
    wanted.record = asked.bytes(0);
    wanted.digest = asked.bytes(1);
    wanted.source = asked.bytes(2);
    wanted.sourceFile = {asked.number(3), asked.number(4), asked.integer(5), 0};
    due.push_back(std::move(wanted));
  }
  asked.reset();
  return due;
}

void SyncStore::thumbnailSettled(const std::string &record, const std::string &digest) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM thumbnails WHERE record = ? AND digest = ?")
      .bindText(1, record)
      .bindText(2, digest)
      .run();
}

void SyncStore::dropStaleThumbnails() {
  const RecursiveLock lock(mutex_);
  statement(
      "DELETE FROM thumbnails WHERE record IN (SELECT t.record FROM thumbnails t JOIN rows r ON r.record = "
      "t.record"
      " WHERE r.tag <> '' AND r.digest <> t.digest AND r.item NOT IN (SELECT item FROM uploads))")
      .run();
}

std::uint64_t SyncStore::countThumbnails() {
  return count("SELECT count(*) FROM thumbnails");
}

std::uint64_t SyncStore::thumbnailNews() {
  const RecursiveLock lock(mutex_);
  return thumbnailNews_;
}

}  // namespace droxa::keld
