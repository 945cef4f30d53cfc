#include "platform/cloudkit/CKFetchRecordsOperation.h"

#include <algorithm>

namespace droxa {

// `left` are the records without a final outcome. Those whose error is transient stay in it for another try;
// what they answered last is their outcome when there is none.
NSError CKFetchRecordsOperation::perform() {
  std::vector<CKRecordID> left = recordIDs;
  std::vector<CKRecordResult> failedLast;
  const NSError error = retrying(Timing::call, [&](const CKCallContext &context) -> Attempt {
    Attempt attempt;
    std::vector<CKRecordID> again;
    failedLast.clear();
    while (!left.empty()) {
      const std::size_t count = std::min(left.size(), CKMostRecordsPerCall);
      const std::vector<CKRecordID> some(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(count));
      CKFetchReply reply = cloud().fetchRecords(some, desiredKeys, context);
      if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) {
        left.insert(left.end(), again.begin(), again.end());
        return {reply.error, attempt.progressed};
      }
      left.erase(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(count));
      for (CKRecordResult &result : reply.results) {
        if (CKErrorIsTransient(result.error)) {
          attempt.error = result.error;
          again.push_back(result.recordID);
          failedLast.push_back(std::move(result));
        } else {
          attempt.progressed = true;
          tell(std::move(result));
        }
      }
    }
    left = std::move(again);
    return attempt;
  });
  const bool isWhole = left.size() == failedLast.size() && !CKErrorIs(error, CKErrorCode::operationCancelled);
  if (!isWhole) return error;
  for (CKRecordResult &result : failedLast) tell(std::move(result));
  const bool isPartial = std::any_of(results_.begin(), results_.end(),
                                     [](const CKRecordResult &result) { return bool{result.error}; });
  return isPartial ? CKErrorMake(CKErrorCode::partialFailure, "Some records weren't fetched") : NSError();
}

void CKFetchRecordsOperation::tell(CKRecordResult result) {
  results_.push_back(std::move(result));
  if (perRecordCompletionBlock) perRecordCompletionBlock(results_.back());
}

void CKFetchRecordsOperation::complete(const NSError &error) {
  if (fetchRecordsCompletionBlock) fetchRecordsCompletionBlock(results_, error);
}

}  // namespace droxa
