#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "enumeration/AtomicUUID.h"
#include "platform/dispatch/dispatch.h"
#include "platform/fileprovider/NSFileProviderEnumerating.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

// Lists one folder, page by page, and hands out the changes of its children, which it collects in memory, in
// one batch a change request. A change token is a rank and a UUID; only the newest of the current generation
// is valid. Every other one is answered as expired, which makes the framework list the folder anew.
//
// This class holds the state and both token protocols; who fills the pending changes is the subclass's
// business.
//
// Thread contract: the framework calls on threads of its own, the daemon's replies come on the connection's.
// `_lock` guards the pending changes and the token generation. `_queue` runs the setup of the update channel,
// the observation of accounts, and the invalidation.
class QVBaseFileEnumerator : public NSObject,
                             public NSFileProviderEnumerator,
                             public std::enable_shared_from_this<QVBaseFileEnumerator> {
 public:
  // Tells that updates are being received, or why they can't be. Called exactly once, on any thread.
  using SetupCompletion = std::function<void(const NSError &error)>;

  // `fileObjectID` is nullopt for the root.
  static std::shared_ptr<QVBaseFileEnumerator> initWithFileObjectID(
      std::optional<QVFileObjectID> fileObjectID, std::string itemIdentifier, bool recursive);

  // Called before each page is listed. Here there is nothing to set up: the completion is called at once.
  virtual void setupNotificationReceivingIfNeededWithCompletion(SetupCompletion completion);

  void enumerateItemsForObserver(std::shared_ptr<NSFileProviderEnumerationObserver> observer,
                                 const NSData &page) override;
  bool supportsChanges() const override { return true; }
  // Answers the observer before it returns.
  void enumerateChangesForObserver(std::shared_ptr<NSFileProviderChangeObserver> observer,
                                   const NSData &anchor) override;
  void currentSyncAnchorWithCompletionHandler(NSFileProviderSyncAnchorCompletion completion) override;

  // Drops what is pending and starts a new generation: every token handed out before has expired.
  void invalidateChangeToken();

  // Ends the update channel and the observation of accounts, later, on `_queue`. Whoever owns an enumerator
  // must call it: until then the daemon's sender holds the enumerator and the enumerator holds the sender.
  void invalidate() override;

 protected:
  QVBaseFileEnumerator(std::optional<QVFileObjectID> fileObjectID, std::string itemIdentifier,
                       bool recursive);

  // Both on `_queue` only.
  void _invalidate();
  void _stopObservingAccountChanges();

  // Hands `block` to `_queue`, to run under the persona of the caller.
  void _dispatchAsync(dispatch_block_t block) const;

  // The object's own monitor. Recursive: invalidateChangeToken() is called with and without it.
  RecursiveMutex _lock;

  const std::string _itemIdentifier;                  // as the framework named the container
  const std::optional<QVFileObjectID> _fileObjectID;  // the same container
  // On `_queue` only; cleared for good under `_lock`.
  std::shared_ptr<QVItemNotificationSender> _remoteNotificationSender;
  // The latest live state of each changed item.
  std::unordered_map<QVFileObjectID, std::shared_ptr<const QVQueryItem>> _updatedItemsByIDs GUARDED_BY(_lock);
  std::vector<std::string> _deletedItemsIdentifiers
      GUARDED_BY(_lock);                           // may hold the same one more than once
  AtomicUUID _uuid GUARDED_BY(_lock);              // but see currentSyncAnchorWithCompletionHandler
  std::uint64_t _rank GUARDED_BY(_lock) = 0;       // of the newest token of this generation
  const bool _isRecursive;                         // the daemon is to watch the whole subtree
  bool _invalidated = false;                       // on `_queue` only; set under `_lock`, never cleared
  bool _isSettingUpNotificationReceiving = false;  // on `_queue` only
  bool _isObservingAccountChanges = false;         // on `_queue` only
  const std::optional<std::string> _personaID;  // current at creation; nullopt when no personas are adopted
  const dispatch_queue_t _queue;                // serial, "file-enumerator"

 private:
  struct Batch {
    NSFileProviderItems updated;
    std::vector<std::string> deleted;
    NSData anchor;
  };

  void listPage(const std::shared_ptr<NSFileProviderEnumerationObserver> &observer, const NSData &page,
                std::int64_t sortOrder, std::uint64_t section, const NSError &setupError);
  // Takes everything that is pending, or answers the observer and takes nothing.
  std::optional<Batch> takeBatchOrFinish(NSFileProviderChangeObserver &observer, const NSData &anchor)
      REQUIRES(_lock);
};

}  // namespace droxa
