#pragma once

#include <functional>
#include <vector>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Goes to shares by their URLs, one call each; a call whose error is transient is made again.
// Thread contract: CKOperation's.
class CKShareURLsOperation : public CKOperation {
 public:
  struct Result {
    NSURL URL;
    NSError error;
    CKShareMetadata metadata;
  };

  std::vector<NSURL> shareURLs;

  // Called once a URL, when its outcome is final, before the completion block.
  std::function<void(const Result &result)> perShareCompletionBlock;
  // nil: all went well; partialFailure: see the results; otherwise the operation ended with that error, and
  // `results` are those before it.
  std::function<void(const std::vector<Result> &results, const NSError &error)> sharesCompletionBlock;

  const std::vector<Result> &results() const { return results_; }  // in the order of the URLs

 protected:
  virtual CKShareMetadataReply call(const NSURL &url, const CKCallContext &context) = 0;

 private:
  NSError perform() final;
  void complete(const NSError &error) final;
  std::vector<Result> results_;
};

// What the shares are, for who has their URLs; see CKCloud::fetchShareMetadata.
class CKFetchShareMetadataOperation final : public CKShareURLsOperation {
  CKShareMetadataReply call(const NSURL &url, const CKCallContext &context) override;
};

// Accepts the shares; see CKCloud::acceptShare.
class CKAcceptSharesOperation final : public CKShareURLsOperation {
  CKShareMetadataReply call(const NSURL &url, const CKCallContext &context) override;
};

}  // namespace droxa
