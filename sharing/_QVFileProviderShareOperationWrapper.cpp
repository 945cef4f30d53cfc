#include "sharing/_QVFileProviderShareOperationWrapper.h"

#include <utility>

namespace droxa {

_QVFileProviderShareOperationWrapper::_QVFileProviderShareOperationWrapper(
    std::shared_ptr<QVOperationClient> operation)
    : _QVFileProviderShareCancellableWrapper(operation), _wrapped(std::move(operation)) {}

_QVFileProviderShareOperationWrapper::~_QVFileProviderShareOperationWrapper() = default;

std::string _QVFileProviderShareOperationWrapper::description() const {
  return _wrapped ? _wrapped->description() : "(null)";
}

void _QVFileProviderShareOperationWrapper::progressCallbackWithTopic(const std::string &topic,
                                                                     const NSUserInfo &userInfo) {
  if (_wrapped) _wrapped->progressCallbackWithTopic(topic, userInfo);
}

void _QVFileProviderShareOperationWrapper::setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy,
                                                                   const NSUserInfo &userInfo) {
  const auto wrapper = std::make_shared<_QVFileProviderShareCancellableWrapper>(std::move(proxy));
  std::shared_ptr<_QVFileProviderShareCancellableWrapper> earlier = wrapper;  // released without the lock
  {
    const Lock lock(_lock);
    _remoteOperationProxy.swap(earlier);
  }
  if (_wrapped) _wrapped->setRemoteOperationProxy(wrapper, userInfo);
}

}  // namespace droxa
