#pragma once

#include <cstdint>
#include <functional>
#include <optional>
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
  // Contents of the records' assets are fetched too, into files in memory, where this is set: of at most that
  // many bytes each. A record without all of them has an error, beside its other fields: limitExceeded for a
  // larger asset, else what reading it answered.
  std::optional<std::uint64_t> largestAssetToFetch;

  // Called once a record, when its outcome is final, before the completion block. Not called for records
  // whose outcome is not known because the operation failed as a whole. Assets that were fetched are file
  // assets here alone, and their files go with the last copy.
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
  Attempt attemptPage(const CKCallContext &context, std::vector<CKRecordID> *again);
  // The record as the block gets it; its error becomes the result's.
  std::optional<CKRecord> fetchAssets(CKRecordResult &result, const CKCallContext &context);
  CKAsset fetchAsset(const CKAssetReference &asset, const CKCallContext &context, NSError *error);
  void tell(CKRecordResult result, std::optional<CKRecord> withAssets = {});
  bool failedAsAWhole_ = false;             // the last call
  std::vector<CKRecordID> left_;            // without a final outcome
  std::vector<CKRecordResult> failedLast_;  // of them, what those answered that were asked for last
  std::vector<CKRecordResult> results_;
};

}  // namespace droxa
