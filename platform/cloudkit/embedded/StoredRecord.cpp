#include "platform/cloudkit/embedded/StoredRecord.h"

#include <ctime>

#include "platform/cloudkit/CKShare.h"
#include "platform/cloudkit/embedded/RecordCoding.h"

namespace droxa::embedded {

CKRecord ReadRecord(const SqlUse &row, const CKRecordZoneID &zone, const CKDesiredKeys &desiredKeys) {
  CKRecord record;
  record.recordID = {row.text(0), zone};
  record.recordType = row.text(1);
  record.recordChangeTag = row.text(2);
  record.modificationDate = NSDate::dateWithNanosecondsSince1970(row.integer(3));
  record.modifiedByDevice = row.text(4);
  const bool isShare = record.recordType == CKRecordTypeShare;
  std::optional<Fields> fields = DecodeFields(row.bytes(5), isShare ? CKDesiredKeys() : desiredKeys);
  if (!fields) {
    Fail(CKErrorCode::internalError, "The cloud's record is damaged: " + record.recordID.description());
  }
  record.fields = std::move(*fields);
  return record;
}

std::optional<CKRecord> FindRecord(const Connection &connection, std::int64_t zone, const CKRecordID &id,
                                   const CKDesiredKeys &desiredKeys) {
  SqlUse row = connection.use("SELECT " DROXA_RECORD_COLUMNS
                              " FROM records WHERE zone = ? AND name = ? AND NOT deleted");
  if (!row.bind(zone).bind(id.recordName).step()) return std::nullopt;
  return ReadRecord(row, id.zoneID, desiredKeys);
}

void ReleaseAssets(const Connection &connection, const Zone &zone, const std::string &record) {
  connection
      .use(
          "UPDATE accounts SET used = used - (SELECT coalesce(sum(size), 0) FROM record_assets"
          " WHERE zone = ? AND record = ?) WHERE id = ?")
      .bind(zone.number)
      .bind(record)
      .bind(zone.owner)
      .run();
  connection
      .use(
          "UPDATE assets SET touched = ? WHERE digest IN"
          " (SELECT asset FROM record_assets WHERE zone = ? AND record = ?)")
      .bind(SecondsNow())
      .bind(zone.number)
      .bind(record)
      .run();
  connection.use("DELETE FROM record_assets WHERE zone = ? AND record = ?")
      .bind(zone.number)
      .bind(record)
      .run();
}

void ReleaseZoneAssets(const Connection &connection, const Zone &zone) {
  connection
      .use(
          "UPDATE accounts SET used = used - (SELECT coalesce(sum(size), 0) FROM record_assets WHERE zone = "
          "?)"
          " WHERE id = ?")
      .bind(zone.number)
      .bind(zone.owner)
      .run();
  connection
      .use("UPDATE assets SET touched = ? WHERE digest IN (SELECT asset FROM record_assets WHERE zone = ?)")
      .bind(SecondsNow())
      .bind(zone.number)
      .run();
  connection.use("DELETE FROM record_assets WHERE zone = ?").bind(zone.number).run();
}

std::int64_t SecondsNow() {
  return static_cast<std::int64_t>(std::time(nullptr));
}

}  // namespace droxa::embedded
