#include "enumeration/QVFileEnumerator.h"

#include <algorithm>
#include <utility>

#include "additions/QVLogSection.h"
#include "additions/QVPersonaAdoption.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileProviderManager.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVNotifications.h"

namespace droxa {

namespace {

constexpr std::uint64_t kWatchChildren = QVWatchUpdates | QVWatchDeaths | QVWatchCoalesced;
constexpr std::uint64_t kWatchSubtree = kWatchChildren | QVWatchSubtree;
static_assert(kWatchChildren == 19 && kWatchSubtree == 23);

// As many pending changes start a new generation instead: listing the folder anew is then the cheaper way.
constexpr std::size_t kTooManyPendingChanges = 5001;

}  // namespace

std::shared_ptr<QVFileEnumerator> QVFileEnumerator::initWithFileObjectID(
    std::optional<QVFileObjectID> fileObjectID, NSURL url, std::string itemIdentifier, bool recursive) {
  if (!url) {
    os_log_error(qvc_default_log(), "[ERROR] can't create a file enumeration without a url");
    return nullptr;
  }
  return std::shared_ptr<QVFileEnumerator>(
      new QVFileEnumerator(fileObjectID, std::move(url), std::move(itemIdentifier), recursive));
}

QVFileEnumerator::QVFileEnumerator(std::optional<QVFileObjectID> fileObjectID, NSURL url,
                                   std::string itemIdentifier, bool recursive)
    : QVBaseFileEnumerator(fileObjectID, std::move(itemIdentifier), recursive), _url(std::move(url)) {}

std::shared_ptr<QVFileEnumerator> QVFileEnumerator::sharedSelf() {
  return std::static_pointer_cast<QVFileEnumerator>(shared_from_this());
}

void QVFileEnumerator::setupNotificationReceivingIfNeededWithCompletion(SetupCompletion completion) {
  _dispatchAsync([self = sharedSelf(), completion = std::move(completion)] {
    self->_setupNotificationReceivingIfNeededWithCompletion(completion);
  });
}

void QVFileEnumerator::_setupNotificationReceivingIfNeededWithCompletion(const SetupCompletion &completion) {
  dispatch_assert_queue(_queue);
  _startObservingAccountChangesIfNeeded();
  // Two listings at once get here. The second asks for a sender of its own and goes on, deliberately.
  if (_isSettingUpNotificationReceiving) {
    os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: !_isSettingUpNotificationReceiving");
  }
  _isSettingUpNotificationReceiving = true;
  const SetupCompletion finish = [self = sharedSelf(), completion](const NSError &error) {
    dispatch_assert_queue(self->_queue);
    self->_isSettingUpNotificationReceiving = false;
    completion(error);
  };
  if (_remoteNotificationSender) {
    finish(NSError());
    return;
  }
  askForUpdateSender(finish);
}

// The connection answers on threads of its own; what `finish` touches belongs to `_queue`.
void QVFileEnumerator::askForUpdateSender(const SetupCompletion &finish) {
  const auto daemon = QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(
      [self = sharedSelf(), finish](const NSError &error) {
        self->_dispatchAsync([finish, error] { finish(error); });
      });
  daemon->getItemUpdateSenderWithReceiver(
      sharedSelf(),
      [self = sharedSelf(), finish](const std::shared_ptr<QVItemNotificationSender> &sender,
                                    const std::map<std::string, std::string> &, const NSError &error) {
        self->_dispatchAsync([self, finish, sender, error] {
          if (!error) self->useUpdateSender(sender);
          finish(error);
        });
      });
}

// The listing doesn't wait for the watch to be acknowledged. The error handlers hold the enumerator weakly,
// because the enumerator holds the proxy that holds the handler.
void QVFileEnumerator::useUpdateSender(const std::shared_ptr<QVItemNotificationSender> &sender) {
  dispatch_assert_queue(_queue);
  if (!sender) return;  // a reply that made no sense; the next listing asks again
  if (_invalidated) {
    sender->invalidate();
    return;
  }
  const auto handleError = [weak = std::weak_ptr(sharedSelf())](const NSError &error) {
    if (const auto self = weak.lock()) self->_handleNotificationError(error);
  };
  _remoteNotificationSender = sender->remoteObjectProxyWithErrorHandler(handleError);
  _remoteNotificationSender->boostPriority([] {});
  sender->remoteObjectProxyWithErrorHandler(handleError)
      ->watchItemAtURL(_url, _isRecursive ? kWatchSubtree : kWatchChildren,
                       [handleError](const NSError &error) {
                         if (error) handleError(error);
                       });
}

void QVFileEnumerator::_startObservingAccountChangesIfNeeded() {
  dispatch_assert_queue(_queue);
  if (_isObservingAccountChanges || _invalidated) return;
  _isObservingAccountChanges = true;
  NSNotificationCenter &center = NSNotificationCenter::defaultCenter();
  center.addObserver(sharedSelf(), &QVFileEnumerator::_accountTokenDidChange,
                     QVAccountTokenDidChangeNotification);
  if (_itemIdentifier == NSFileProviderRootContainerItemIdentifier) {
    // The list must be known before its changes are told; what it is doesn't matter here.
    (void)QVContainer::allContainers();
    center.addObserver(sharedSelf(), &QVFileEnumerator::containerListDidChange,
                       QVContainerListDidChangeNotification);
  }
}

void QVFileEnumerator::receiveUpdates(const QVQueryItems &items, const std::vector<std::string> &,
                                      const std::vector<std::string> &, QVReply reply) {
  {
    RecursiveLock lock(_lock);
    for (const auto &item : items) {
      const std::string identifier = item->fileObjectID().asString();
      if (item->isDead()) {
        _updatedItemsByIDs.erase(item->fileObjectID());
        _deletedItemsIdentifiers.push_back(identifier);
      } else {
        std::erase(_deletedItemsIdentifiers, identifier);
        _updatedItemsByIDs[item->fileObjectID()] = item;
      }
    }
    if (_updatedItemsByIDs.size() + _deletedItemsIdentifiers.size() >= kTooManyPendingChanges) {
      invalidateChangeToken();
    }
  }
  _signalChange();
  reply();
}

void QVFileEnumerator::receiveProgressUpdates(const std::vector<std::string> &, QVReply) {}

void QVFileEnumerator::_signalChange() {
  os_log_debug(qvc_default_log(), "[DEBUG] signal changes to fileproviderd");
  // The message names the root whatever container was signalled, deliberately.
  qv_sharedProviderManager().signalEnumeratorForContainerItemIdentifier(
      _itemIdentifier, [](const NSError &error) {
        if (error) {
          os_log_error(qvc_default_log(), "[ERROR] failed to signal enumerator for root container: %@",
                       error);
        }
      });
}

// Both notification handlers do their work under whatever persona is current when theirs can't be adopted:
// the framework must be told in any case.

void QVFileEnumerator::containerListDidChange() {
  const QVPersonaAdoption adoption(_personaID);
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx container list did change, invalidating our change token",
               section.tag());
  invalidateChangeToken();
  _signalChange();
}

// While the update channel stands nothing is invalidated, whatever the log line says: deliberate.
void QVFileEnumerator::_accountTokenDidChange() {
  const QVPersonaAdoption adoption(_personaID);
  os_log(qvc_default_log(), "[NOTICE] received account did update notification, invalidating change token");
  dispatch_sync(_queue, [this] {
    if (_remoteNotificationSender) return;
    invalidateChangeToken();
    _signalChange();
  });
}

void QVFileEnumerator::_handleNotificationError(const NSError &error) {
  _dispatchAsync([self = sharedSelf(), error] {
    os_log_debug(qvc_default_log(), "[DEBUG] There was an error while fetching items: %@", error);
    self->_remoteNotificationSender.reset();
    self->invalidateChangeToken();
    if (error.domain() == QVTessalyErrorDomain) self->_signalChange();
  });
}

}  // namespace droxa
