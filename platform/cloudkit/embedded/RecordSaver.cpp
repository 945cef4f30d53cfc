#include "platform/cloudkit/embedded/RecordSaver.h"

#include <random>
#include <set>

#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

std::set<CKAssetReference> assetsOf(const CKRecord &record) {
  std::set<CKAssetReference> assets;
  for (const auto &field : record.fields) {
    if (const auto *asset = std::get_if<CKAsset>(&field.second)) assets.insert(asset->reference());
  }
  return assets;
}

std::uint64_t bytesOf(const std::set<CKAssetReference> &assets) {
  std::uint64_t bytes = 0;
  for (const CKAssetReference &asset : assets) bytes += asset.size;
  return bytes;
}

// The number of the change alone would come again in a cloud that was put back to an earlier state.
std::string changeTag(std::int64_t seq) {
  thread_local std::mt19937_64 random(std::random_device{}());
  std::uint64_t salt = random();
  std::string tag = std::to_string(seq) + "-";
  for (int i = 0; i < 12; ++i, salt >>= 4) tag += "0123456789abcdef"[salt & 15];
  return tag;
}

std::int64_t nextChange(const Connection &connection, std::int64_t zone) {
  SqlUse row = connection.use("UPDATE zones SET seq = seq + 1 WHERE id = ? RETURNING seq");
  row.bind(zone);
  if (!row.step()) Fail(CKErrorCode::zoneNotFound, "The zone is gone");
  const std::int64_t seq = row.integer(0);
  row.run();
  return seq;
}

}  // namespace

NSError RecordError(const CKRecord &record) {
  const std::string name = record.recordID.description();
  if (!CKNameIsValid(record.recordID.recordName) || !CKNameIsValid(record.recordID.zoneID.zoneName)) {
    return CKErrorMake(CKErrorCode::invalidArguments, "No record can be named " + name);
  }
  if (!CKNameIsValid(record.recordType)) {
    return CKErrorMake(CKErrorCode::invalidArguments, "The record has no type that can be: " + name);
  }
  for (const auto &[key, value] : record.fields) {
    const auto *asset = std::get_if<CKAsset>(&value);
    if (!CKNameIsValid(key) || (asset && asset->isReference() && !asset->reference().isWellFormed())) {
      return CKErrorMake(CKErrorCode::invalidArguments, "The record has a field that can't be: " + name);
    }
  }
  return {};
}

CKRecord RecordSaver::save(const CKRecord &record, CKRecordSavePolicy policy) {
  const std::int64_t zone = ZoneNumber(connection_, record.recordID.zoneID);
  std::optional<CKRecord> current = FindRecord(connection_, zone, record.recordID, {});
  if (policy == CKRecordSavePolicy::ifServerRecordUnchanged) {
    if (!current && !record.recordChangeTag.empty()) {
      Fail(CKErrorCode::unknownItem, "The record is gone: " + record.recordID.description());
    }
    if (current && current->recordChangeTag != record.recordChangeTag) {
      throw CallFailed{CKErrorMakeServerRecordChanged(std::move(*current))};
    }
  }
  if (current && current->recordType != record.recordType) {
    Fail(CKErrorCode::invalidArguments, "The record is of another type: " + record.recordID.description());
  }
  CKRecord saved = record;
  saved.fields = merged(record, current, policy);
  const std::string encoded = EncodeFields(saved.fields);
  if (encoded.size() > CKLargestRecord) {
    Fail(CKErrorCode::limitExceeded, "The record is too large: " + record.recordID.description());
  }
  checkAssets(saved);
  checkQuota(zone, saved);
  const std::int64_t seq = nextChange(connection_, zone);
  saved.recordChangeTag = changeTag(seq);
  saved.modificationDate = NSDate::now();
  saved.modifiedByDevice = home_.deviceName();
  refer(zone, saved);
  write(zone, saved, encoded, false);
  return saved;
}

void RecordSaver::remove(const CKRecordDeletion &deletion) {
  const std::int64_t zone = ZoneNumber(connection_, deletion.recordID.zoneID);
  std::optional<CKRecord> current = FindRecord(connection_, zone, deletion.recordID, {});
  if (!current) return;
  if (!deletion.recordChangeTag.empty() && current->recordChangeTag != deletion.recordChangeTag) {
    throw CallFailed{CKErrorMakeServerRecordChanged(std::move(*current))};
  }
  current->recordChangeTag = changeTag(nextChange(connection_, zone));
  current->modificationDate = NSDate::now();
  current->modifiedByDevice = home_.deviceName();
  ReleaseAssets(connection_, zone, deletion.recordID.recordName);
  write(zone, *current, {}, true);
}

Fields RecordSaver::merged(const CKRecord &record, const std::optional<CKRecord> &current,
                           CKRecordSavePolicy policy) const {
  Fields fields;
  if (current && policy != CKRecordSavePolicy::allKeys) fields = current->fields;
  for (const auto &[key, value] : record.fields) {
    if (CKRecordValueIsNone(value)) {
      fields.erase(key);
    } else {
      fields.insert_or_assign(key, value);
    }
  }
  return fields;
}

// Inside the transaction: contents that are there now can't be collected before the record refers to them.
void RecordSaver::checkAssets(const CKRecord &record) const {
  for (const CKAssetReference &asset : assetsOf(record)) {
    SqlUse row = connection_.use("SELECT size FROM assets WHERE digest = ?");
    if (row.bind(asset.sha256).step() && static_cast<std::uint64_t>(row.integer(0)) == asset.size) continue;
    Fail(CKErrorCode::assetFileNotFound,
         "The cloud has no contents " + asset.description() + " for " + record.recordID.description());
  }
}

void RecordSaver::checkQuota(std::int64_t zone, const CKRecord &record) const {
  SqlUse account = connection_.use("SELECT quota, used FROM accounts WHERE id = ?");
  if (!account.bind(connection_.account).step() || account.isNull(0)) return;
  const auto quota = static_cast<std::uint64_t>(account.integer(0));
  const auto used = static_cast<std::uint64_t>(account.integer(1));
  SqlUse row =
      connection_.use("SELECT coalesce(sum(size), 0) FROM record_assets WHERE zone = ? AND record = ?");
  row.bind(zone).bind(record.recordID.recordName).step();
  const auto before = static_cast<std::uint64_t>(row.integer(0));
  const std::uint64_t after = bytesOf(assetsOf(record));
  // What doesn't grow is taken even when the quota was lowered below what is there.
  if (after > before && used - before + after > quota) {
    Fail(CKErrorCode::quotaExceeded, "The account's quota of " + std::to_string(quota) + " bytes is used up");
  }
}

void RecordSaver::refer(std::int64_t zone, const CKRecord &record) {
  const std::string &name = record.recordID.recordName;
  ReleaseAssets(connection_, zone, name);
  const std::set<CKAssetReference> assets = assetsOf(record);
  for (const CKAssetReference &asset : assets) {
    connection_.use("INSERT INTO record_assets (zone, record, asset, size) VALUES (?, ?, ?, ?)")
        .bind(zone)
        .bind(name)
        .bind(asset.sha256)
        .bind(static_cast<std::int64_t>(asset.size))
        .run();
  }
  if (assets.empty()) return;
  connection_.use("UPDATE accounts SET used = used + ? WHERE id = ?")
      .bind(static_cast<std::int64_t>(bytesOf(assets)))
      .bind(connection_.account)
      .run();
}

void RecordSaver::write(std::int64_t zone, const CKRecord &record, const std::string &encoded,
                        bool isDeleted) {
  SqlUse last = connection_.use("SELECT seq FROM zones WHERE id = ?");
  last.bind(zone).step();
  connection_
      .use(
          "INSERT OR REPLACE INTO records (zone, name, seq, type, tag, time, device, session, deleted, "
          "fields)"
          " VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?, ?)")
      .bind(zone)
      .bind(record.recordID.recordName)
      .bind(last.integer(0))
      .bind(record.recordType)
      .bind(record.recordChangeTag)
      .bind(record.modificationDate.nanosecondsSince1970())
      .bind(record.modifiedByDevice)
      .bind(home_.session())
      .bind(isDeleted ? 1 : 0)
      .bind(encoded)
      .run();
}

}  // namespace droxa::embedded
