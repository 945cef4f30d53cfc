#include "platform/cloudkit/CKFetchRecordsOperation.h"

#include <algorithm>

namespace droxa {

NSError CKFetchRecordsOperation::perform() {
  left_ = recordIDs;
  const NSError error =
      retrying(Timing::call, [this](const CKCallContext &context) { return attempt(context); });
  const bool isWhole = left_.size() == failedLast_.size();
  if (!isWhole || CKErrorIs(error, CKErrorCode::operationCancelled)) return error;
  for (CKRecordResult &result : failedLast_) tell(std::move(result));
  const bool isPartial = std::any_of(results_.begin(), results_.end(),
                                     [](const CKRecordResult &result) { return bool{result.error}; });
  return isPartial ? CKErrorMake(CKErrorCode::partialFailure, "Some records weren't fetched") : NSError();
}

// Records whose error is transient stay for another try; what they answered last is their outcome when there
// is none.
CKOperation::Attempt CKFetchRecordsOperation::attempt(const CKCallContext &context) {
  Attempt attempt;
  std::vector<CKRecordID> again;
  failedLast_.clear();
  while (!left_.empty()) {
    const auto count = static_cast<std::ptrdiff_t>(std::min(left_.size(), CKMostRecordsPerCall));
    CKFetchReply reply = cloud().fetchRecords({left_.begin(), left_.begin() + count}, desiredKeys, context);
    if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) {
      left_.insert(left_.end(), again.begin(), again.end());
      return {reply.error, attempt.progressed};
    }
    left_.erase(left_.begin(), left_.begin() + count);
    for (CKRecordResult &result : reply.results) {
      if (CKErrorIsTransient(result.error)) {
        attempt.error = result.error;
        again.push_back(result.recordID);
        failedLast_.push_back(std::move(result));
      } else {
        attempt.progressed = true;
        tell(std::move(result));
      }
    }
  }
  left_ = std::move(again);
  return attempt;
}

void CKFetchRecordsOperation::tell(CKRecordResult result) {
  results_.push_back(std::move(result));
  if (perRecordCompletionBlock) perRecordCompletionBlock(results_.back());
}

void CKFetchRecordsOperation::complete(const NSError &error) {
  if (fetchRecordsCompletionBlock) fetchRecordsCompletionBlock(results_, error);
}

}  // namespace droxa
