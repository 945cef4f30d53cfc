#pragma once

#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSObject.h"

namespace droxa {

// An operation of another process that can be cancelled.
class QVCancellable {
 public:
  virtual ~QVCancellable() = default;
  // Its reply still comes. Called any number of times, also when it has ended.
  virtual void invalidate() = 0;
};

// A client's side of an operation that the daemon carries out: told how far it is, and given the daemon's
// side to cancel it by. The daemon lets go of it when the operation has ended. Calls that can't be delivered
// are lost. Called one at a time, on any thread.
class QVOperationClient : public virtual QVCancellable, public NSObject {
 public:
  virtual void progressCallbackWithTopic(const std::string &topic, const NSUserInfo &userInfo) = 0;
  // At most a few times, before the operation's reply; the last proxy is the one that counts. Null when there
  // is nothing to cancel.
  virtual void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &userInfo) = 0;
};

}  // namespace droxa
