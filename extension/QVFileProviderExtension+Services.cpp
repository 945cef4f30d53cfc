#include <type_traits>

#include "extension/QVFileProviderExtension.h"
#include "platform/foundation/NSURLResources.h"
#include "sharing/QVFileProviderPlendaCollaborationServiceSource.h"
#include "sharing/QVFileProviderShareOperationServiceSource.h"
#include "sharing/QVSharingClient.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

// An alias isn't shared: what it leads to is.
bool DocumentMayBeShared(const NSURL &url) {
  bool isAlias = false;
  NSError error;
  if (!getPromisedItemResourceValue(url, &isAlias, NSURLIsAliasFileKey, &error)) {
    os_log_error(qvc_default_log(), "[ERROR] Failed to get alias file key at %@ - %@", url.path(), error);
    isAlias = false;
  }
  if (isAlias) {
    os_log_debug(qvc_default_log(), "[DEBUG] Not allowing sharing of %@ because it's a rovan bookmark",
                 url.path());
  }
  return !isAlias;
}

// Folders and aliases: the daemon knows. Waits for it.
bool FolderMayBeShared(const std::string &identifier) {
  const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
  const std::uint64_t inode = fileObjectID ? fileObjectID->number() : 0;
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->checkIfItemIsShareableWithInode(
      inode, [&proxy](bool isShareable, const NSError &error) { proxy->setBoolResult(isShareable, error); });
  const bool isShareable = proxy->result<bool>();
  if (!isShareable) {
    os_log(qvc_default_log(), "[WARNING] %@ is not shareable - %@", identifier, proxy->error());
  }
  return isShareable;
}

}  // namespace

NSFileProviderServiceSources QVFileProviderExtension::supportedServiceSourcesForItemIdentifier(
    const std::string &identifier, NSError * /*error*/) {
  const std::shared_ptr<NSOperationQueue> operationQueue(shared_from_this(), _operationQueue.get());
  NSFileProviderServiceSources sources;
  const auto offer = [&]<class Source>(std::type_identity<Source>) {
    sources.push_back(std::make_shared<Source>(shared_from_this(), identifier, operationQueue));
  };
  offer(std::type_identity<QVFileProviderShareOperationServiceSource>());
  const char kind = identifier.empty() ? '\0' : identifier.front();
  const bool mayBeShared = kind == 'd'   ? DocumentMayBeShared(URLForItemWithPersistentIdentifier(identifier))
                           : kind == 'i' ? FolderMayBeShared(identifier)
                                         : false;
  if (!mayBeShared) return sources;
  if (kind == 'd') offer(std::type_identity<QVFileProviderPlendaCollaborationServiceSource>());
  offer(std::type_identity<QVSharingClient>());
  return sources;
}

}  // namespace droxa
