#pragma once

#include <functional>
#include <memory>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"

namespace droxa {

// Receives one page of a listing. Any number of didEnumerateItems, then exactly one finish….
// Called by the enumerator on any thread, one call at a time.
class NSFileProviderEnumerationObserver {
 public:
  virtual ~NSFileProviderEnumerationObserver() = default;
  virtual void didEnumerateItems(const NSFileProviderItems &items) = 0;
  virtual void finishEnumeratingUpToPage(const NSData &nextPage) = 0;  // nil: the listing is complete
  virtual void finishEnumeratingWithError(const NSError &error) = 0;
};

// Receives one batch of changes. Any number of did…, then exactly one finish….
// Called by the enumerator on any thread, one call at a time.
class NSFileProviderChangeObserver {
 public:
  virtual ~NSFileProviderChangeObserver() = default;
  virtual void didUpdateItems(const NSFileProviderItems &items) = 0;
  virtual void didDeleteItemsWithIdentifiers(const std::vector<std::string> &identifiers) = 0;
  virtual void finishEnumeratingChangesUpToSyncAnchor(const NSData &anchor, bool moreComing) = 0;
  virtual void finishEnumeratingWithError(const NSError &error) = 0;
};

using NSFileProviderSyncAnchorCompletion = std::function<void(const NSData &anchor)>;  // exactly once

// Lists a container and reports its changes. Called by the framework on its own threads.
class NSFileProviderEnumerator {
 public:
  virtual ~NSFileProviderEnumerator() = default;
  // `page` is one of the initial pages, nil, or what the page before ended with. The observer is answered
  // exactly once, now or later.
  virtual void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver> observer,
                                         const NSData &page) = 0;
  virtual void invalidate() = 0;

  // An enumerator without change tracking leaves these two as they are: supportsChanges() is false, the
  // anchor is nil and a change request is answered with NSFileProviderErrorSyncAnchorExpired.
  virtual bool supportsChanges() const { return false; }
  virtual void enumerateChangesForObserver(std::shared_ptr<NSFileProviderChangeObserver> observer,
                                           const NSData &anchor);
  virtual void currentSyncAnchorWithCompletionHandler(NSFileProviderSyncAnchorCompletion completion);
};

}  // namespace droxa
