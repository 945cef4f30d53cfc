#pragma once

#include <atomic>
#include <condition_variable>
#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "keld/Keeper.h"
#include "keld/sync/AssetUploads.h"
#include "keld/sync/CloudApplier.h"
#include "keld/sync/ConflictCopies.h"
#include "keld/sync/Downloads.h"
#include "keld/sync/LocalExaminer.h"
#include "keld/sync/SyncContext.h"
#include "keld/sync/Uploader.h"
#include "keld/thumbnails/ThumbnailQueue.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// The file that tells a replica's folder, or a shared container's, from another one in its place.
inline constexpr char kIdentityName[] = "identity";

struct SyncOptions {
  // The cloud that the drive is in; tests give one of their own. Null: EmbeddedCloud in `cloudFolder`.
  std::shared_ptr<CKCloud> cloud;
  std::string cloudFolder;  // "": the folder "cloud" of the home
  std::string account;      // whose drive it is; "": as before, else who runs the process
  std::string device;       // "": the machine's name, and the home's where it isn't the usual one
  DeletionGuard deletionGuard;
  DownloadOptions downloads;
  ContentsSettings contents;
  std::shared_ptr<Thumbnailer> thumbnailer;                           // null: SandboxedThumbnailer
  std::chrono::milliseconds pollInterval = std::chrono::seconds(30);  // in case a change wasn't told
};

// Keeps the replica and the cloud alike, in one scope: one thread that examines what changed here, applies
// what changed there, and sends; downloads run beside it. It runs while somebody is signed in. Thread
// contract: any thread.
class SyncEngine {
 public:
  // Throws SqlError, std::system_error; `read` answers from the item database.
  SyncEngine(const std::string &replicaPath, const std::string &databasePath, std::shared_ptr<CKCloud> cloud,
             std::function<Keeper *()> keeper, ReplicaFiles::Read read, SyncOptions options);
  // Of another scope, in the same replica, whose storage is that of the drive's engine.
  SyncEngine(const SyncEngine &drive, SyncScope scope, const std::string &databasePath,
             std::shared_ptr<CKCloud> cloud, ReplicaFiles::Read read);
  ~SyncEngine();

  // `itemDatabase` identifies the item database: with another one all items are found anew.
  void start(const std::string &itemDatabase);
  void stop();

  void itemsChanged();  // there is something new in the feed
  void cloudChanged();  // there may be something new in the cloud
  // Called, on the sync's thread, when the zone is found to be gone and nothing of it is here any more. May
  // come again. Set before start().
  void setZoneGoneHandler(std::function<void()> handler) { zoneGone_ = std::move(handler); }
  // Fetches the cloud's changes and applies them; `done` (on the pool) tells how that went, once.
  void fetchNow(std::function<void(const NSError &error)> done);
  void setSignedIn(bool isSignedIn);

  SyncStore &store() { return store_; }
  ReplicaFiles &files() { return files_; }
  const ContentsStorage &storage() const { return *storage_; }
  const SyncScope &scope() const { return context_.scope; }
  ItemStates &states() { return states_; }
  const std::shared_ptr<Downloads> &downloads() const { return downloads_; }
  AssetUploads &assetUploads() { return *assets_; }
  const std::string &device() const { return context_.device; }

  // Runs `work` on the sync's thread, after everything that has changed here so far was examined. False, and
  // never, once the engine stops.
  bool perform(std::function<void()> work);
  // The same, and returns when it was run; false when it wasn't. Not to be called on the sync's thread.
  bool performAndWait(std::function<void()> work);
  // Calls `done` (on the pool) when nothing of `items` (empty: nothing at all) waits to be sent any more, or
  // with why one of them can't be. Once `cancellation` (may be null) is cancelled nobody waits any more:
  // `done` is called with QVErrorCancelled at the latest in the next round.
  void whenUploaded(std::vector<ItemNumber> items, std::function<void(const NSError &error)> done,
                    std::shared_ptr<const CKCancellation> cancellation = nullptr);
  void answerDeletions(bool carryOut);
  // A person asked for the deletion of these, which is about to be done.
  void announceDeletions(const std::vector<ItemNumber> &items);
  bool isPinnedOrBelowPin(ItemNumber item);

  struct Status {
    std::string cloud;
    std::string cloudProblem;
    std::uint64_t uploadsDone = 0, uploadsFailed = 0, bytesUploaded = 0, uploadRate = 0;
    std::uint64_t conflicts = 0;
  };
  Status status();

 private:
  struct Waiter {
    std::vector<ItemNumber> items;
    bool isAll = false;
    std::function<void(const NSError &)> done;
    std::shared_ptr<const CKCancellation> cancellation;
  };

  SyncEngine(const std::string &replicaPath, const std::string &databasePath, std::shared_ptr<CKCloud> cloud,
             std::function<Keeper *()> keeper, ReplicaFiles::Read read, SyncOptions options, SyncScope scope,
             std::shared_ptr<const ContentsStorage> storage);
  void run();
  std::string identityFolder() const;
  void adoptContainer();
  bool prepareCloud();
  ContentsResult keepBoth(const FileLocation &location, PreparedFile &prepared);
  bool isSameCloud();
  void checkReplica();
  bool isReplicaItself() const;
  void afterFirstScan();
  void noteEnd();
  void bindAnew(const std::string &itemDatabase);
  void round();
  void fetch();
  void send();
  void makeThumbnails(bool isPoll);
  enum Direction { fetching, sending };
  void noteCloudProblem(Direction direction, const NSError &error);
  void answerWaiters();
  void answerFetches(const NSError &error);
  void startWaitingVersions();
  void bringBackUnseen();
  void waitForWork();
  CKCallContext call(std::chrono::milliseconds timeout) const;

  const std::shared_ptr<CKCloud> cloud_;
  const SyncOptions options_;
  const std::function<Keeper *()> keeper_;
  SyncStore store_;
  ReplicaFiles files_;
  const std::shared_ptr<const ContentsStorage> storage_;
  ItemStates states_;
  SyncContext context_;
  std::shared_ptr<AssetUploads> assets_;
  ConflictCopies conflicts_;
  std::shared_ptr<Downloads> downloads_;
  LocalExaminer examiner_;
  Uploader uploader_;
  CloudApplier applier_;
  const std::shared_ptr<ThumbnailQueue> thumbnails_;
  std::function<void()> zoneGone_;
  std::uint64_t storageInode_ = 0;  // of the folder that has the identity; the sync's thread's after start()
  const std::shared_ptr<CKCancellation> stopping_ = std::make_shared<CKCancellation>();
  std::unique_ptr<CKSubscription> subscription_;

  // The sync's thread.
  bool isCloudReady_ = false;
  bool moreIsDue_ = false;
  std::vector<Waiter> waiting_;
  std::vector<std::function<void(const NSError &)>> fetching_;  // who is to be told of the fetch
  std::set<std::string> unbound_;                               // records at the last poll
  std::chrono::milliseconds retryPause_{0};
  std::chrono::steady_clock::time_point pauseEnd_;  // after the last problem
  std::chrono::milliseconds againPause_{0};         // before what couldn't be applied is fetched again
  NSError problems_[2];                             // by direction
  bool hasSeenReplica_ = false;
  std::chrono::steady_clock::time_point nextPoll_;

  Mutex mutex_;
  std::condition_variable_any wake_;
  bool signedIn_ GUARDED_BY(mutex_) = false;
  bool stop_ GUARDED_BY(mutex_) = false;
  bool hasLocalNews_ GUARDED_BY(mutex_) = true;
  bool hasCloudNews_ GUARDED_BY(mutex_) = true;
  std::vector<std::function<void()>> work_ GUARDED_BY(mutex_);
  std::vector<Waiter> waiters_ GUARDED_BY(mutex_);  // asked since the round began
  std::vector<std::function<void(const NSError &)>> fetches_ GUARDED_BY(mutex_);  // likewise
  std::string cloudProblem_ GUARDED_BY(mutex_);
  TransferRate uploadRate_ GUARDED_BY(mutex_);
  std::thread thread_;
};

}  // namespace droxa::keld
