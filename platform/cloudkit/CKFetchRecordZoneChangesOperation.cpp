#include "platform/cloudkit/CKFetchRecordZoneChangesOperation.h"

namespace droxa {

NSError CKFetchRecordZoneChangesOperation::perform() {
  NSError error;
  do {
    error = fetchPage();
  } while (!error && moreComing_ && fetchAllChanges);
  return error;
}

NSError CKFetchRecordZoneChangesOperation::fetchPage() {
  CKZoneChanges page;
  NSError error = retrying(Timing::call, [&](const CKCallContext &context) -> Attempt {
    page = cloud().fetchZoneChanges(zoneID, token(), desiredKeys, resultsLimit, context);
    return {page.error, false};
  });
  if (!error) tell(page);
  return error;
}

void CKFetchRecordZoneChangesOperation::tell(const CKZoneChanges &page) {
  if (recordWasChangedBlock) {
    for (const CKRecord &record : page.changedRecords) recordWasChangedBlock(record);
  }
  if (recordWithIDWasDeletedBlock) {
    for (const CKDeletedRecord &record : page.deletedRecords) recordWithIDWasDeletedBlock(record);
  }
  token_ = page.token;
  moreComing_ = page.moreComing;
  if (serverChangeTokenUpdatedBlock) serverChangeTokenUpdatedBlock(page.token);
}

void CKFetchRecordZoneChangesOperation::complete(const NSError &error) {
  if (fetchRecordZoneChangesCompletionBlock)
    fetchRecordZoneChangesCompletionBlock(token(), moreComing_, error);
}

}  // namespace droxa
