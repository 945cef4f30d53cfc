#include "keld/Keeper.h"

#include <algorithm>
#include <malloc.h>
#include <unordered_set>
#include <utility>

#include "keld/Schema.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

using Clock = std::chrono::steady_clock;
// Changes that come this close together are worked off together, but none waits longer than the second.
constexpr std::chrono::milliseconds kQuiet{2};
constexpr std::chrono::milliseconds kLongestWait{10};
constexpr std::size_t kMostHintsAtOnce = 10000;
constexpr std::size_t kMostHintsKept = 200000;
constexpr std::size_t kMostChangesAtOnce = 20000;

}  // namespace

void LookAtPath(const std::string &path, Reconciler &reconciler, ItemQueries &queries) {
  ItemNumber folder = kReplicaFolder;
  for (std::size_t at = 0; at < path.size();) {
    const std::size_t slash = std::min(path.find('/', at), path.size());
    const std::string name = path.substr(at, slash - at);
    reconciler.look(folder, name);
    reconciler.settle();
    const auto record = queries.byName(folder, name);
    if (!record || !record->isFolder()) break;
    folder = record->id;
    at = slash + 1;
  }
}

Keeper::Keeper(std::unique_ptr<SqlDatabase> database, std::string databasePath,
               const std::string &replicaPath, KeeperOptions options, ContainerList &containers,
               KeeperListener &listener)
    : databasePath_(std::move(databasePath)),
      replicaPath_(replicaPath),
      options_(options),
      containers_(containers),
      listener_(listener),
      database_(std::move(database)),
      queries_(std::make_unique<ItemQueries>(*database_)),
      edits_(std::make_unique<ItemEdits>(*database_)),
      opener_(std::make_unique<FolderOpener>(replicaPath, *queries_)),
      reconciler_(std::make_unique<Reconciler>(*queries_, *edits_, *opener_)),
      trashNotes_(replicaPath) {
  reconciler_->setShowsPromises(options_.showsPromises);
}

Keeper::~Keeper() {
  stop();
}

void Keeper::start() {
  bulkLoading_ = SchemaNeedsBulkLoad(*database_);
  reconciler_->setBulkLoading(bulkLoading_);
  // What a power failure takes of a database that is being filled is found at the next start, and filled
  // again.
  if (bulkLoading_) database_->execute("PRAGMA synchronous = OFF");
  std::shared_ptr<ReplicaWatcher> watcher = MakeReplicaWatcher(options_.watcher, replicaPath_, *this);
  reconciler_->setFolderCallbacks(
      [watcher](ItemNumber folder, int descriptor) { watcher->folderAppeared(folder, descriptor); },
      [watcher](ItemNumber folder) { watcher->folderVanished(folder); });
  {
    const Lock lock(mutex_);
    watcher_ = watcher;
  }
  SqlTransaction transaction(*database_);
  edits_->setMeta("clean", 0);
  reconciler_->scan(kReplicaFolder);
  for (const ItemRecord &container : queries_->childrenByName(kReplicaFolder, ListingKey(), 100000))
    reconciler_->scan(container.id);
  reconciler_->keepMissing();
  reconciler_->takeChanges();
  for (const ItemNumber documents : containers_.refresh(*queries_, *database_).renamed)
    reconciler_->touch(documents);
  edits_->writeCounters();
  transaction.commit();
  {
    const Lock lock(mutex_);
    committed_ = edits_->counters();
  }
  walkBegan_ = Clock::now();
  thread_ = std::thread([this] { run(); });
}

void Keeper::stop() {
  {
    const Lock lock(mutex_);
    pending_.stop = true;
    wake_.notify_all();
  }
  if (thread_.joinable()) thread_.join();
  std::shared_ptr<ReplicaWatcher> watcher;
  std::vector<std::pair<Job, std::function<void()>>> jobs;
  {
    const Lock lock(mutex_);
    stopped_ = true;
    watcher.swap(watcher_);
    jobs.swap(pending_.jobs);
  }
  if (reconciler_) reconciler_->setFolderCallbacks(nullptr, nullptr);
  watcher.reset();
  for (auto &job : jobs) dispatch_async_global(std::move(job.second));
}

void Keeper::perform(Job job, std::function<void()> done) {
  {
    const Lock lock(mutex_);
    if (!stopped_) {
      pending_.jobs.emplace_back(std::move(job), std::move(done));
      wake_.notify_all();
      return;
    }
  }
  dispatch_async_global(std::move(done));
}

void Keeper::whenScanned(ItemNumber folder, std::function<void()> done) {
  bool isScanned = firstWalkDone_ || folder <= scannedThrough_;
  if (!isScanned) {
    const Lock lock(mutex_);
    isScanned = scannedEarly_.count(folder) != 0;
  }
  if (isScanned) return done();
  perform([folder](Reconciler &reconciler, ItemQueries &, ItemEdits &) { reconciler.scan(folder); },
          [this, folder, done = std::move(done)] {
            {
              const Lock lock(mutex_);
              scannedEarly_.insert(folder);
            }
            done();
          });
}

void Keeper::lookAt(std::string path, std::function<void()> done) {
  lookAtAll({std::move(path)}, std::move(done));
}

void Keeper::lookAtAll(std::vector<std::string> paths, std::function<void()> done) {
  perform(
      [paths = std::move(paths)](Reconciler &reconciler, ItemQueries &queries, ItemEdits &) {
        for (const std::string &path : paths) LookAtPath(path, reconciler, queries);
      },
      std::move(done));
}

void Keeper::replicaChanged(ReplicaHint hint) {
  const Lock lock(mutex_);
  if (pending_.hints.size() >= kMostHintsKept) {
    // It would take less to look at everything than to work all of these off.
    pending_.hints.clear();
    pending_.walkAgain = true;
  }
  if (!pending_.hints.empty() && pending_.hints.back() == hint) return;
  pending_.hints.push_back(std::move(hint));
  wake_.notify_all();
}

void Keeper::replicaChangesLost(const std::string &why) {
  os_log(qvc_default_log(), "[WARNING] %s: looking at the whole replica again", why);
  const Lock lock(mutex_);
  pending_.walkAgain = true;
  wake_.notify_all();
}

Counters Keeper::counters() const {
  const Lock lock(mutex_);
  return committed_;
}

std::string Keeper::watcherDescription() const {
  const Lock lock(mutex_);
  return watcher_ ? watcher_->description() : "none";
}

// --- The keeper's thread.

void Keeper::run() {
  Work work;
  try {
    for (;;) {
      work = waitForWork();
      if (work.stop) break;
      step(work);
      if (bulkLoading_ && firstWalkDone_) finishBulkLoad();
    }
    reconciler_->bury(false);
    edits_->setMeta("clean", 1);
    database_->execute("PRAGMA wal_checkpoint(TRUNCATE)");
  } catch (const SqlError &error) {
    if (error.meansDamage()) DatabaseMarkDamaged(databasePath_);
    for (auto &job : work.jobs) dispatch_async_global(std::move(job.second));
    fail(databasePath_ + ": " + error.what());
  }
}

void Keeper::fail(const std::string &why) {
  os_log_fault(qvc_default_log(), "[CRIT] the item database failed: %s", why);
  std::vector<std::pair<Job, std::function<void()>>> jobs;
  {
    const Lock lock(mutex_);
    stopped_ = true;
    jobs.swap(pending_.jobs);
  }
  for (auto &job : jobs) dispatch_async_global(std::move(job.second));
  listener_.keeperFailed(why);
}

Keeper::Work Keeper::waitForWork() {
  const bool walks = hasFoldersToWalk();
  Lock lock(mutex_);
  const auto hasWork = [this]() NO_THREAD_SAFETY_ANALYSIS {
    return pending_.stop || pending_.walkAgain || !pending_.jobs.empty() || !pending_.hints.empty();
  };
  while (!walks && !hasWork()) {
    const bool scans = watcher_ && watcher_->needsScanning();
    if (!scans) {
      wake_.wait(mutex_);
    } else if (nextWalk_ == Clock::time_point::max()) {
      nextWalk_ = Clock::now() + options_.scanInterval;
    } else if (wake_.wait_until(mutex_, nextWalk_) == std::cv_status::timeout) {
      nextWalk_ = Clock::time_point::max();
      pending_.walkAgain = true;
    }
  }
  // More of the same is likely to follow at once.
  const auto last = Clock::now() + kLongestWait;
  while (!walks && !pending_.stop && pending_.jobs.empty() && !pending_.hints.empty() &&
         Clock::now() < last) {
    const std::size_t before = pending_.hints.size();
    wake_.wait_for(mutex_, kQuiet);
    if (pending_.hints.size() == before) break;
  }
  Work work;
  std::swap(work.jobs, pending_.jobs);
  std::swap(work.walkAgain, pending_.walkAgain);
  work.stop = pending_.stop;
  if (work.stop) std::swap(work.jobs, pending_.jobs);
  if (pending_.hints.size() <= kMostHintsAtOnce) {
    work.hints.swap(pending_.hints);
  } else {
    const auto end = pending_.hints.begin() + static_cast<std::ptrdiff_t>(kMostHintsAtOnce);
    work.hints.assign(std::make_move_iterator(pending_.hints.begin()), std::make_move_iterator(end));
    pending_.hints.erase(pending_.hints.begin(), end);
  }
  return work;
}

void Keeper::step(Work &work) {
  const auto before = containers_.current();
  SqlTransaction transaction(*database_);
  if (work.walkAgain) {
    walkedThrough_ = 0;
    walkingAll_ = true;
    walkBegan_ = Clock::now();
    foldersToScan_.push_back(kReplicaFolder);
  }
  applyHints(work.hints);
  for (auto &job : work.jobs) job.first(*reconciler_, *queries_, *edits_);
  reconciler_->settle();
  reconciler_->bury(true);
  walk();
  std::vector<ItemChange> changes = reconciler_->takeChanges();
  const ContainerList::Changes containers = refreshContainers(changes, bulkLoading_);
  for (const ItemChange &change : reconciler_->takeChanges()) changes.push_back(change);
  edits_->compactTombstones(options_.mostTombstones);
  edits_->writeCounters();
  transaction.commit();
  bool isAdvanced = false;
  {
    const Lock lock(mutex_);
    isAdvanced = committed_.rank != edits_->counters().rank;
    committed_ = edits_->counters();
  }
  // Told only now: readers see what is committed.
  if (walkedOnce_)
    firstWalkDone_ = true;
  else
    scannedThrough_ = std::max<ItemNumber>(scannedThrough_, walkedThrough_);
  const auto after = containers_.current();
  if (!changes.empty()) listener_.itemsChanged({0, std::move(changes), before, after}, *queries_);
  lookAfterTrash();
  if (isAdvanced) listener_.feedAdvanced();
  if (containers.list) listener_.containerListChanged();
  for (auto &job : std::exchange(work.jobs, {})) dispatch_async_global(std::move(job.second));
}

void Keeper::applyHints(std::vector<ReplicaHint> &hints) {
  std::set<std::pair<ItemNumber, std::string>> seen;
  std::unordered_map<std::uint64_t, std::optional<ItemNumber>> byInode;
  for (ReplicaHint &hint : hints) {
    if (hint.inode != 0) {
      auto found = byInode.find(hint.inode);
      if (found == byInode.end())
        found = byInode.emplace(hint.inode, queries_->folderByInode(hint.inode)).first;
      // A folder that isn't known yet is read as a whole once it is.
      if (!found->second) continue;
      hint.folder = *found->second;
    }
    if (hint.name.empty()) {
      if (hint.folder == kReplicaFolder) continue;
      const auto record = queries_->byID(hint.folder);
      if (!record || record->parent == kLimboFolder) continue;
      hint.folder = record->parent;
      hint.name = record->name;
    }
    if (seen.emplace(hint.folder, hint.name).second) reconciler_->look(hint.folder, hint.name);
  }
  reconciler_->settle();
}

bool Keeper::hasFoldersToWalk() {
  return !foldersToScan_.empty() || !walkedOnce_ || walkingAll_ ||
         queries_->firstFolderAfter(walkedThrough_).has_value();
}

// One slice of the walk; what comes meanwhile is worked off between two of them.
void Keeper::walk() {
  const auto end = Clock::now() + std::chrono::milliseconds(bulkLoading_ ? 100 : 15);
  while (Clock::now() < end && reconciler_->changeCount() < kMostChangesAtOnce) {
    for (const ItemNumber folder : reconciler_->takeFoldersToScan()) foldersToScan_.push_back(folder);
    if (!foldersToScan_.empty()) {
      const ItemNumber folder = foldersToScan_.front();
      foldersToScan_.pop_front();
      reconciler_->scan(folder);
    } else if (const auto folder = queries_->firstFolderAfter(walkedThrough_)) {
      walkedThrough_ = folder->id;
      if (folder->parent != kLimboFolder) reconciler_->scan(folder->id);
    } else {
      if (walkingAll_) endWalk();
      break;
    }
    if (walkingAll_)
      reconciler_->keepMissing();
    else
      reconciler_->bury(true);
  }
}

void Keeper::endWalk() {
  reconciler_->bury(false);
  walkingAll_ = false;
  const auto took = std::chrono::duration_cast<std::chrono::milliseconds>(Clock::now() - walkBegan_);
  nextWalk_ = Clock::now() + std::max(options_.scanInterval, took * 10);
  if (walkedOnce_) return;
  walkedOnce_ = true;
  trashNotes_.removeOrphans();
  const Counters &counters = edits_->counters();
  os_log_info(qvc_default_log(),
              "[INFO] looked at the whole replica in %lld ms: %llu documents, %llu folders",
              static_cast<long long>(took.count()), counters.documents, counters.folders);
}

void Keeper::lookAfterTrash() {
  const ContainerEntry *trash = containers_.current()->byID(QVUbiquitousTrashContainerID);
  std::vector<std::string> left;
  for (Reconciler::Place &place : reconciler_->takePlacesLeftInTrash())
    if (trash && place.folder == trash->documents) left.push_back(std::move(place.name));
  trashNotes_.itemsLeft(left);
  trashNotes_.removeThose();
}

ContainerList::Changes Keeper::refreshContainers(const std::vector<ItemChange> &changes, bool always) {
  const auto current = containers_.current();
  const auto concerns = [&](ItemNumber parent) {
    return parent == current->root() || current->isContainerFolder(parent);
  };
  const bool needed = always || containers_.hasNewTitles() ||
                      std::any_of(changes.begin(), changes.end(), [&](const ItemChange &change) {
                        return concerns(change.oldParent) || concerns(change.newParent) ||
                               current->isContainerFolder(change.id) ||
                               (change.oldParent == kReplicaFolder && change.newParent == kReplicaFolder);
                      });
  if (!needed) return {};
  ContainerList::Changes result = containers_.refresh(*queries_, *database_);
  for (const ItemNumber documents : result.renamed) reconciler_->touch(documents);
  const auto refreshed = containers_.current();
  for (const std::string &container : BuiltInContainers()) {
    const ContainerEntry *entry = refreshed->byID(container);
    if (entry && entry->documents != 0) continue;
    // The drive can't do without it; the watcher will see it come back.
    const std::string problem = MakeBuiltInContainers(replicaPath_);
    if (!problem.empty()) os_log_error(qvc_default_log(), "[ERROR] %s", problem);
    foldersToScan_.push_back(kReplicaFolder);
    break;
  }
  return result;
}

void Keeper::finishBulkLoad() {
  SchemaFinishBulkLoad(*database_);
  database_->execute("PRAGMA synchronous = NORMAL");
  bulkLoading_ = false;
  reconciler_->setBulkLoading(false);
  ::malloc_trim(0);
}

}  // namespace droxa::keld
