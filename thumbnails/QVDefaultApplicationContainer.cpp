#include "thumbnails/QVDefaultApplicationContainer.h"

#include <map>
#include <utility>
#include <vector>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "platform/launchservices/LSBundleProxy.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVEntitledContainers.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

constexpr char kDocumentsBrowser[] = "com.quorva.Filmont";

// Those that the application is entitled to, the one to be used first.
std::vector<std::string> EntitledContainers(const LSBundleProxy &application) {
  const std::set<std::string> keys{QVApplicationIdentifierEntitlement, QVDroxaServicesEntitlement,
                                   QVDroxaContainerIdentifiersEntitlement,
                                   QVUbiquityContainerIdentifiersEntitlement};
  const LSPropertyList values = application.entitlementValuesForKeys(keys);
  std::map<std::string, EntitlementValue> present;
  for (const std::string &key : keys)
    if (const EntitlementValue *value = values.objectForKey(key)) present.emplace(key, *value);
  return QVEntitledContainerIdentifiers(present);
}

}  // namespace

QVDefaultApplicationContainer::QVDefaultApplicationContainer(
    std::shared_ptr<NSFileProviderExtension> extension, PropertiesForItemAtURL propertiesForItemAtURL)
    : extension_(std::move(extension)), propertiesForItemAtURL_(std::move(propertiesForItemAtURL)) {}

void QVDefaultApplicationContainer::findForBundleIdentifier(
    const std::optional<std::string> &bundleIdentifier,
    NSFileProviderItemCompletion completionHandler) const {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx lookup for default location of %@", section.tag(),
               bundleIdentifier);
  if (!bundleIdentifier || *bundleIdentifier == kDocumentsBrowser) {
    os_log_debug(qvc_default_log(), "[DEBUG] creating default Documents folder");
    return extension_->createDirectoryWithName(QVUbiquitousDocumentsFolderName,
                                               NSFileProviderRootContainerItemIdentifier,
                                               std::move(completionHandler));
  }
  const auto application = LSBundleProxy::bundleProxyForIdentifier(*bundleIdentifier);
  if (!application) {
    os_log_error(qvc_default_log(), "[ERROR] can't find bundle with id '%@'", *bundleIdentifier);
    return completionHandler(
        nullptr, qv_fileProviderError(qvc_errorInvalidParameter("bundleIdentifier", bundleIdentifier)));
  }
  const std::vector<std::string> containers = EntitledContainers(*application);
  if (containers.empty()) {
    os_log_debug(qvc_default_log(), "[DEBUG] bundle '%@' is not entitled to used Droxa Drive",
                 *bundleIdentifier);
    return completionHandler(nullptr,
                             qv_fileProviderError(NSError(QVTessalyErrorDomain, QVErrorNotEntitled)));
  }
  askDaemon(containers.front(), completionHandler);
}

// A connection that fails is told as it stands.
void QVDefaultApplicationContainer::askDaemon(const std::string &containerID,
                                              const NSFileProviderItemCompletion &completion) const {
  QVDaemonConnection::defaultConnection()
      ->remoteObjectProxyWithErrorHandler([completion](const NSError &error) { completion(nullptr, error); })
      ->getContainerURLForID(containerID, true,
                             [propertiesForItemAtURL = propertiesForItemAtURL_, completion](
                                 const NSURL &url, const NSError &error) {
                               if (error) return completion(nullptr, qv_fileProviderError(error));
                               NSError lookupError;
                               const auto item = propertiesForItemAtURL(url, &lookupError);
                               completion(item, lookupError);
                             });
}

}  // namespace droxa
