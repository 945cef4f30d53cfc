#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "enumeration/QVBaseWorkingSetEnumerator.h"
#include "enumeration/QVDirectoriesEnumerator.h"
#include "enumeration/QVFileEnumerator.h"
#include "extension/QVFileProviderExtension.h"
#include "extension/QVReportError.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {
namespace {

std::shared_ptr<const QVContainer> ContainerWithID(const std::string &containerID) {
  const auto containers = QVContainer::allContainersByContainerID();
  const auto found = containers.find(containerID);
  return found == containers.end() ? nullptr : found->second;
}

NSURL RootURL() {
  const auto container = ContainerWithID(QVUbiquitousDefaultContainerID);
  const NSURL url = container ? container->documentsURL() : NSURL();
  os_log_debug(qvc_default_log(), "[DEBUG] returning %@", url);
  return url;
}

NSURL LocalURL(const std::string &identifier, bool resolvingQVAliases, NSError *error) {
  const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
  if (!fileObjectID) return {};
  const NSURL url = qv_documentURLFromFileObjectID(*fileObjectID, error);
  if (!resolvingQVAliases || !qv_isExternalDocumentReference(url)) return url;
  os_log_debug(qvc_default_log(), "[DEBUG] we have a bookmark, returning its target");
  return qv_URLByResolvingExternalDocumentReferenceWithError(url, error);
}

// The daemon knows best where an item of a private or excluded location is; `url` stays when it can't tell.
NSURL URLFromDaemon(const std::string &identifier, const NSURL &url) {
  os_log(qvc_default_log(),
         "[WARNING] Detected url in private or excluded location %@ -- Fetching URL from daemon for %@",
         url.path(), identifier);
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->getURLForItemIdentifier(identifier, [&proxy](const NSURL &reply, const NSError &replyError) {
    proxy->setObjResult(reply, replyError);
  });
  const NSURL daemonURL = proxy->result<NSURL>();
  if (daemonURL) return daemonURL;
  os_log(qvc_default_log(), "[WARNING] Failed getting url of %@ - %@", identifier, proxy->error());
  return url;
}

// Containers whose folder is shown as an ordinary item of the root rather than as a container.
bool IsShownAsFolder(const std::string &containerID) {
  return containerID == QVUbiquitousDocumentsContainerID || containerID == QVUbiquitousDesktopContainerID;
}

}  // namespace

NSURL QVFileProviderExtension::URLForItemWithPersistentIdentifier(const std::string &identifier) {
  return _URLForItemWithPersistentIdentifier(identifier, true);
}

NSURL QVFileProviderExtension::_URLForItemWithPersistentIdentifier(const std::string &identifier,
                                                                   bool resolvingQVAliases) const {
  return _URLForItemWithPersistentIdentifier(identifier, resolvingQVAliases, false);
}

NSURL QVFileProviderExtension::_URLForItemWithPersistentIdentifier(const std::string &identifier,
                                                                   bool resolvingQVAliases,
                                                                   bool attachPhysical) const {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx asked url for %@", section.tag(), identifier);
  if (identifier == NSFileProviderRootContainerItemIdentifier) return RootURL();

  NSError error;
  NSURL url = LocalURL(identifier, resolvingQVAliases, &error);
  if (qv_isInTessalyPrivateStorages(url) || qv_wouldBeExcludedFromSync(url)) {
    url = URLFromDaemon(identifier, url);
  }
  if (url) {
    os_log_debug(qvc_default_log(), "[DEBUG] returning %@", url);
  } else {
    os_log_error(qvc_default_log(), "[ERROR] returning nil, there was an error: %@", error);
  }
  if (!qv_isInSyncedLocation(url)) return {};
  if (attachPhysical) qv_addPhysicalProperty(url);
  return url;
}

std::optional<std::string> QVFileProviderExtension::persistentIdentifierForItemAtURL(const NSURL &url) {
  if (!qv_isInSyncedLocation(url)) return std::nullopt;
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx asked identifier for %@", section.tag(), url.path());

  NSError error;
  std::optional<std::string> identifier;
  const auto item = _propertiesForItemAtURL(url, &error);
  if (error) {
    os_log_debug(qvc_default_log(), "[DEBUG] couldn't get item identifier at %@: %@", url, error);
  } else if (item) {
    identifier = item->itemIdentifier();
  }
  os_log_debug(qvc_default_log(), "[DEBUG] returning %@", identifier);
  return identifier;
}

std::shared_ptr<const NSFileProviderItem> QVFileProviderExtension::itemForIdentifier(
    const std::string &identifier, NSError *error) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx asked properties for %@", section.tag(), identifier);
  if (!_isLoggedInOrError(error)) return nullptr;

  const NSURL url = URLForItemWithPersistentIdentifier(identifier);
  if (!url) {
    QVReportError("-[QVFileProviderExtension itemForIdentifier:error:]", error,
                  fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return nullptr;
  }
  auto item = _propertiesForItemAtURL(url, error);
  os_log_debug(qvc_default_log(), "[DEBUG] returning %@", item);
  return item;
}

std::shared_ptr<const QVQueryItem> QVFileProviderExtension::_propertiesForNewItemAtURL(const NSURL &url,
                                                                                       NSError *error) const {
  return _propertiesForItemAtURL(url, true, error);
}

std::shared_ptr<const QVQueryItem> QVFileProviderExtension::_propertiesForItemAtURL(const NSURL &url,
                                                                                    NSError *error) const {
  return _propertiesForItemAtURL(url, false, error);
}

std::shared_ptr<const QVQueryItem> QVFileProviderExtension::_propertiesForItemAtURL(const NSURL &url,
                                                                                    bool forceScan,
                                                                                    NSError *error) const {
  if (!qv_isInSyncedLocation(url)) {
    if (error) *error = NSError(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
    return nullptr;
  }
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx asked properties for %@", section.tag(), url.path());

  const auto containerID = qv_containerIDIfIsDocumentsContainerURL(url);
  auto item = containerID && !IsShownAsFolder(*containerID)
                  ? QVQueryItem::containerItemForContainer(ContainerWithID(*containerID), forceScan)
                  : QVQueryItem::askDaemonQueryItemForURL(url, forceScan, error);
  os_log_debug(qvc_default_log(), "[DEBUG] returning %@", item);
  if (error && *error) *error = qv_fileProviderError(*error);
  return item;
}

std::shared_ptr<NSFileProviderEnumerator> QVFileProviderExtension::enumeratorForContainerItemIdentifier(
    const std::string &identifier, NSError *error) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx enumerator for %@", section.tag(), identifier);
  if (!_isLoggedInOrError(error)) return nullptr;
  if (identifier == NSFileProviderWorkingSetContainerItemIdentifier) {
    return std::make_shared<QVBaseWorkingSetEnumerator>();
  }
  if (identifier == NSFileProviderAllDirectoriesContainerItemIdentifier) {
    return std::make_shared<QVDirectoriesEnumerator>();
  }
  return fileEnumeratorForContainer(identifier, error);
}

// Of the root and of every ordinary folder, the trash included. The root has no file object identifier.
std::shared_ptr<NSFileProviderEnumerator> QVFileProviderExtension::fileEnumeratorForContainer(
    const std::string &identifier, NSError *error) {
  std::optional<QVFileObjectID> fileObjectID;
  if (identifier != NSFileProviderRootContainerItemIdentifier) {
    fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
  }
  const NSURL url = URLForItemWithPersistentIdentifier(identifier);
  if (!url) {
    QVReportError("-[QVFileProviderExtension enumeratorForContainerItemIdentifier:error:]", error,
                  fileProviderErrorForNonExistentItemWithIdentifier(identifier));
    return nullptr;
  }
  constexpr bool recursive = false;
  return QVFileEnumerator::initWithFileObjectID(fileObjectID, url, identifier, recursive);
}

}  // namespace droxa
