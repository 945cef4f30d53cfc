#pragma once

#include <memory>
#include <string>

#include "platform/foundation/ThreadSafety.h"
#include "sharing/_QVFileProviderShareCancellableWrapper.h"

namespace droxa {

// A client's operation as the daemon gets it: it can report progress, hand over the operation on its own
// side, and cancel. Neither side ever has the other's operation itself; what the daemon hands over reaches
// the client as something to cancel.
// Thread contract: any thread; calls go on to the client's operation on the calling thread, without the lock.
class _QVFileProviderShareOperationWrapper final : public _QVFileProviderShareCancellableWrapper,
                                                   public QVOperationClient {
 public:
  // Null: a client that gave no operation isn't told anything.
  explicit _QVFileProviderShareOperationWrapper(std::shared_ptr<QVOperationClient> operation);
  ~_QVFileProviderShareOperationWrapper() override;
  _QVFileProviderShareOperationWrapper(const _QVFileProviderShareOperationWrapper &) = delete;
  _QVFileProviderShareOperationWrapper &operator=(const _QVFileProviderShareOperationWrapper &) = delete;

  std::string description() const override;
  void progressCallbackWithTopic(const std::string &topic, const NSUserInfo &userInfo) override;
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &userInfo) override;

  // The client has gone: cancels the daemon's side, now or when it is handed over, since nobody else can.
  void abandon();

 private:
  const std::shared_ptr<QVOperationClient> _wrapped;
  Mutex _lock;
  std::shared_ptr<_QVFileProviderShareCancellableWrapper> _remoteOperationProxy GUARDED_BY(_lock);
  bool isAbandoned_ GUARDED_BY(_lock) = false;
};

}  // namespace droxa
