// The shares that this account sees.

#include <utility>

#include "keld/sync/SyncStore.h"

namespace droxa::keld {

std::vector<KnownShare> SyncStore::readShares(SqlStatement &asked) {
  std::vector<KnownShare> shares;
  while (asked.step()) {
    KnownShare share;
    share.record.zoneID = {std::string(asked.bytes(0)), std::string(asked.bytes(1))};
    share.record.recordName = asked.bytes(2);
    share.root = asked.bytes(3);
    share.owner = asked.bytes(4);
    shares.push_back(std::move(share));
  }
  asked.reset();
  return shares;
}

void SyncStore::putShare(const KnownShare &share) {
  const RecursiveLock lock(mutex_);
  statement("INSERT OR REPLACE INTO shares(zone, zoneOwner, record, root, owner) VALUES (?, ?, ?, ?, ?)")
      .bindText(1, share.record.zoneID.zoneName)
      .bindText(2, share.record.zoneID.ownerName)
      .bindText(3, share.record.recordName)
      .bindText(4, share.root)
      .bindText(5, share.owner)
      .run();
}

void SyncStore::eraseShare(const CKRecordID &record) {
  const RecursiveLock lock(mutex_);
  statement("DELETE FROM shares WHERE zone = ? AND zoneOwner = ? AND record = ?")
      .bindText(1, record.zoneID.zoneName)
      .bindText(2, record.zoneID.ownerName)
      .bindText(3, record.recordName)
      .run();
}

std::optional<KnownShare> SyncStore::share(const CKRecordID &record) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked = statement(
      "SELECT zone, zoneOwner, record, root, owner FROM shares"
      " WHERE zone = ? AND zoneOwner = ? AND record = ?");
  asked.bindText(1, record.zoneID.zoneName).bindText(2, record.zoneID.ownerName);
  asked.bindText(3, record.recordName);
  auto found = readShares(asked);
  if (found.empty()) return std::nullopt;
  return std::move(found.front());
}

std::optional<KnownShare> SyncStore::shareOfRoot(const std::string &root) {
  const RecursiveLock lock(mutex_);
  SqlStatement &asked =
      statement("SELECT zone, zoneOwner, record, root, owner FROM shares WHERE root = ? LIMIT 1");
  asked.bindText(1, root);
  auto found = readShares(asked);
  if (found.empty()) return std::nullopt;
  return std::move(found.front());
}

std::vector<KnownShare> SyncStore::shares() {
  const RecursiveLock lock(mutex_);
  return readShares(statement("SELECT zone, zoneOwner, record, root, owner FROM shares"));
}

}  // namespace droxa::keld
