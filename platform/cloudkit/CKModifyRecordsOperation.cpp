#include "platform/cloudkit/CKModifyRecordsOperation.h"

#include <algorithm>

namespace droxa {

// The operation while it runs: what is still to be done, and how the last try went.
class CKModifyRecordsOperation::Run {
 public:
  explicit Run(CKModifyRecordsOperation &operation) : operation_(operation), left_(operation.request) {}

  NSError perform() {
    const NSError error =
        operation_.retrying(Timing::call, [this](const CKCallContext &context) { return attempt(context); });
    if (!isLastReplyWhole_ || CKErrorIs(error, CKErrorCode::operationCancelled)) return error;
    for (CKRecordResult &result : last_.saved) tell(std::move(result));
    for (CKDeleteResult &result : last_.deleted) tell(std::move(result));
    return hasFailures_ ? CKErrorMake(CKErrorCode::partialFailure, "Some records weren't modified")
                        : NSError();
  }

 private:
  Attempt attempt(const CKCallContext &context) {
    CKModifyReply reply = operation_.cloud().modifyRecords(left_, context);
    isLastReplyWhole_ = !reply.error || CKErrorIs(reply.error, CKErrorCode::partialFailure);
    if (!isLastReplyWhole_) {
      mayHaveBeenDone_ = mayHaveBeenDone_ || CKErrorIs(reply.error, CKErrorCode::networkFailure);
      return {reply.error, false};
    }
    if (mayHaveBeenDone_) recogniseOwnSaves(reply);
    return left_.isAtomic ? settleAtomic(std::move(reply)) : settleEach(std::move(reply));
  }

  // An earlier try was carried out and its reply lost: its saves now look like another device's.
  void recogniseOwnSaves(CKModifyReply &reply) const {
    bool isAnyOwn = false;
    for (std::size_t i = 0; i < reply.saved.size(); ++i) {
      const std::optional<CKRecord> server = CKErrorServerRecord(reply.saved[i].error);
      if (!server ||
          !CKServerRecordIsOwnSave(left_.recordsToSave[i], *server, operation_.cloud().deviceName())) {
        continue;
      }
      reply.saved[i] = {server->recordID, {}, *server};
      isAnyOwn = true;
    }
    if (!isAnyOwn || !left_.isAtomic) return;
    // The call was carried out as a whole, its deletions included; what conflicts was changed by others
    // since.
    for (CKDeleteResult &result : reply.deleted) {
      if (CKErrorIs(result.error, CKErrorCode::batchRequestFailed)) result.error = {};
    }
  }

  // All of an atomic call is tried again, or nothing.
  Attempt settleAtomic(CKModifyReply reply) {
    Attempt attempt;
    for (const CKRecordResult &result : reply.saved) note(result.error, attempt);
    for (const CKDeleteResult &result : reply.deleted) note(result.error, attempt);
    last_ = std::move(reply);
    return attempt;
  }
  static void note(const NSError &error, Attempt &attempt) {
    if (CKErrorIsTransient(error)) attempt.error = error;
  }

  Attempt settleEach(CKModifyReply reply) {
    Attempt attempt;
    CKModifyRequest again{{}, {}, left_.savePolicy, left_.isAtomic};
    last_ = {};
    for (std::size_t i = 0; i < reply.saved.size(); ++i) {
      if (CKErrorIsTransient(reply.saved[i].error)) {
        attempt.error = reply.saved[i].error;
        again.recordsToSave.push_back(std::move(left_.recordsToSave[i]));
        last_.saved.push_back(std::move(reply.saved[i]));
      } else {
        attempt.progressed = true;
        tell(std::move(reply.saved[i]));
      }
    }
    for (std::size_t i = 0; i < reply.deleted.size(); ++i) {
      if (CKErrorIsTransient(reply.deleted[i].error)) {
        attempt.error = reply.deleted[i].error;
        again.recordsToDelete.push_back(std::move(left_.recordsToDelete[i]));
        last_.deleted.push_back(std::move(reply.deleted[i]));
      } else {
        attempt.progressed = true;
        tell(std::move(reply.deleted[i]));
      }
    }
    left_ = std::move(again);
    return attempt;
  }

  void tell(CKRecordResult result) {
    hasFailures_ = hasFailures_ || result.error;
    operation_.reply_.saved.push_back(std::move(result));
    if (operation_.perRecordSaveBlock) operation_.perRecordSaveBlock(operation_.reply_.saved.back());
  }
  void tell(CKDeleteResult result) {
    hasFailures_ = hasFailures_ || result.error;
    operation_.reply_.deleted.push_back(std::move(result));
    if (operation_.perRecordDeleteBlock) operation_.perRecordDeleteBlock(operation_.reply_.deleted.back());
  }

  CKModifyRecordsOperation &operation_;
  CKModifyRequest left_;
  CKModifyReply last_;  // outcomes of the last try that aren't told yet
  bool isLastReplyWhole_ = false;
  bool mayHaveBeenDone_ = false;
  bool hasFailures_ = false;
};

NSError CKModifyRecordsOperation::perform() {
  return Run(*this).perform();
}

void CKModifyRecordsOperation::complete(const NSError &error) {
  reply_.error = error;
  if (modifyRecordsCompletionBlock) modifyRecordsCompletionBlock(reply_);
}

}  // namespace droxa
