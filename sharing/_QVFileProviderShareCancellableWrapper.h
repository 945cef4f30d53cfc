#pragma once

#include <memory>

#include "tessaly/QVOperationClient.h"

namespace droxa {

// Lets its holder cancel an operation, and do nothing else with it. Thread contract: immutable; calls go on
// to the operation on the calling thread.
class _QVFileProviderShareCancellableWrapper : public virtual QVCancellable {
 public:
  // Null: there is nothing to cancel.
  explicit _QVFileProviderShareCancellableWrapper(std::shared_ptr<QVCancellable> cancellable);
  void invalidate() override;

 private:
  const std::shared_ptr<QVCancellable> _cancellable;
};

}  // namespace droxa
