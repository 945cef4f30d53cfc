#include "platform/cloudkit/CKFetchRecordsOperation.h"

#include <algorithm>
#include <cerrno>
#include <span>
#include <sys/mman.h>
#include <unistd.h>
#include <utility>

#include "platform/cloudkit/CKDigest.h"

namespace droxa {
namespace {

// A file that has no name and goes with its last descriptor. Thread contract: one thread.
class MemoryFile {
 public:
  MemoryFile() : descriptor_(memfd_create("droxa-asset", MFD_CLOEXEC)) {}
  ~MemoryFile() {
    if (descriptor_ >= 0) close(descriptor_);
  }
  MemoryFile(const MemoryFile &) = delete;
  MemoryFile &operator=(const MemoryFile &) = delete;

  int descriptor() const { return descriptor_; }
  NSError write(std::span<const std::uint8_t> bytes) const {
    while (!bytes.empty()) {
      const ssize_t count = ::write(descriptor_, bytes.data(), bytes.size());
      if (count < 0 && errno == EINTR) continue;
      if (count < 0) return NSError::errorWithPOSIXCode(errno, "an asset can't be kept in memory");
      bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
    return {};
  }

 private:
  const int descriptor_;
};

}  // namespace

NSError CKFetchRecordsOperation::perform() {
  left_ = recordIDs;
  const NSError error = retrying(largestAssetToFetch ? Timing::transfer : Timing::call,
                                 [this](const CKCallContext &context) { return attempt(context); });
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
    const Attempt page = attemptPage(context, &again);
    attempt.progressed = attempt.progressed || page.progressed;
    if (!page.error) continue;
    attempt.error = page.error;
    if (failedAsAWhole_) break;
  }
  left_.insert(left_.end(), again.begin(), again.end());
  return attempt;
}

// The next records, as many as one call may ask for.
CKOperation::Attempt CKFetchRecordsOperation::attemptPage(const CKCallContext &context,
                                                          std::vector<CKRecordID> *again) {
  Attempt attempt;
  const auto count = static_cast<std::ptrdiff_t>(std::min(left_.size(), CKMostRecordsPerCall));
  CKFetchReply reply = cloud().fetchRecords({left_.begin(), left_.begin() + count}, desiredKeys, context);
  failedAsAWhole_ = reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure);
  if (failedAsAWhole_) return {reply.error, false};
  left_.erase(left_.begin(), left_.begin() + count);
  for (CKRecordResult &result : reply.results) {
    auto withAssets = fetchAssets(result, context);
    if (CKErrorIs(result.error, CKErrorCode::operationCancelled)) {
      // Nothing is known of this record, nor of those after it.
      for (const CKRecordResult *rest = &result; rest != &reply.results.back() + 1; ++rest)
        again->push_back(rest->recordID);
      failedAsAWhole_ = true;
      return {result.error, attempt.progressed};
    }
    if (CKErrorIsTransient(result.error)) {
      attempt.error = result.error;
      again->push_back(result.recordID);
      failedLast_.push_back(std::move(result));
    } else {
      attempt.progressed = true;
      tell(std::move(result), std::move(withAssets));
    }
  }
  return attempt;
}

std::optional<CKRecord> CKFetchRecordsOperation::fetchAssets(CKRecordResult &result,
                                                             const CKCallContext &context) {
  if (!largestAssetToFetch || result.error) return std::nullopt;
  CKRecord fetched = result.record;
  for (auto &[key, value] : fetched.fields) {
    CKAsset *asset = std::get_if<CKAsset>(&value);
    if (!asset || !asset->isReference()) continue;
    *asset = fetchAsset(asset->reference(), context, &result.error);
    if (result.error) return std::nullopt;
  }
  return fetched;
}

CKAsset CKFetchRecordsOperation::fetchAsset(const CKAssetReference &asset, const CKCallContext &context,
                                            NSError *error) {
  if (asset.size > *largestAssetToFetch) {
    *error = CKErrorMake(CKErrorCode::limitExceeded,
                         "An asset is larger than was asked for: " + asset.description());
    return {};
  }
  MemoryFile file;
  CKDigest digest;
  noteProgress();
  *error = cloud().readAsset(
      asset, 0,
      [&](std::span<const std::uint8_t> bytes) {
        noteProgress();
        digest.update(bytes);
        return file.write(bytes);
      },
      {}, context);
  if (*error) return {};
  if (digest.size() != asset.size || digest.hex() != asset.sha256) {
    *error =
        CKErrorMake(CKErrorCode::assetNotAvailable, "Other bytes came than those of " + asset.description());
    return {};
  }
  return CKAsset::assetWithDescriptor(file.descriptor(), error);
}

void CKFetchRecordsOperation::tell(CKRecordResult result, std::optional<CKRecord> withAssets) {
  results_.push_back(std::move(result));
  if (!perRecordCompletionBlock) return;
  if (!withAssets) return perRecordCompletionBlock(results_.back());
  perRecordCompletionBlock({results_.back().recordID, results_.back().error, *std::move(withAssets)});
}

void CKFetchRecordsOperation::complete(const NSError &error) {
  if (fetchRecordsCompletionBlock) fetchRecordsCompletionBlock(results_, error);
}

}  // namespace droxa
