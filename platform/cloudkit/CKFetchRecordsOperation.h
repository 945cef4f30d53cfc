#pragma once

#include <functional>
#include <vector>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Fetches records by their ids, as many as are asked for (in several calls where a cloud limits them).
// Records whose own error is transient are asked for again.
// Thread contract: CKOperation's.
class CKFetchRecordsOperation final : public CKOperation {
 public:
  std::vector<CKRecordID> recordIDs;
  CKDesiredKeys desiredKeys;

  // Called once a record, when its outcome is final, before the completion block. Not called for records
  // whose outcome is not known because the operation failed as a whole.
  std::function<void(const CKRecordResult &result)> perRecordCompletionBlock;
  // nil: all were fetched; partialFailure: see the results; otherwise the operation failed as a whole and
  // `results` are those that had been fetched before.
  std::function<void(const std::vector<CKRecordResult> &results, const NSError &error)>
      fetchRecordsCompletionBlock;

  const std::vector<CKRecordResult> &results() const { return results_; }  // in the order they became final

 private:
  NSError perform() override;
  void complete(const NSError &error) override;
  Attempt attempt(const CKCallContext &context);
  void tell(CKRecordResult result);
  std::vector<CKRecordID> left_;            // without a final outcome
  std::vector<CKRecordResult> failedLast_;  // of them, what those answered that were asked for last
  std::vector<CKRecordResult> results_;
};

}  // namespace droxa
