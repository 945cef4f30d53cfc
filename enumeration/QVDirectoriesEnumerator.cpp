#include "enumeration/QVDirectoriesEnumerator.h"

#include <cstdint>

#include "additions/NSData+Additions.h"
#include "additions/NSError+QVFPAdditions.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVLog.h"

namespace droxa {

namespace {

constexpr std::uint64_t kPageSize = 200;

void answerWithPage(NSFileProviderEnumerationObserver &observer, std::int64_t sortOrder,
                    const QVQueryItems &items, std::uint64_t nextOffset, const NSError &error) {
  if (error) {
    os_log_error(qvc_default_log(), "[ERROR] there was an error when listing items: %@", error);
    observer.finishEnumeratingWithError(qv_fileProviderError(error));
    return;
  }
  observer.didEnumerateItems(NSFileProviderItems(items.begin(), items.end()));
  observer.finishEnumeratingUpToPage(qv_pageTokenFromSortOrder(sortOrder, nextOffset));
}

}  // namespace

// A connection error goes to the observer as it is, an error of the reply translated: deliberate.
void QVDirectoriesEnumerator::enumerateItemsForObserver(
    std::shared_ptr<NSFileProviderEnumerationObserver> observer, const NSData &page) {
  const std::int64_t sortOrder = qv_pageTokenSortOrder(page);
  const std::uint64_t offset = qv_pageTokenOffset(page);
  const auto daemon = QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(
      [observer](const NSError &error) { observer->finishEnumeratingWithError(error); });
  daemon->enumerateAllFoldersWithSortOrder(
      sortOrder, offset, kPageSize,
      [observer, sortOrder](const QVQueryItems &items, std::uint64_t nextOffset, const NSError &error) {
        answerWithPage(*observer, sortOrder, items, nextOffset, error);
      });
}

}  // namespace droxa
