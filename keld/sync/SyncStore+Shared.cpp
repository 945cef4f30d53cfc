// What is known of the shares of another account's zone.

#include "keld/sync/SyncStore.h"

namespace droxa::keld {

namespace {

std::optional<ShareAccess> readAccess(SqlStatement &asked) {
  std::optional<ShareAccess> access;
  if (asked.step())
    access = ShareAccess{std::string(asked.bytes(0)), std::string(asked.bytes(1)), asked.integer(2) != 0};
  asked.reset();
  return access;
}

}  // namespace

std::optional<ShareAccess> SyncStore::accessByShare(const std::string &share) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT share, root, writable FROM accesses WHERE share = ?");
  asked.bindText(1, share);
  return readAccess(asked);
}

std::optional<ShareAccess> SyncStore::accessByRoot(const std::string &root) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT share, root, writable FROM accesses WHERE root = ? LIMIT 1");
  asked.bindText(1, root);
  return readAccess(asked);
}

void SyncStore::putAccess(const ShareAccess &access) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO accesses VALUES (?, ?, ?)")
      .bindText(1, access.share)
      .bindText(2, access.root)
      .bind(3, static_cast<std::int64_t>(access.isWritable))
      .run();
}

void SyncStore::dropAccess(const std::string &share) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM accesses WHERE share = ?").bindText(1, share).run();
}

void SyncStore::forgetAccesses() {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM accesses").run();
}

void SyncStore::setTop(const std::string &record, const std::string &parent) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO tops VALUES (?, ?)").bindText(1, record).bindText(2, parent).run();
}

void SyncStore::dropTop(const std::string &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM tops WHERE record = ?").bindText(1, record).run();
}

bool SyncStore::isTop(const std::string &record) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement("SELECT 1 FROM tops WHERE record = ?");
  asked.bindText(1, record);
  const bool found = asked.step();
  asked.reset();
  return found;
}

void SyncStore::fetchTopsOf(const std::string &parent) {
  std::vector<std::string> records;
  {
    const RecursiveLock lock(mutex_);
    SqlStatement &asked = statement("SELECT record FROM tops WHERE parent = ?");
    asked.bindText(1, parent);
    while (asked.step()) records.emplace_back(asked.bytes(0));
    asked.reset();
  }
  for (const std::string &record : records) {
    dropTop(record);
    fetchAgain(record);
  }
}

void SyncStore::hangOrphans() {
  transaction([this] {
    std::vector<std::pair<std::string, std::string>> orphans;
    {
      const RecursiveLock lock(mutex_);
      SqlStatement &asked = statement(
          "SELECT record, parent FROM orphans WHERE parent <> '' AND parent NOT IN (SELECT record FROM "
          "rows)");
      while (asked.step()) orphans.emplace_back(asked.bytes(0), asked.bytes(1));
      asked.reset();
    }
    for (const auto &[record, parent] : orphans) {
      dropOrphan(record);
      setTop(record, parent);
      fetchAgain(record);
    }
  });
}

}  // namespace droxa::keld
