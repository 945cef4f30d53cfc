#include "tessaly/QVDaemonNotifications.h"

#include <algorithm>
#include <chrono>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "tessaly/QVAccount.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVNotifications.h"

namespace droxa {

namespace {

// 50 ms, doubled up to 3.2 s: soon enough after a restart, and cheap while there is no daemon for hours.
std::chrono::milliseconds pauseAfter(std::uint32_t failures) {
  return std::chrono::milliseconds(50) * (1U << std::min(failures - 1, 6U));
}

}  // namespace

class QVDaemonNotifications::Receiver final : public QVDaemonNotificationReceiving {
 public:
  Receiver(std::weak_ptr<QVDaemonNotifications> owner, std::uint64_t attempt)
      : owner_(std::move(owner)), attempt_(attempt) {}

  void receiveNotification(const std::string &name, QVReply reply) override {
    const auto owner = owner_.lock();
    if (owner && owner->isCurrent(attempt_)) post(name);
    reply();
  }

 private:
  const std::weak_ptr<QVDaemonNotifications> owner_;
  const std::uint64_t attempt_;
};

const std::shared_ptr<QVDaemonNotifications> &QVDaemonNotifications::shared() {
  static const auto *const notifications =
      new std::shared_ptr<QVDaemonNotifications>(std::make_shared<QVDaemonNotifications>());
  return *notifications;
}

void QVDaemonNotifications::subscribeIfNeeded(const std::shared_ptr<QVDaemonConnection> &connection) {
  std::uint64_t number = 0;
  {
    const Lock lock(mutex_);
    if (connection_.lock() == connection) return;
    connection_ = connection;
    failures_ = 0;
    missedSome_ = false;
    number = ++attempt_;
  }
  attempt(number);
}

// A subscription ends through the error handler of its call or, once it stands, through the connection's
// handler; both lead to failed(), which counts once an attempt.
void QVDaemonNotifications::attempt(std::uint64_t number) {
  std::shared_ptr<QVDaemonConnection> connection;
  {
    const Lock lock(mutex_);
    if (attempt_ != number) return;
    connection = connection_.lock();
  }
  if (!connection) return;
  const auto lost = [weak = weak_from_this(), number](const NSError &error) {
    if (const auto self = weak.lock()) self->failed(number, error);
  };
  connection->setInterruptionHandler(
      [lost] { lost(NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted)); });
  connection->remoteObjectProxyWithErrorHandler(lost)->subscribeToNotifications(
      std::make_shared<Receiver>(weak_from_this(), number),
      [weak = weak_from_this(), number](const NSError &error) {
        const auto self = weak.lock();
        if (!self) return;
        if (error)
          self->failed(number, error);
        else
          self->succeeded(number);
      });
}

void QVDaemonNotifications::succeeded(std::uint64_t number) {
  {
    const Lock lock(mutex_);
    if (attempt_ != number) return;
    failures_ = 0;
    if (!std::exchange(missedSome_, false)) return;
  }
  os_log_info(qvc_default_log(), "[INFO] the daemon is back");
  post(QVAccountTokenDidChangeNotification);
  post(QVContainerListDidChangeNotification);
}

void QVDaemonNotifications::failed(std::uint64_t number, const NSError &error) {
  std::uint64_t next = 0;
  std::uint32_t failures = 0;
  {
    const Lock lock(mutex_);
    if (attempt_ != number) return;
    next = ++attempt_;
    failures = ++failures_;
    missedSome_ = true;
  }
  if (failures == 1)
    os_log_info(qvc_default_log(), "[INFO] no notifications of the daemon for now: %@", error);
  dispatch_after_global(pauseAfter(failures), [weak = weak_from_this(), next] {
    if (const auto self = weak.lock()) self->attempt(next);
  });
}

bool QVDaemonNotifications::isCurrent(std::uint64_t number) {
  const Lock lock(mutex_);
  return attempt_ == number;
}

// The caches first: an observer that asks them must find the new state.
void QVDaemonNotifications::post(const std::string &name) {
  if (name == QVAccountTokenDidChangeNotification) QVAccount::forgetCachedAccount();
  if (name == QVContainerListDidChangeNotification) QVContainerCache::markOutOfDate();
  NSNotificationCenter::defaultCenter().postNotificationName(name);
}

}  // namespace droxa
