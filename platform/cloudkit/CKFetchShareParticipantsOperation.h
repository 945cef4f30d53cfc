#pragma once

#include <functional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKOperation.h"

namespace droxa {

// Finds the accounts that may become participants, by their names or handles, as many as are asked for (in
// several calls where a cloud limits them). Thread contract: CKOperation's.
class CKFetchShareParticipantsOperation final : public CKOperation {
 public:
  std::vector<std::string> namesOrHandles;

  // Called once a name or handle, before the completion block.
  std::function<void(const CKShareParticipantResult &result)> perShareParticipantCompletionBlock;
  // nil: all were found; partialFailure: see the results; otherwise the operation failed as a whole, and
  // `results` are those that had been found before.
  std::function<void(const std::vector<CKShareParticipantResult> &results, const NSError &error)>
      fetchShareParticipantsCompletionBlock;

  const std::vector<CKShareParticipantResult> &results() const { return results_; }  // in the order asked for

 private:
  NSError perform() override;
  void complete(const NSError &error) override;
  Attempt attempt(const CKCallContext &context);
  std::vector<CKShareParticipantResult> results_;
};

}  // namespace droxa
