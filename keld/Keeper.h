#pragma once

#include <atomic>
#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <deque>
#include <functional>
#include <memory>
#include <set>
#include <string>
#include <thread>
#include <vector>

#include "keld/ChangeJournal.h"
#include "keld/ContainerList.h"
#include "keld/FolderOpener.h"
#include "keld/ItemEdits.h"
#include "keld/ItemQueries.h"
#include "keld/Reconciler.h"
#include "keld/ReplicaWatcher.h"
#include "keld/TrashNotes.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

struct KeeperOptions {
  WatcherKind watcher = WatcherKind::best;
  std::chrono::milliseconds scanInterval{2000};  // where scanning has to stand in for watching
  std::uint64_t mostTombstones = 200000;
  bool showsPromises = false;  // see Reconciler
};

// Looks at what is at this path now, and at the folders on the way to it. In a job of the keeper's.
void LookAtPath(const std::string &pathBelowReplica, Reconciler &reconciler, ItemQueries &queries);

// Told by the keeper, on its thread, after what it did was committed. They mustn't wait for the keeper.
class KeeperListener {
 public:
  virtual ~KeeperListener() = default;
  virtual void itemsChanged(Commit commit, ItemQueries &queries) = 0;  // unnumbered
  virtual void feedAdvanced() = 0;  // there are newer ranks than before, told of as changes or not
  virtual void containerListChanged() = 0;
  // The database failed for good; the keeper has stopped.
  virtual void keeperFailed(const std::string &why) = 0;
};

// Keeps the item database in line with the replica: the one thread that writes to it. It takes what the
// watcher tells, what it is asked to look at, and the walk through all folders that fills the database at
// first, finds what changed while nobody watched, and finds what a watcher lost. Folders are walked by their
// numbers: those found on the way get higher ones and come later, so that the walk needs no memory and new
// folders are no special case.
//
// Thread contract: the public members on any thread. Members without annotation are the keeper's thread's.
class Keeper final : public ReplicaWatcherSink {
 public:
  Keeper(std::unique_ptr<SqlDatabase> database, std::string databasePath, const std::string &replicaPath,
         KeeperOptions options, ContainerList &containers, KeeperListener &listener);
  ~Keeper() override;

  // Looks at the containers, then starts watching and the first walk. Throws SqlError, std::system_error.
  void start();
  void stop();  // the database is left closed cleanly

  using Job = std::function<void(Reconciler &, ItemQueries &, ItemEdits &)>;
  // Runs `job` in the keeper's next transaction, and `done` on the pool when it is committed and told. After
  // stop() only `done` is called.
  void perform(Job job, std::function<void()> done);
  // Calls `done` (on the pool, or at once) when the folder has been looked at since the start.
  void whenScanned(ItemNumber folder, std::function<void()> done);
  // Looks at what is at this path now, and at the folders on the way to it.
  void lookAt(std::string pathBelowReplica, std::function<void()> done);
  void lookAtAll(std::vector<std::string> pathsBelowReplica, std::function<void()> done);

  void replicaChanged(ReplicaHint hint) override;
  void replicaChangesLost(const std::string &why) override;

  bool firstScanDone() const { return firstWalkDone_; }
  ItemNumber scannedThrough() const { return scannedThrough_; }
  Counters counters() const;  // as of the last commit
  std::string watcherDescription() const;

 private:
  struct Work {
    std::vector<ReplicaHint> hints;
    std::vector<std::pair<Job, std::function<void()>>> jobs;
    bool walkAgain = false;
    bool stop = false;
  };

  void run();
  Work waitForWork();
  void step(Work &work);
  void applyHints(std::vector<ReplicaHint> &hints);
  void walk();
  bool hasFoldersToWalk();
  void endWalk();
  ContainerList::Changes refreshContainers(const std::vector<ItemChange> &changes, bool always);
  void lookAfterTrash();
  void finishBulkLoad();
  void fail(const std::string &why);

  const std::string databasePath_, replicaPath_;
  const KeeperOptions options_;
  ContainerList &containers_;
  KeeperListener &listener_;

  std::unique_ptr<SqlDatabase> database_;
  std::unique_ptr<ItemQueries> queries_;
  std::unique_ptr<ItemEdits> edits_;
  std::unique_ptr<FolderOpener> opener_;
  std::unique_ptr<Reconciler> reconciler_;
  TrashNotes trashNotes_;
  ItemNumber walkedThrough_ = 0;
  bool walkingAll_ = true;   // the walk under way began at the first folder
  bool walkedOnce_ = false;  // the walk since the start has ended; firstWalkDone_ once that is committed
  bool bulkLoading_ = false;
  std::deque<ItemNumber> foldersToScan_;
  std::chrono::steady_clock::time_point walkBegan_, nextWalk_ = std::chrono::steady_clock::time_point::max();

  std::atomic<bool> firstWalkDone_{false};
  std::atomic<ItemNumber> scannedThrough_{0};

  mutable Mutex mutex_;
  std::condition_variable_any wake_;
  Work pending_ GUARDED_BY(mutex_);
  bool stopped_ GUARDED_BY(mutex_) = false;
  std::set<ItemNumber> scannedEarly_ GUARDED_BY(mutex_);  // asked for before the walk came to them
  Counters committed_ GUARDED_BY(mutex_);
  std::shared_ptr<ReplicaWatcher> watcher_ GUARDED_BY(mutex_);
  std::thread thread_;
};

}  // namespace droxa::keld
