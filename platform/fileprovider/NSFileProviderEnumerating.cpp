#include "platform/fileprovider/NSFileProviderEnumerating.h"

#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

void NSFileProviderEnumerator::enumerateChangesForObserver(
    std::shared_ptr<NSFileProviderChangeObserver> observer, const NSData &) {
  observer->finishEnumeratingWithError(
      NSError(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired));
}

void NSFileProviderEnumerator::currentSyncAnchorWithCompletionHandler(
    NSFileProviderSyncAnchorCompletion completion) {
  completion({});
}

}  // namespace droxa
