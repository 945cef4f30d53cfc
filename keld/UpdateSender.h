#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <unordered_map>
#include <vector>

#include "keld/ItemRecord.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// What a sender watches.
struct UpdateWatch {
  ItemNumber folder = 0;
  bool isRoot = false;  // the root, whichever folder it is
  std::uint64_t options = 0;
  std::uint64_t began = 0;  // the number of the last commit that came before it
};

// An item that is to be pushed: as it is when its turn comes, or dead.
struct PendingPush {
  ItemNumber id = 0;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
  bool isDead = false;
  bool hasLeft = false;  // what is watched: if it is gone when its turn comes, nobody tells of its death
};

class UpdateSender;

// What senders ask of the daemon. Outlives them, or answers as a daemon that is shutting down.
class UpdateSenderHost {
 public:
  virtual ~UpdateSenderHost() = default;
  // Finds the item at `url`, looking on disk if need be. The reply comes once, on any thread.
  virtual void findWatchTarget(
      const NSURL &url,
      std::function<void(std::optional<UpdateWatch> watch, const NSError &error)> reply) = 0;
  // The number of the newest commit that was published.
  virtual std::uint64_t lastCommit() = 0;
  // Calls the sender's beginWatch() with what the watch missed since that commit; or why that isn't known.
  virtual NSError beginWatch(UpdateSender &sender, UpdateWatch watch, std::uint64_t since) = 0;
  // Whether the item is still there.
  virtual bool exists(ItemNumber id) = 0;
  // The items as they are now; dead ones as told, and those that left and are gone as dead; the others that
  // are gone are left out, since their deaths follow.
  virtual QVQueryItems itemsForPush(const std::vector<PendingPush> &pushes) = 0;
};

// Pushes the changes of one folder's children into one receiver: one push at a time, the next when the
// receiver has replied; what changes meanwhile waits, once per item. What waits is numbers alone; the items
// are read when their turn comes. The first watch begins with what happened since the sender was made, the
// others with what happened since they were asked for. Thread contract: any thread. The receiver is called on
// the pool, never under the lock.
class UpdateSender final : public QVItemNotificationSender,
                           public std::enable_shared_from_this<UpdateSender> {
 public:
  // `made` is the number of the newest commit published before.
  UpdateSender(std::weak_ptr<UpdateSenderHost> host, std::shared_ptr<QVItemNotificationReceiving> receiver,
               std::uint64_t made);
  ~UpdateSender() override;

  void boostPriority(QVReply block) override;
  void watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) override;
  void invalidate() override;
  std::shared_ptr<QVItemNotificationSender> remoteObjectProxyWithErrorHandler(
      NSXPCErrorHandler handler) override;

  std::optional<UpdateWatch> watch() const;
  bool isBoosted() const;
  bool isInvalidated() const;
  // The watch stands from now on, and `missed` is the first to be pushed.
  void beginWatch(const UpdateWatch &watch, const std::vector<PendingPush> &missed);
  // Puts changes into the queue; with `last` the watched item itself has died.
  void enqueue(const std::vector<PendingPush> &pushes, bool last);

 private:
  NSError watchFound(const UpdateWatch &watch, std::uint64_t since);
  void stopWatching();
  void append(const std::vector<PendingPush> &pushes) REQUIRES(mutex_);
  void pump();
  void push();
  void pushEnded();

  const std::weak_ptr<UpdateSenderHost> host_;
  mutable Mutex mutex_;
  std::shared_ptr<QVItemNotificationReceiving> receiver_ GUARDED_BY(mutex_);  // null once invalidated
  std::optional<UpdateWatch> watch_ GUARDED_BY(mutex_);
  std::optional<std::uint64_t> made_ GUARDED_BY(mutex_);                     // until a watch stands
  std::map<std::uint64_t, PendingPush> queue_ GUARDED_BY(mutex_);            // by the order of the changes
  std::unordered_map<ItemNumber, std::uint64_t> places_ GUARDED_BY(mutex_);  // in the queue
  std::uint64_t nextPlace_ GUARDED_BY(mutex_) = 0;
  bool pushing_ GUARDED_BY(mutex_) = false;
  std::vector<QVReply> boosts_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
