#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/StoredRecord.h"

namespace droxa::embedded {
namespace {

CKRecordResult fetchOne(const Connection &connection, const CKRecordID &id,
                        const CKDesiredKeys &desiredKeys) {
  if (!CKNameIsValid(id.recordName) || !CKNameIsValid(id.zoneID.zoneName)) {
    return {id, CKErrorMake(CKErrorCode::invalidArguments, "No record can be named " + id.description()), {}};
  }
  try {
    const Zone zone = FindZone(connection, id.zoneID);
    std::optional<CKRecord> record = FindRecord(connection, zone.number, id, desiredKeys);
    if (record && Sees(connection, zone, id.recordName)) return {id, {}, std::move(*record)};
    return {id, CKErrorMake(CKErrorCode::unknownItem, "No record " + id.description()), {}};
  } catch (const CallFailed &failed) {
    return {id, failed.error, {}};
  }
}

}  // namespace

CKFetchReply FetchRecords(Home &home, const std::vector<CKRecordID> &ids, const CKDesiredKeys &desiredKeys,
                          const CKCallContext &context) {
  if (ids.size() > CKMostRecordsPerCall) {
    return {CKErrorMake(CKErrorCode::limitExceeded, "Too many records in one call"), {}};
  }
  CKFetchReply reply;
  bool isPartial = false;
  reply.error = home.run(Home::Access::read, context, [&](const Connection &connection) {
    for (const CKRecordID &id : ids) {
      reply.results.push_back(fetchOne(connection, id, desiredKeys));
      if (reply.results.back().error) isPartial = true;
    }
  });
  if (reply.error) return {reply.error, {}};
  if (isPartial) reply.error = CKErrorMake(CKErrorCode::partialFailure, "Some records weren't fetched");
  return reply;
}

}  // namespace droxa::embedded
