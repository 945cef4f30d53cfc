#pragma once

#include <functional>
#include <optional>

#include "platform/cloudkit/CKDigest.h"
#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Gives the bytes of an asset to a sink, in order and each once: a broken transfer goes on where it stopped.
// Thread contract: CKOperation's.
class CKFetchAssetOperation final : public CKOperation {
 public:
  CKAssetReference asset;
  std::uint64_t offset = 0;  // where to begin; the bytes before it are those of an earlier transfer
  // The digest of the bytes before the offset (its size() must be the offset). Without it a transfer that
  // doesn't begin at 0 isn't verified, which is then the caller's to do.
  std::optional<CKDigest> digestBeforeOffset;

  // Takes the next bytes; an error that it returns is final, and the operation's outcome.
  CKAssetSink sink;
  CKProgressHandler perProgressBlock;
  // nil: all bytes were given, and, unless nothing could be verified, they are the asset's.
  // assetNotAvailable: damaged, or other bytes came than the reference names: throw away what the sink got.
  std::function<void(std::uint64_t endOffset, const NSError &error)> fetchAssetCompletionBlock;

  std::uint64_t endOffset() const { return endOffset_; }  // how far the sink was filled
  const std::optional<CKDigest> &digest() const {
    return digest_;
  }  // of the bytes before endOffset(), if known

 private:
  NSError perform() override;
  void complete(const NSError &error) override;
  Attempt transfer(const CKCallContext &context);
  NSError take(std::span<const std::uint8_t> bytes);
  NSError sinkError_;
  std::uint64_t endOffset_ = 0;
  std::optional<CKDigest> digest_;
};

}  // namespace droxa
