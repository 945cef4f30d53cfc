#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/foundation/NSObject.h"

namespace droxa {

// Lists every folder of the drive, page by page, straight from the daemon. There is no change tracking.
// Thread contract: stateless; any thread. The observer is answered on the daemon connection's threads.
class QVDirectoriesEnumerator final : public NSObject, public NSFileProviderEnumerator {
 public:
  void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver> observer,
                                 const NSData &page) override;
  void invalidate() override {}  // nothing to end; a listing under way is still answered
};

}  // namespace droxa
