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
  bool isAbandoned = false;
  {
    const Lock lock(_lock);
    _remoteOperationProxy.swap(earlier);
    isAbandoned = isAbandoned_;
  }
  if (isAbandoned) wrapper->invalidate();
  if (_wrapped) _wrapped->setRemoteOperationProxy(wrapper, userInfo);
}

void _QVFileProviderShareOperationWrapper::abandon() {
  std::shared_ptr<_QVFileProviderShareCancellableWrapper> remote;
  {
    const Lock lock(_lock);
    isAbandoned_ = true;
    remote = _remoteOperationProxy;
  }
  if (remote) remote->invalidate();
}

}  // namespace droxa
