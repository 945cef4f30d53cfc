#include "platform/cloudkit/embedded/RecordSaver.h"

#include <random>
#include <set>

#include "platform/cloudkit/embedded/Manifest.h"
#include "platform/cloudkit/embedded/ShareGuard.h"
#include "platform/cloudkit/embedded/ShareStamp.h"
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
  const Zone zone = FindZone(connection_, record.recordID.zoneID);
  std::optional<CKRecord> current = FindRecord(connection_, zone.number, record.recordID, {});
  if (!zone.isOwn()) ShareGuard(connection_, zone).checkSave(record, current);
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
  if (saved.recordType == CKRecordTypeShare) return saveShare(zone, std::move(saved), current);
  if (!zone.isOwn()) ShareGuard(connection_, zone).checkPlace(saved, !current);
  saved = commit(zone, std::move(saved));
  if (zone.hasShares) {
    Hierarchy(connection_, zone.number).put(saved);
    views(zone).noteChange(saved.recordID.recordName, !current || ParentOf(*current) != ParentOf(saved));
  }
  return saved;
}

CKRecord RecordSaver::saveShare(const Zone &zone, CKRecord saved, const std::optional<CKRecord> &current) {
  const CKShare share = StampedShare(connection_, zone, saved, current);
  const CKRecord stamped = share.record();
  saved.fields = stamped.fields;
  saved = commit(zone, std::move(saved));
  views(zone).noteAccess(ShareTable(connection_, zone.number).put(share));
  views(zone).noteChange(saved.recordID.recordName, false);
  return saved;
}

CKRecord RecordSaver::rewriteShare(const Zone &zone, const CKShare &share) {
  CKRecord saved = put(zone, share.record());
  views(zone).noteAccess(ShareTable(connection_, zone.number).put(share));
  views(zone).noteChange(share.recordID.recordName, false);
  return saved;
}

// What whoever saves the record answers for.
CKRecord RecordSaver::commit(const Zone &zone, CKRecord saved) {
  checkAssets(saved);
  checkQuota(zone, saved);
  return put(zone, std::move(saved));
}

CKRecord RecordSaver::put(const Zone &zone, CKRecord saved) {
  const std::string encoded = EncodeFields(saved.fields);
  if (encoded.size() > CKLargestRecord) {
    Fail(CKErrorCode::limitExceeded, "The record is too large: " + saved.recordID.description());
  }
  saved.recordChangeTag = changeTag(nextChange(connection_, zone.number));
  saved.modificationDate = NSDate::now();
  saved.modifiedByDevice = home_.deviceName();
  refer(zone, saved);
  write(zone, saved, encoded, false);
  return saved;
}

bool RecordSaver::mayRemove(const CKRecordDeletion &deletion) const {
  const Zone zone = FindZone(connection_, deletion.recordID.zoneID);
  if (!Sees(connection_, zone, deletion.recordID.recordName)) return false;
  if (zone.isOwn() || ShareTable(connection_, zone.number).byRecord(deletion.recordID.recordName))
    return true;
  ShareGuard(connection_, zone).checkRemoval(deletion.recordID);
  return true;
}

void RecordSaver::remove(const CKRecordDeletion &deletion) {
  const Zone zone = FindZone(connection_, deletion.recordID.zoneID);
  std::optional<CKRecord> current = FindRecord(connection_, zone.number, deletion.recordID, {});
  if (!current) return;
  if (!deletion.recordChangeTag.empty() && current->recordChangeTag != deletion.recordChangeTag) {
    throw CallFailed{CKErrorMakeServerRecordChanged(std::move(*current))};
  }
  if (current->recordType == CKRecordTypeShare) {
    zone.isOwn() ? removeShare(zone, *current) : leave(zone, *current);
    return;
  }
  const std::string name = deletion.recordID.recordName;
  bury(zone, std::move(*current));
  if (!zone.hasShares) return;
  Hierarchy(connection_, zone.number).remove(name);
  views(zone).noteChange(name, true);
  const auto place = ShareTable(connection_, zone.number).byRoot(name);
  if (!place) return;
  // There is nothing left that the share could be of.
  const CKRecordID share{place->record, deletion.recordID.zoneID};
  if (const auto record = FindRecord(connection_, zone.number, share, {})) removeShare(zone, *record);
}

void RecordSaver::removeShare(const Zone &zone, const CKRecord &share) {
  const ShareTable table(connection_, zone.number);
  if (const auto place = table.byRecord(share.recordID.recordName)) {
    views(zone).noteAccess(table.remove(*place));
  }
  views(zone).noteChange(share.recordID.recordName, false);
  bury(zone, share);
}

// The account's own part ends; the share stays.
void RecordSaver::leave(const Zone &zone, const CKRecord &record) {
  std::optional<CKShare> share = CKShare::shareWithRecord(record);
  if (!share) Fail(CKErrorCode::internalError, "The cloud's share is damaged: " + record.description());
  const std::string name = AccountByNumber(connection_, connection_.account).identity.accountName;
  for (CKShareParticipant &participant : share->participants) {
    if (participant.userIdentity.accountName == name) {
      participant.acceptanceStatus = CKShareParticipantAcceptanceStatus::removed;
    }
  }
  std::erase_if(share->participants, [](const CKShareParticipant &participant) {
    return participant.role == CKShareParticipantRole::publicUser &&
           participant.acceptanceStatus == CKShareParticipantAcceptanceStatus::removed;
  });
  rewriteShare(zone, *share);
}

// Leaves of a record what the feed of changes tells of a deletion.
void RecordSaver::bury(const Zone &zone, CKRecord record) {
  record.recordChangeTag = changeTag(nextChange(connection_, zone.number));
  record.modificationDate = NSDate::now();
  record.modifiedByDevice = home_.deviceName();
  ReleaseAssets(connection_, zone, record.recordID.recordName);
  write(zone, record, {}, true);
}

Views &RecordSaver::views(const Zone &zone) {
  std::unique_ptr<Views> &views = views_[zone.number];
  if (!views) views = std::make_unique<Views>(home_, connection_, zone.number);
  return *views;
}

void RecordSaver::finish() {
  for (const auto &entry : views_) entry.second->finish();
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
    if (KnowsAsset(connection_, asset)) continue;
    Fail(CKErrorCode::assetFileNotFound,
         "The cloud has no contents " + asset.description() + " for " + record.recordID.description());
  }
}

void RecordSaver::checkQuota(const Zone &zone, const CKRecord &record) const {
  SqlUse account = connection_.use("SELECT quota, used FROM accounts WHERE id = ?");
  if (!account.bind(zone.owner).step() || account.isNull(0)) return;
  const auto quota = static_cast<std::uint64_t>(account.integer(0));
  const auto used = static_cast<std::uint64_t>(account.integer(1));
  SqlUse row =
      connection_.use("SELECT coalesce(sum(size), 0) FROM record_assets WHERE zone = ? AND record = ?");
  row.bind(zone.number).bind(record.recordID.recordName).step();
  const auto before = static_cast<std::uint64_t>(row.integer(0));
  const std::uint64_t after = bytesOf(assetsOf(record));
  // What doesn't grow is taken even when the quota was lowered below what is there.
  if (after > before && used - before + after > quota) {
    Fail(CKErrorCode::quotaExceeded, "The account's quota of " + std::to_string(quota) + " bytes is used up");
  }
}

void RecordSaver::refer(const Zone &zone, const CKRecord &record) {
  const std::string &name = record.recordID.recordName;
  ReleaseAssets(connection_, zone, name);
  const std::set<CKAssetReference> assets = assetsOf(record);
  for (const CKAssetReference &asset : assets) {
    connection_.use("INSERT INTO record_assets (zone, record, asset, size) VALUES (?, ?, ?, ?)")
        .bind(zone.number)
        .bind(name)
        .bind(asset.sha256)
        .bind(static_cast<std::int64_t>(asset.size))
        .run();
  }
  if (assets.empty()) return;
  connection_.use("UPDATE accounts SET used = used + ? WHERE id = ?")
      .bind(static_cast<std::int64_t>(bytesOf(assets)))
      .bind(zone.owner)
      .run();
}

void RecordSaver::write(const Zone &zone, const CKRecord &record, const std::string &encoded,
                        bool isDeleted) {
  SqlUse last = connection_.use("SELECT seq FROM zones WHERE id = ?");
  last.bind(zone.number).step();
  connection_
      .use(
          "INSERT OR REPLACE INTO records (zone, name, seq, type, tag, time, device, session, deleted, "
          "fields)"
          " VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?, ?)")
      .bind(zone.number)
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
