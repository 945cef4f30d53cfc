#include "extension/QVFileProviderExtension.h"

#include <fcntl.h>
#include <mutex>
#include <unistd.h>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVPersonaAdoption.h"
#include "extension/QVReportError.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "tessaly/QVAccount.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileProviderManager.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVNotifications.h"
#include "tessaly/QVPersona.h"
#include "tessaly/QVQueryItem.h"
#include "tessaly/QVUbiquitousItems.h"
#include "thumbnails/QVUbiquitousCloudKitContainer.h"

namespace droxa {
namespace {

// Personas are in force exactly where the class set-up installed the hooks.
bool PersonasAreRemembered() {
  return qvc_block_remember_persona != nullptr;
}

dispatch_queue_t MakeSerialQueue() {
  auto attribute = dispatch_queue_attr_make_with_autorelease_frequency(
      DISPATCH_QUEUE_SERIAL, DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM);
  attribute = dispatch_queue_attr_make_with_autorelease_frequency(attribute,
                                                                  DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM);
  return dispatch_queue_create("fileprovider-fennick", attribute);
}

std::optional<std::string> RememberedPersona() {
  if (!PersonasAreRemembered()) return std::nullopt;
  bool dataSeparated = false;
  std::optional<std::string> persona = qv_currentPersonaIDWithIsDataSeparated(&dataSeparated);
  if (!dataSeparated) os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: dataSeparated");
  return persona;
}

std::shared_ptr<NSFileHandle> OpenWitness() {
  if (!PersonasAreRemembered()) return nullptr;
  const int fd = open(NSHomeDirectory().c_str(), O_RDONLY);
  if (fd < 0) os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: fd >= 0");
  std::shared_ptr<NSFileHandle> witness = NSFileHandle::initWithFileDescriptor(fd, true);
  if (!witness) {
    os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: _witness != nil");
    if (fd >= 0) close(fd);
  }
  return witness;
}

NSError NotAuthenticatedError() {
  return NSError(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated,
                 NSUserInfo{{NSUnderlyingErrorKey, qvc_errorLoggedOut()}});
}

}  // namespace

std::shared_ptr<QVFileProviderExtension> QVFileProviderExtension::init() {
  static std::once_flag classIsSetUp;
  std::call_once(classIsSetUp, initialize);
  QVInstallUbiquitousItemProvider();
  QVRegisterUbiquitousCloudKitContainer();

  auto extension = std::make_shared<QVFileProviderExtension>(Passkey{});
  QVAccount::startAccountTokenChangeObserverIfNeeded();
  NSNotificationCenter::defaultCenter().addObserver(extension, &QVFileProviderExtension::_accountDidChange,
                                                    QVAccountTokenDidChangeNotification);
  return extension;
}

// The persona is read before the witness is opened: both log what they find, in this order.
QVFileProviderExtension::QVFileProviderExtension(Passkey)
    : _operationQueue(std::make_unique<NSOperationQueue>()),
      _queue(MakeSerialQueue()),
      _personaID(RememberedPersona()),
      _witness(OpenWitness()) {}

QVFileProviderExtension::~QVFileProviderExtension() {
  NSNotificationCenter::defaultCenter().removeObserver(this, QVAccountTokenDidChangeNotification);
}

std::shared_ptr<QVFileProviderExtension> QVFileProviderExtension::self() {
  return std::static_pointer_cast<QVFileProviderExtension>(shared_from_this());
}

// How most actions end: with the item as the daemon sees it when it looks at the file now.
void QVFileProviderExtension::completeWithNewItem(const NSURL &url,
                                                  const NSFileProviderItemCompletion &completion) const {
  NSError error;
  const auto item = _propertiesForNewItemAtURL(url, &error);
  completion(item, error);
}

bool QVFileProviderExtension::_isLoggedInOrError(NSError *error) const {
  NSError lookupError;
  const auto account = QVAccount::currentCachedLoggedInAccountWithError(&lookupError);
  if (!lookupError && account && account->perAppAccountIdentifier()) return true;
  QVReportError("-[QVFileProviderExtension _isLoggedInOrError:]", error,
                lookupError ? qv_fileProviderError(lookupError) : NotAuthenticatedError());
  return false;
}

// The framework must learn of the change in any case, so it is signalled under whatever persona is current
// when the remembered one can't be adopted.
void QVFileProviderExtension::_accountDidChange() {
  const QVPersonaAdoption adoption(_personaID);
  os_log_debug(qvc_default_log(),
               "[DEBUG] received account did update notification, signal changes to fileproviderd");
  qv_sharedProviderManager().signalEnumeratorForContainerItemIdentifier(
      NSFileProviderRootContainerItemIdentifier, [](const NSError &error) {
        if (!error) return;
        os_log_error(qvc_default_log(), "[ERROR] failed to signal enumerator for root container: %@", error);
      });
}

}  // namespace droxa
