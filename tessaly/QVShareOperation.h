#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <tuple>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVOperationClient.h"
#include "tessaly/QVRememberedCompletion.h"

namespace droxa {

// The base of the sharing operations: one call of the daemon (or several in a row) as an operation that a
// queue runs and that can be cancelled. `Values` are what its completion gets, an NSError last.
//
// The completion is called exactly once, also when the operation is cancelled before a queue has started it:
// with what the daemon answered, with QVErrorCancelled, or with the connection's error when the daemon goes;
// next to those two there are no values. A cancelled operation tells the daemon, and doesn't wait for its
// answer: what it was to change may have been changed all the same. It keeps no thread while it waits.
//
// Thread contract: any thread. The completion runs on the pool or on a thread of the daemon's connection,
// under the persona under which it was set, with no lock held.
template <class... Values>
class QVShareOperation : public NSOperation,
                         public QVOperationClient,
                         public std::enable_shared_from_this<QVShareOperation<Values...>> {
 public:
  using Completion = std::function<void(const Values &...)>;

  QVShareOperation(const QVShareOperation &) = delete;
  QVShareOperation &operator=(const QVShareOperation &) = delete;

  bool isAsynchronous() const final { return true; }
  void main() final;
  void cancel() final;

  // What the daemon tells the operation.
  void progressCallbackWithTopic(const std::string & /*topic*/, const NSUserInfo & /*info*/) final {}
  void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &userInfo) final;
  void invalidate() final { cancel(); }

 protected:
  // `what` names it in the error of its cancellation ("saving the share of …").
  explicit QVShareOperation(std::string what) : what_(std::move(what)) {}

  // Set once; when everything is over already, it is called at once, on the pool.
  void setCompletion(Completion completion);
  // Asks the daemon and has the answer given to end(). Called once, on a thread of the queue.
  virtual void ask() = 0;

  // The daemon, for one call: whose failure ends the operation.
  std::shared_ptr<QVProtocol> daemon() {
    return QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(
        [self = this->shared_from_this()](const NSError &error) { self->fail(error); });
  }
  // The operation as its calls pass it along.
  std::shared_ptr<QVOperationClient> client() { return this->shared_from_this(); }
  // What a call's reply may be.
  Completion ending() {
    return [self = this->shared_from_this()](const Values &...values) { self->end(values...); };
  }
  void end(const Values &...values) { endWith(std::tuple<Values...>(values...)); }
  void fail(const NSError &error) {
    std::tuple<Values...> nothing;
    std::get<sizeof...(Values) - 1>(nothing) = error;
    endWith(std::move(nothing));
  }

 private:
  using Outcome = std::tuple<Values...>;
  using Delivery = QVRememberedCompletion<Values...>;

  void endWith(Outcome outcome);

  const std::string what_;

  Mutex mutex_;
  bool mainRan_ GUARDED_BY(mutex_) = false;
  std::shared_ptr<QVCancellable> remote_ GUARDED_BY(mutex_);
  std::shared_ptr<Delivery> delivery_ GUARDED_BY(mutex_);
  std::optional<Outcome> outcome_ GUARDED_BY(mutex_);  // once it is over
};

template <class... Values>
void QVShareOperation<Values...>::setCompletion(Completion completion) {
  auto delivery = std::make_shared<Delivery>(std::move(completion));
  std::optional<Outcome> outcome;
  {
    const Lock lock(mutex_);
    if (!outcome_) {
      delivery_ = std::move(delivery);
      return;
    }
    outcome = outcome_;
  }
  dispatch_async_global([delivery, outcome] { delivery->deliver(*outcome); });
}

template <class... Values>
void QVShareOperation<Values...>::main() {
  bool isOver = false;
  {
    const Lock lock(mutex_);
    mainRan_ = true;
    isOver = outcome_.has_value();
  }
  // One that was cancelled a moment ago ends on the pool, and is finished there.
  if (isOver) return finish();
  if (!isCancelled()) ask();
}

// The completion doesn't wait for the daemon's answer, which may never come.
template <class... Values>
void QVShareOperation<Values...>::cancel() {
  NSOperation::cancel();
  std::shared_ptr<QVCancellable> remote;
  {
    const Lock lock(mutex_);
    if (outcome_) return;
    remote.swap(remote_);
  }
  // On the pool: whoever cancels may hold what the completion needs.
  dispatch_async_global([self = this->shared_from_this(), remote] {
    self->fail(qvc_error(QVErrorCancelled, self->what_ + " was cancelled"));
    if (remote) remote->invalidate();
  });
}

template <class... Values>
void QVShareOperation<Values...>::setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy,
                                                          const NSUserInfo & /*userInfo*/) {
  bool isTooLate = false;
  {
    const Lock lock(mutex_);
    isTooLate = outcome_.has_value() || isCancelled();
    if (!isTooLate) remote_.swap(proxy);  // the one before is released without the lock
  }
  if (isTooLate && proxy) proxy->invalidate();
}

template <class... Values>
void QVShareOperation<Values...>::endWith(Outcome outcome) {
  std::shared_ptr<Delivery> delivery;
  std::shared_ptr<QVCancellable> released;
  bool mainRan = false;
  {
    const Lock lock(mutex_);
    if (outcome_) return;
    outcome_ = outcome;
    delivery.swap(delivery_);
    released.swap(remote_);
    mainRan = mainRan_;
  }
  if (delivery) delivery->deliver(outcome);
  if (mainRan) finish();  // otherwise the queue does, which never runs it, or main()
}

}  // namespace droxa
