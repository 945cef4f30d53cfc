#include "platform/fileprovider/FPDActionOutcome.h"

#include <utility>

namespace droxa {

void FPDActionOutcome::wait(NSFileProviderItemCompletion completion) {
  Result result;
  {
    const Lock held(lock_);
    if (!result_) {
      waiting_.push_back(std::move(completion));
      return;
    }
    result = *result_;
  }
  completion(result.item, result.error);
}

bool FPDActionOutcome::hasEnded() const {
  const Lock held(lock_);
  return result_.has_value();
}

bool FPDActionOutcome::end(const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error) {
  std::vector<NSFileProviderItemCompletion> answered;
  {
    const Lock held(lock_);
    if (result_) return false;
    result_ = Result{item, error};
    answered.swap(waiting_);
  }
  for (const NSFileProviderItemCompletion &completion : answered) completion(item, error);
  return true;
}

}  // namespace droxa
