#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/UUID.h"

namespace droxa {

// The working set: a listing of it reports nothing and signals the working set, so that the framework asks
// for its changes, and these come from the daemon's own feed, whose opaque tokens pass through unchanged.
// Thread contract: no state that a request touches; any thread. Observers are answered on the daemon
// connection's threads.
class QVBaseWorkingSetEnumerator final : public NSObject, public NSFileProviderEnumerator {
 public:
  // Stands for the start of the feed; never sent to the daemon.
  static NSData initialSyncAnchor();

  void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver> observer,
                                 const NSData &page) override;
  bool supportsChanges() const override { return true; }
  // At most 200 changes a request; the framework repeats it while more are coming.
  void enumerateChangesForObserver(std::shared_ptr<NSFileProviderChangeObserver> observer,
                                   const NSData &anchor) override;
  void currentSyncAnchorWithCompletionHandler(NSFileProviderSyncAnchorCompletion completion) override;
  void invalidate() override {}  // nothing to end; a request under way is still answered

 private:
  [[maybe_unused]] const UUID _uuid{};  // all zeros: the feed's tokens carry no UUID of an enumerator
};

}  // namespace droxa
