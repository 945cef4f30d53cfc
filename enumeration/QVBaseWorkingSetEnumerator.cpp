#include "enumeration/QVBaseWorkingSetEnumerator.h"

#include <cstdint>
#include <string>
#include <vector>

#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileProviderManager.h"

namespace droxa {

namespace {

constexpr std::uint64_t kBatchSize = 200;

// What the framework is told instead of an error of a reply. A logged-out error becomes the bare
// not-authenticated error, without the underlying error that the translation would add.
NSError errorForFramework(const NSError &error) {
  if (error.is(QVTessalyErrorDomain, QVErrorLoggedOut)) {
    return qv_fileProviderError(NSError(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated));
  }
  return qv_fileProviderError(error);
}

std::vector<std::string> identifiersOf(const std::vector<QVFileObjectID> &fileObjectIDs) {
  std::vector<std::string> identifiers;
  identifiers.reserve(fileObjectIDs.size());
  for (const QVFileObjectID &fileObjectID : fileObjectIDs) identifiers.push_back(fileObjectID.asString());
  return identifiers;
}

// A proxy whose connection errors go to the observer as they are, without translation: deliberate.
template <class Observer>
std::shared_ptr<QVProtocol> daemonAnsweringFailuresTo(const std::shared_ptr<Observer> &observer) {
  return QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(
      [observer](const NSError &error) { observer->finishEnumeratingWithError(error); });
}

}  // namespace

NSData QVBaseWorkingSetEnumerator::initialSyncAnchor() {
  return NSData::dataWithString("initialSyncAnchor");
}

// The rank doesn't matter: the question finds out whether the daemon would answer at all.
void QVBaseWorkingSetEnumerator::enumerateItemsForObserver(
    std::shared_ptr<NSFileProviderEnumerationObserver> observer, const NSData &) {
  daemonAnsweringFailuresTo(observer)->currentNotifRankWithReply(
      [observer](std::uint64_t, const NSError &error) {
        if (error) {
          observer->finishEnumeratingWithError(errorForFramework(error));
          return;
        }
        observer->finishEnumeratingUpToPage(NSData());
        qv_sharedProviderManager().signalEnumeratorForContainerItemIdentifier(
            NSFileProviderWorkingSetContainerItemIdentifier, [](const NSError &) {});
      });
}

// More is coming unless the daemon gave back the very anchor of the request. A first request, from the
// initial anchor, therefore always reports more.
void QVBaseWorkingSetEnumerator::enumerateChangesForObserver(
    std::shared_ptr<NSFileProviderChangeObserver> observer, const NSData &anchor) {
  const NSData token = anchor == initialSyncAnchor() ? NSData() : anchor;
  daemonAnsweringFailuresTo(observer)->enumerateWorkingSetChangesFromChangeToken(
      token, kBatchSize,
      [observer, anchor](const QVQueryItems &updated, const std::vector<QVFileObjectID> &deleted,
                         const NSData &newToken, const NSError &error) {
        if (error) {
          observer->finishEnumeratingWithError(errorForFramework(error));
          return;
        }
        observer->didUpdateItems(NSFileProviderItems(updated.begin(), updated.end()));
        observer->didDeleteItemsWithIdentifiers(identifiersOf(deleted));
        observer->finishEnumeratingChangesUpToSyncAnchor(newToken, newToken != anchor);
      });
}

void QVBaseWorkingSetEnumerator::currentSyncAnchorWithCompletionHandler(
    NSFileProviderSyncAnchorCompletion completion) {
  completion(initialSyncAnchor());
}

}  // namespace droxa
