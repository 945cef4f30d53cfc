#include "platform/cloudkit/CKUploadAssetOperation.h"

#include "platform/cloudkit/CKAssetFile.h"

namespace droxa {

NSError CKUploadAssetOperation::perform() {
  const CKAssetFile open(file);
  if (open.error()) return open.error();
  const std::uint64_t size = expectedSize.value_or(open.size());
  return retrying(Timing::transfer, [&](const CKCallContext &context) -> Attempt {
    const auto progress = [this](std::uint64_t done, std::uint64_t total) {
      noteProgress();
      if (perProgressBlock) perProgressBlock(done, total);
    };
    CKUploadReply reply = cloud().uploadAsset(open.descriptor(), size, progress, context);
    uploaded_ = std::move(reply.asset);
    return {reply.error, false};
  });
}

void CKUploadAssetOperation::complete(const NSError &error) {
  if (uploadAssetCompletionBlock) uploadAssetCompletionBlock(uploaded_, error);
}

}  // namespace droxa
