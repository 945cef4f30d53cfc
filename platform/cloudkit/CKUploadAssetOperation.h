#pragma once

#include <functional>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Uploads a file's contents, so that a record can refer to them. Uploading again is cheap: the parts that
// the cloud has are not sent again.
// Thread contract: CKOperation's.
class CKUploadAssetOperation final : public CKOperation {
 public:
  CKAsset file;  // made with a path or a descriptor
  // What the file must have; absent: what it has at the start.
  std::optional<std::uint64_t> expectedSize;

  CKProgressHandler perProgressBlock;  // starts over when the operation retries
  // nil and a reference; or nil asset and the error: assetFileNotFound, assetFileModified, quotaExceeded, …
  std::function<void(const CKAsset &reference, const NSError &error)> uploadAssetCompletionBlock;

  const CKAsset &uploadedAsset() const { return uploaded_; }  // a reference; nil after an error

 private:
  NSError perform() override;
  void complete(const NSError &error) override;
  CKAsset uploaded_;
};

}  // namespace droxa
