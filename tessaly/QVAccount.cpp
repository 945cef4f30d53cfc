#include "tessaly/QVAccount.h"

#include <utility>

#include "platform/foundation/NSNotificationCenter.h"
#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVDaemonNotifications.h"
#include "tessaly/QVNotifications.h"

namespace droxa {

namespace {

// What the store said when it was last read. A failed read is not kept: the next question reads again.
// Thread contract: any thread.
class CachedAccount {
 public:
  static CachedAccount &shared() {
    static CachedAccount *const cached = new CachedAccount;  // outlives every thread that may ask
    return *cached;
  }

  std::shared_ptr<const QVAccount> read(NSError *error) {
    const std::string folder = DroxaProcessHome().configuration();
    const Lock lock(mutex_);
    observe();
    if (known_ && folder_ == folder) return account_;
    NSError problem;
    account_ = QVAccountStoreRead(folder, &problem);
    folder_ = folder;
    known_ = !problem;
    if (problem && error) *error = problem;
    return account_;
  }

  void forget() {
    const Lock lock(mutex_);
    known_ = false;
    observe();
  }

 private:
  void observe() REQUIRES(mutex_) {
    if (std::exchange(observing_, true)) return;
    NSNotificationCenter::defaultCenter().addObserver(
        this, [this] { forget(); }, QVAccountTokenDidChangeNotification);
  }

  Mutex mutex_;
  bool known_ GUARDED_BY(mutex_) = false;
  bool observing_ GUARDED_BY(mutex_) = false;
  std::string folder_ GUARDED_BY(mutex_);
  std::shared_ptr<const QVAccount> account_ GUARDED_BY(mutex_);
};

}  // namespace

QVAccount::QVAccount(std::string name, std::optional<std::string> perAppAccountIdentifier)
    : name_(std::move(name)), perAppAccountIdentifier_(std::move(perAppAccountIdentifier)) {}

std::shared_ptr<const QVAccount> QVAccount::currentCachedLoggedInAccountWithError(NSError *error) {
  return CachedAccount::shared().read(error);
}

void QVAccount::startAccountTokenChangeObserverIfNeeded() {
  forgetCachedAccount();  // and follows the notification from here on, ahead of the caller's own observers
  QVDaemonNotifications::shared()->subscribeIfNeeded(QVDaemonConnection::defaultConnection());
}

void QVAccount::forgetCachedAccount() {
  CachedAccount::shared().forget();
}

}  // namespace droxa
