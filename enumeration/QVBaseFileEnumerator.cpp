#include "enumeration/QVBaseFileEnumerator.h"

#include <utility>

#include "additions/NSData+Additions.h"
#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSNotificationCenter.h"
#include "platform/usermanagement/UMUserManager.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVPersona.h"

namespace droxa {

namespace {

constexpr std::uint64_t kPageSize = 200;

std::optional<std::string> personaAtCreation() {
  if (!qvc_block_remember_persona) return std::nullopt;
  return qv_currentPersonaID(UMUserManager::sharedManager());
}

// What the daemon's listing reply becomes for the observer.
void answerWithPage(NSFileProviderEnumerationObserver &observer, std::int64_t sortOrder,
                    std::uint64_t section, const QVQueryItems &items, std::uint64_t nextOffset,
                    const NSError &error) {
  os_log_debug(qvc_default_log(), "[DEBUG] ┳%llx received next page %llu items=%@", section, nextOffset,
               items);
  if (error) {
    os_log_error(qvc_default_log(), "[ERROR] there was an error when listing items: %@", error);
    observer.finishEnumeratingWithError(qv_fileProviderError(error));
  } else {
    observer.didEnumerateItems(NSFileProviderItems(items.begin(), items.end()));
    observer.finishEnumeratingUpToPage(qv_pageTokenFromSortOrder(sortOrder, nextOffset));
  }
  QVLogSectionEnd(section);
}

}  // namespace

std::shared_ptr<QVBaseFileEnumerator> QVBaseFileEnumerator::initWithFileObjectID(
    std::optional<QVFileObjectID> fileObjectID, std::string itemIdentifier, bool recursive) {
  return std::shared_ptr<QVBaseFileEnumerator>(
      new QVBaseFileEnumerator(fileObjectID, std::move(itemIdentifier), recursive));
}

QVBaseFileEnumerator::QVBaseFileEnumerator(std::optional<QVFileObjectID> fileObjectID,
                                           std::string itemIdentifier, bool recursive)
    : _itemIdentifier(std::move(itemIdentifier)),
      _fileObjectID(fileObjectID),
      _isRecursive(recursive),
      _personaID(personaAtCreation()),
      _queue(dispatch_queue_create("file-enumerator",
                                   dispatch_queue_attr_make_with_autorelease_frequency(
                                       DISPATCH_QUEUE_SERIAL, DISPATCH_AUTORELEASE_FREQUENCY_WORK_ITEM))) {
  _uuid.store(UUID::generate());
}

void QVBaseFileEnumerator::setupNotificationReceivingIfNeededWithCompletion(SetupCompletion completion) {
  completion(NSError());
}

void QVBaseFileEnumerator::enumerateItemsForObserver(
    std::shared_ptr<NSFileProviderEnumerationObserver> observer, const NSData &page) {
  const std::uint64_t section = QVLogSectionCreate(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx listing items for %@", section, _fileObjectID);
  if (page) os_log_debug(qvc_default_log(), "[DEBUG] from page %lu", qv_pageTokenOffset(page));

  const std::uint64_t callSection = QVLogSectionCreate(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┣%llx calling keld", callSection);
  const std::int64_t sortOrder = qv_pageTokenSortOrder(page);
  setupNotificationReceivingIfNeededWithCompletion(
      [observer = std::move(observer), self = shared_from_this(), page, callSection,
       sortOrder](const NSError &error) { self->listPage(observer, page, sortOrder, callSection, error); });
  QVLogSectionEnd(section);
}

// The section of the daemon call is closed by the daemon's reply alone: it stays open, deliberately, when the
// setup or the connection fails.
void QVBaseFileEnumerator::listPage(const std::shared_ptr<NSFileProviderEnumerationObserver> &observer,
                                    const NSData &page, std::int64_t sortOrder, std::uint64_t section,
                                    const NSError &setupError) {
  if (setupError) {
    observer->finishEnumeratingWithError(qv_fileProviderError(setupError));
    return;
  }
  const auto daemon = QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(
      [observer](const NSError &error) {
        observer->finishEnumeratingWithError(qv_fileProviderError(error));
      });
  daemon->enumerateItemsInFolder(
      _fileObjectID, sortOrder, qv_pageTokenOffset(page), kPageSize,
      [observer, sortOrder, section](const QVQueryItems &items, std::uint64_t nextOffset,
                                     const NSError &error) {
        answerWithPage(*observer, sortOrder, section, items, nextOffset, error);
      });
}

// Rank 0, whatever `_rank` is, and without the lock: both deliberate. After a listing the framework's first
// change request is accepted only while this generation has delivered no batch, and a request for the anchor
// never waits for a batch or a push that holds the lock.
void QVBaseFileEnumerator::currentSyncAnchorWithCompletionHandler(
    NSFileProviderSyncAnchorCompletion completion) NO_THREAD_SAFETY_ANALYSIS {
  completion(qv_changeTokenFromRank(0, _uuid.load()));
}

void QVBaseFileEnumerator::enumerateChangesForObserver(std::shared_ptr<NSFileProviderChangeObserver> observer,
                                                       const NSData &anchor) {
  const std::uint64_t section = QVLogSectionCreate(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx listing changes for %@", section,
               _fileObjectID ? std::optional(_fileObjectID->asString()) : std::nullopt);
  std::optional<Batch> batch;
  {
    RecursiveLock lock(_lock);
    batch = takeBatchOrFinish(*observer, anchor);
  }
  if (batch) {
    observer->didUpdateItems(batch->updated);
    observer->didDeleteItemsWithIdentifiers(batch->deleted);
    observer->finishEnumeratingChangesUpToSyncAnchor(batch->anchor, false);
  }
  QVLogSectionEnd(section);
}

std::optional<QVBaseFileEnumerator::Batch> QVBaseFileEnumerator::takeBatchOrFinish(
    NSFileProviderChangeObserver &observer, const NSData &anchor) {
  // No anchor at all is of no generation either.
  const std::int64_t requestedRank = anchor ? qv_changeTokenRankWithUUID(anchor, _uuid.load()) : -1;
  os_log_debug(qvc_default_log(), "[DEBUG] requested rank: %lld", requestedRank);
  if (requestedRank < 0 || static_cast<std::uint64_t>(requestedRank) != _rank) {
    os_log_debug(qvc_default_log(), "[DEBUG] token expired (current rank %llu)", _rank);
    observer.finishEnumeratingWithError(
        NSError(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired));
    invalidateChangeToken();
    return std::nullopt;
  }
  if (_updatedItemsByIDs.empty() && _deletedItemsIdentifiers.empty()) {
    os_log_debug(qvc_default_log(), "[DEBUG] no update to send back");
    observer.finishEnumeratingChangesUpToSyncAnchor(anchor, false);
    return std::nullopt;
  }
  Batch batch;
  batch.updated.reserve(_updatedItemsByIDs.size());
  for (const auto &entry : _updatedItemsByIDs) batch.updated.push_back(entry.second);
  _updatedItemsByIDs.clear();
  batch.deleted.swap(_deletedItemsIdentifiers);
  ++_rank;
  batch.anchor = qv_changeTokenFromRank(static_cast<std::int64_t>(_rank), _uuid.load());
  return batch;
}

void QVBaseFileEnumerator::invalidateChangeToken() {
  os_log_debug(qvc_default_log(), "[DEBUG] invalidating change token");
  RecursiveLock lock(_lock);
  _deletedItemsIdentifiers.clear();
  _updatedItemsByIDs.clear();
  _rank = 0;
  _uuid.store(UUID::generate());
}

void QVBaseFileEnumerator::invalidate() {
  _dispatchAsync([self = shared_from_this()] { self->_invalidate(); });
}

void QVBaseFileEnumerator::_invalidate() {
  dispatch_assert_queue(_queue);
  {
    RecursiveLock lock(_lock);
    _invalidated = true;
    if (_remoteNotificationSender) _remoteNotificationSender->invalidate();
    _remoteNotificationSender.reset();
  }
  _stopObservingAccountChanges();
}

void QVBaseFileEnumerator::_stopObservingAccountChanges() {
  dispatch_assert_queue(_queue);
  _isObservingAccountChanges = false;
  // The whole object's address, under which a subclass registered itself.
  NSNotificationCenter::defaultCenter().removeObserver(dynamic_cast<const void *>(this));
}

void QVBaseFileEnumerator::_dispatchAsync(dispatch_block_t block) const {
  dispatch_async(
      _queue, qvc_block_remember_persona ? qvc_block_remember_persona(std::move(block)) : std::move(block));
}

}  // namespace droxa
