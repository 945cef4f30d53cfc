#include <set>

#include "platform/cloudkit/CKAssetFile.h"
#include "platform/cloudkit/embedded/Calls.h"
#include "platform/cloudkit/embedded/RecordSaver.h"

namespace droxa::embedded {
namespace {

NSError callError(const CKModifyRequest &request) {
  if (request.recordsToSave.size() + request.recordsToDelete.size() > CKMostRecordsPerCall) {
    return CKErrorMake(CKErrorCode::limitExceeded, "Too many records in one call");
  }
  std::set<CKRecordID> ids;
  std::set<CKRecordZoneID> zones;
  const auto isNew = [&](const CKRecordID &id) {
    zones.insert(id.zoneID);
    return ids.insert(id).second;
  };
  bool allNew = true;
  for (const CKRecord &record : request.recordsToSave) allNew = isNew(record.recordID) && allNew;
  for (const CKRecordDeletion &deletion : request.recordsToDelete) {
    allNew = isNew(deletion.recordID) && allNew;
  }
  if (!allNew) return CKErrorMake(CKErrorCode::invalidArguments, "A record occurs twice in one call");
  if (request.isAtomic && zones.size() > 1) {
    return CKErrorMake(CKErrorCode::invalidArguments, "An atomic call can't span zones");
  }
  return {};
}

// One call: first the uploads, then a transaction.
class Modification {
 public:
  Modification(Home &home, const CKModifyRequest &request, const CKCallContext &context)
      : home_(home), request_(request), context_(context), records_(request.recordsToSave) {
    for (const CKRecord &record : records_) reply_.saved.push_back({record.recordID, {}, {}});
    for (const CKRecordDeletion &deletion : request.recordsToDelete) {
      reply_.deleted.push_back({deletion.recordID, {}});
    }
  }

  CKModifyReply run() {
    if (NSError stopped = prepare()) return {stopped, {}, {}};
    if (!mustGiveUp()) {
      NSError error = home_.run(Home::Access::write, context_, [this](const Connection &connection) {
        RecordSaver saver(home_, connection);
        // In another's zone last: what is moved out of a folder that goes must still be seen to be there.
        const bool isShared = connection.scope == CKDatabaseScope::sharedDatabase;
        if (!isShared) remove(saver, isShared);
        save(saver, false);
        save(saver, true);
        if (isShared) remove(saver, isShared);
        saver.finish();
        // Only now, so that every conflict is told. Rolls back; the results say why.
        if (mustGiveUp()) throw CallFailed{};
      });
      if (error) return {error, {}, {}};
    }
    return finished();
  }

 private:
  // Checks what needs no database and uploads files. Answers an error of the call as a whole.
  NSError prepare() {
    for (std::size_t i = 0; i < records_.size(); ++i) {
      NSError &error = reply_.saved[i].error;
      error = RecordError(records_[i]);
      if (!error) error = uploadFiles(records_[i]);
      if (NSError stopped = context_.check()) return stopped;
      if (CKErrorIsTransient(error)) return error;
      if (error && request_.isAtomic) return {};
    }
    for (CKDeleteResult &result : reply_.deleted) {
      if (!CKNameIsValid(result.recordID.recordName) || !CKNameIsValid(result.recordID.zoneID.zoneName)) {
        result.error = CKErrorMake(CKErrorCode::invalidArguments,
                                   "No record can be named " + result.recordID.description());
      }
    }
    return {};
  }

  NSError uploadFiles(CKRecord &record) {
    for (auto &[key, value] : record.fields) {
      auto *asset = std::get_if<CKAsset>(&value);
      if (!asset || !asset->isFile()) continue;
      const CKAssetFile file(*asset);
      if (file.error()) return file.error();
      CKUploadReply uploaded = UploadAsset(home_, file.descriptor(), file.size(), {}, context_);
      if (uploaded.error) return uploaded.error;
      *asset = std::move(uploaded.asset);
    }
    return {};
  }

  void remove(RecordSaver &saver, bool isShared) {
    std::vector<bool> isToBeRemoved(reply_.deleted.size(), true);
    for (std::size_t i = 0; i < reply_.deleted.size() && isShared; ++i) {
      attempt(reply_.deleted[i].error,
              [&] { isToBeRemoved[i] = saver.mayRemove(request_.recordsToDelete[i]); });
    }
    for (std::size_t i = 0; i < reply_.deleted.size(); ++i) {
      if (!isToBeRemoved[i]) continue;
      attempt(reply_.deleted[i].error, [&] { saver.remove(request_.recordsToDelete[i]); });
    }
  }

  // Shares after all others: their roots may come in the same call.
  void save(RecordSaver &saver, bool shares) {
    for (std::size_t i = 0; i < records_.size(); ++i) {
      if ((records_[i].recordType == CKRecordTypeShare) != shares) continue;
      CKRecordResult &result = reply_.saved[i];
      attempt(result.error, [&] { result.record = saver.save(records_[i], request_.savePolicy); });
    }
  }

  // Unless the record has failed already.
  template <class Body>
  static void attempt(NSError &error, const Body &body) {
    if (error) return;
    try {
      body();
    } catch (const CallFailed &failed) {
      error = failed.error;
    }
  }

  bool hasFailures() const {
    for (const CKRecordResult &result : reply_.saved) {
      if (result.error) return true;
    }
    for (const CKDeleteResult &result : reply_.deleted) {
      if (result.error) return true;
    }
    return false;
  }
  bool mustGiveUp() const { return request_.isAtomic && hasFailures(); }

  CKModifyReply finished() {
    if (!hasFailures()) return std::move(reply_);
    reply_.error = CKErrorMake(CKErrorCode::partialFailure, "Some records weren't modified");
    if (!request_.isAtomic) return std::move(reply_);
    const NSError batch = CKErrorMake(CKErrorCode::batchRequestFailed,
                                      "Nothing was modified: another record of the call failed");
    for (CKRecordResult &result : reply_.saved) {
      if (!result.error) result = {result.recordID, batch, {}};
    }
    for (CKDeleteResult &result : reply_.deleted) {
      if (!result.error) result.error = batch;
    }
    return std::move(reply_);
  }

  Home &home_;
  const CKModifyRequest &request_;
  const CKCallContext &context_;
  std::vector<CKRecord> records_;  // as told, files replaced with references
  CKModifyReply reply_;
};

}  // namespace

CKModifyReply ModifyRecords(Home &home, const CKModifyRequest &request, const CKCallContext &context) {
  if (NSError error = callError(request)) return {error, {}, {}};
  return Modification(home, request, context).run();
}

}  // namespace droxa::embedded
