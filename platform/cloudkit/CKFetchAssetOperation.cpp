#include "platform/cloudkit/CKFetchAssetOperation.h"

namespace droxa {

NSError CKFetchAssetOperation::perform() {
  if (!sink || !asset.isWellFormed() || offset > asset.size ||
      (digestBeforeOffset && digestBeforeOffset->size() != offset)) {
    return CKErrorMake(CKErrorCode::invalidArguments, "Not to be fetched so: " + asset.description());
  }
  endOffset_ = offset;
  if (digestBeforeOffset) {
    digest_ = digestBeforeOffset;
  } else if (offset == 0) {
    digest_.emplace();
  }
  NSError error =
      retrying(Timing::transfer, [this](const CKCallContext &context) { return transfer(context); });
  if (sinkError_) return sinkError_;
  if (error) return error;
  if (endOffset_ == asset.size && (!digest_ || digest_->hex() == asset.sha256)) return {};
  return CKErrorMake(CKErrorCode::assetNotAvailable, "Other bytes came than those of " + asset.description());
}

CKOperation::Attempt CKFetchAssetOperation::transfer(const CKCallContext &context) {
  const std::uint64_t start = endOffset_;
  NSError refused;
  const auto take = [&](std::span<const std::uint8_t> bytes) {
    noteProgress();
    refused = this->take(bytes);
    return refused;
  };
  const NSError error = cloud().readAsset(
      asset, start, take,
      [this](std::uint64_t done, std::uint64_t total) {
        if (perProgressBlock) perProgressBlock(done, total);
      },
      context);
  if (refused) {
    sinkError_ = refused;
    // Final, whatever its domain and code.
    return {CKErrorIsTransient(refused) ? NSError() : refused, true};
  }
  if (!error && endOffset_ < asset.size) {
    return {CKErrorMake(CKErrorCode::networkFailure, "The transfer ended early: " + asset.description()),
            endOffset_ > start};
  }
  return {error, endOffset_ > start};
}

NSError CKFetchAssetOperation::take(std::span<const std::uint8_t> bytes) {
  if (bytes.size() > asset.size - endOffset_) {
    return CKErrorMake(CKErrorCode::assetNotAvailable, "Too many bytes came for " + asset.description());
  }
  if (NSError refused = sink(bytes)) return refused;
  if (digest_) digest_->update(bytes);
  endOffset_ += bytes.size();
  return {};
}

void CKFetchAssetOperation::complete(const NSError &error) {
  if (fetchAssetCompletionBlock) fetchAssetCompletionBlock(endOffset_, error);
}

}  // namespace droxa
