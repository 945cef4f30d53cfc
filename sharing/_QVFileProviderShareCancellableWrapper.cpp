#include "sharing/_QVFileProviderShareCancellableWrapper.h"

#include <utility>

namespace droxa {

_QVFileProviderShareCancellableWrapper::_QVFileProviderShareCancellableWrapper(
    std::shared_ptr<QVCancellable> cancellable)
    : _cancellable(std::move(cancellable)) {}

void _QVFileProviderShareCancellableWrapper::invalidate() {
  if (_cancellable) _cancellable->invalidate();
}

}  // namespace droxa
