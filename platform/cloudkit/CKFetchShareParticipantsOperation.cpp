#include "platform/cloudkit/CKFetchShareParticipantsOperation.h"

#include <algorithm>

namespace droxa {

NSError CKFetchShareParticipantsOperation::perform() {
  while (results_.size() < namesOrHandles.size()) {
    const NSError error =
        retrying(Timing::call, [this](const CKCallContext &context) { return attempt(context); });
    if (error) return error;
  }
  const bool isPartial =
      std::any_of(results_.begin(), results_.end(),
                  [](const CKShareParticipantResult &result) { return bool{result.error}; });
  return isPartial ? CKErrorMake(CKErrorCode::partialFailure, "Some accounts weren't found") : NSError();
}

// Asks for the next ones.
CKOperation::Attempt CKFetchShareParticipantsOperation::attempt(const CKCallContext &context) {
  const auto first = namesOrHandles.begin() + static_cast<std::ptrdiff_t>(results_.size());
  const std::size_t count = std::min(namesOrHandles.size() - results_.size(), CKMostShareParticipants);
  CKShareParticipantsReply reply =
      cloud().lookUpShareParticipants({first, first + static_cast<std::ptrdiff_t>(count)}, context);
  if (reply.error && !CKErrorIs(reply.error, CKErrorCode::partialFailure)) return {reply.error, false};
  if (reply.results.size() != count) {
    return {CKErrorMake(CKErrorCode::internalError, "The cloud answered about other accounts"), false};
  }
  for (CKShareParticipantResult &result : reply.results) {
    results_.push_back(std::move(result));
    if (perShareParticipantCompletionBlock) perShareParticipantCompletionBlock(results_.back());
  }
  return {{}, true};
}

void CKFetchShareParticipantsOperation::complete(const NSError &error) {
  if (fetchShareParticipantsCompletionBlock) fetchShareParticipantsCompletionBlock(results_, error);
}

}  // namespace droxa
