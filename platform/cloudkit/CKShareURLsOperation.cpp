#include "platform/cloudkit/CKShareURLsOperation.h"

namespace droxa {

NSError CKShareURLsOperation::perform() {
  bool isPartial = false;
  for (const NSURL &url : shareURLs) {
    CKShareMetadataReply reply;
    const NSError error = retrying(Timing::call, [&](const CKCallContext &context) -> Attempt {
      reply = call(url, context);
      return {reply.error, false};
    });
    // The cloud can't be reached, or the operation was cancelled: the others would fare no better.
    if (CKErrorIsTransient(error) || CKErrorIs(error, CKErrorCode::operationCancelled)) return error;
    isPartial = isPartial || error;
    results_.push_back({url, error, std::move(reply.metadata)});
    if (perShareCompletionBlock) perShareCompletionBlock(results_.back());
  }
  return isPartial ? CKErrorMake(CKErrorCode::partialFailure, "Some shares couldn't be had") : NSError();
}

void CKShareURLsOperation::complete(const NSError &error) {
  if (sharesCompletionBlock) sharesCompletionBlock(results_, error);
}

CKShareMetadataReply CKFetchShareMetadataOperation::call(const NSURL &url, const CKCallContext &context) {
  return cloud().fetchShareMetadata(url, context);
}

CKShareMetadataReply CKAcceptSharesOperation::call(const NSURL &url, const CKCallContext &context) {
  return cloud().acceptShare(url, context);
}

}  // namespace droxa
