#include "keld/sync/SyncEngine.h"

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <future>
#include <sys/stat.h>
#include <system_error>
#include <utility>

#include "keld/sync/CloudErrors.h"
#include "keld/sync/ReplicaBarrier.h"
#include "keld/thumbnails/SandboxedThumbnailer.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::chrono::seconds kLongestEnd{5};
constexpr char kItemDatabase[] = "itemDatabase";
constexpr char kReplica[] = "replica";
constexpr char kEndedWell[] = "endedWell";

std::shared_ptr<const ContentsStorage> openStorage(const std::string &replicaPath,
                                                   const ContentsSettings &settings) {
  int error = 0;
  auto storage = ContentsStorage::open(replicaPath, settings, &error);
  if (!storage)
    throw std::system_error(error, std::generic_category(), replicaPath + "/" + kContentsStorageName);
  return storage;
}

}  // namespace

SyncEngine::SyncEngine(const std::string &replicaPath, const std::string &databasePath,
                       std::shared_ptr<CKCloud> cloud, std::function<Keeper *()> keeper,
                       ReplicaFiles::Read read, SyncOptions options)
    : SyncEngine(replicaPath, databasePath, std::move(cloud), std::move(keeper), std::move(read), options,
                 SyncScope(), openStorage(replicaPath, options.contents)) {}

SyncEngine::SyncEngine(const SyncEngine &drive, SyncScope scope, const std::string &databasePath,
                       std::shared_ptr<CKCloud> cloud, ReplicaFiles::Read read)
    : SyncEngine(drive.files_.replicaPath(), databasePath, std::move(cloud), drive.keeper_, std::move(read),
                 drive.options_, std::move(scope), drive.storage_) {}

SyncEngine::SyncEngine(const std::string &replicaPath, const std::string &databasePath,
                       std::shared_ptr<CKCloud> cloud, std::function<Keeper *()> keeper,
                       ReplicaFiles::Read read, SyncOptions options, SyncScope scope,
                       std::shared_ptr<const ContentsStorage> storage)
    : cloud_(std::move(cloud)),
      options_(std::move(options)),
      keeper_(std::move(keeper)),
      store_(databasePath),
      files_(replicaPath, read, store_, scope),
      storage_(std::move(storage)),
      states_(keeper_),
      context_{store_, files_, *storage_, states_, *cloud_, cloud_->deviceName(), std::move(scope)},
      assets_(std::make_shared<AssetUploads>(cloud_, options_.downloads.stallTimeout,
                                             [this](ItemNumber item) {
                                               store_.retryNow(item);
                                               itemsChanged();
                                             })),
      conflicts_(context_),
      downloads_(std::make_shared<Downloads>(cloud_, store_, files_, *storage_, states_, options_.downloads)),
      examiner_(store_, files_, *storage_, states_, read, options_.deletionGuard),
      uploader_(context_, *assets_, conflicts_, examiner_),
      applier_(context_, conflicts_),
      thumbnails_(std::make_shared<ThumbnailQueue>(
          context_, options_.thumbnailer ? options_.thumbnailer : std::make_shared<SandboxedThumbnailer>(),
          [this] { itemsChanged(); })) {
  downloads_->setConflictHandler([this](const FileLocation &location, PreparedFile &prepared) {
    ContentsResult result = ContentsResult::failed(ContentsOutcome::changedMeanwhile);
    performAndWait([&] { result = keepBoth(location, prepared); });
    return result;
  });
  downloads_->setRetryHandler([this] { itemsChanged(); });
  examiner_.setBoundHandler([this](ItemNumber item, const SyncRow &row) {
    if (row.isDataless && isPinnedOrBelowPin(item)) downloads_->fetchInBackground(item, row.content.size);
    if (!row.content.digest.empty()) thumbnails_->lookAgain();
  });
  examiner_.setReplicaCheck([this] { return isReplicaItself(); });
  applier_.setCloudCheck([this] { return isSameCloud(); });
  uploader_.setNeedsContents(
      [this](const ItemRecord &item) { downloads_->fetchInBackground(item.id, item.facts.size); });
  uploader_.setWantsThumbnail([this](const std::string &name) { return thumbnails_->isFor(name); });
  uploader_.setBringBack([this](const SyncRow &row) { applier_.bringBack(row); });
  uploader_.setProblemOfNewer([this](ItemNumber item) { return downloads_->lastError(item); });
}

SyncEngine::~SyncEngine() {
  stop();
}

void SyncEngine::start(const std::string &itemDatabase) {
  checkReplica();
  bindAnew(itemDatabase);
  // What was examined last may not have reached the item table's flags before the process was killed.
  if (store_.number(kEndedWell) == 0) store_.setNumber("examinedRank", 0);
  store_.setNumber(kEndedWell, 0);
  // The storage and the marks are the whole replica's; the drive's engine starts first.
  if (!scope().isShared()) {
    storage_->recover();
    RemoveOldMarks(files_.replicaPath());
  }
  nextPoll_ = std::chrono::steady_clock::now();
  thread_ = std::thread([this] { run(); });
}

void SyncEngine::stop() {
  {
    const Lock lock(mutex_);
    stop_ = true;
    wake_.notify_all();
  }
  stopping_->cancel();
  const bool wasRunning = thread_.joinable();
  if (wasRunning) thread_.join();
  {
    // Whoever waits for it is told by that.
    std::vector<std::function<void()>> never;
    const Lock lock(mutex_);
    never.swap(work_);
  }
  thumbnails_->stop();
  assets_->stop();
  downloads_->stop();
  if (wasRunning) noteEnd();
  subscription_.reset();
  std::vector<Waiter> waiters;
  {
    const Lock lock(mutex_);
    waiters.swap(waiters_);
    for (auto &fetch : fetches_) fetching_.push_back(std::move(fetch));
    fetches_.clear();
  }
  for (Waiter &waiter : waiting_) waiters.push_back(std::move(waiter));
  waiting_.clear();
  const NSError error = qvc_error(QVErrorShuttingDown, "the daemon is shutting down");
  for (Waiter &waiter : waiters)
    dispatch_async_global([done = std::move(waiter.done), error] { done(error); });
  answerFetches(error);
}

std::string SyncEngine::identityFolder() const {
  return files_.absolute(scope().isShared() ? scope().container : kContentsStorageName);
}

// Another folder in the replica's place, or in a shared container's, has none of its documents, and nobody
// has deleted them. The folder is told by a name that it was given once.
void SyncEngine::checkReplica() {
  const std::string path = identityFolder();
  struct stat status = {};
  if (::stat(path.c_str(), &status) == 0) storageInode_ = status.st_ino;
  std::string found;
  std::ifstream(path + "/" + kIdentityName) >> found;
  std::string known = store_.text(kReplica);
  const bool isOther = !known.empty() && found != known;
  if (isOther && store_.countRows() > 0) {
    os_log_error(qvc_default_log(),
                 "[ERROR] %s isn't the folder that it was: what is missing in it isn't deleted in the cloud "
                 "until somebody says so",
                 path);
    examiner_.holdDeletions();
  }
  if (known.empty()) known = found.empty() ? NewRecordName() : found;
  if (found != known) std::ofstream(path + "/" + kIdentityName, std::ios::trunc) << known << "\n";
  store_.setText(kReplica, known);
}

// The shared container is what it is now: somebody was asked about what is missing.
void SyncEngine::adoptContainer() {
  const std::string path = identityFolder();
  ::mkdir(path.c_str(), 0700);
  ::mkdir((path + "/" + QVDocumentsFolderName(scope().container)).c_str(), 0700);
  struct stat status = {};
  if (::stat(path.c_str(), &status) == 0) storageInode_ = status.st_ino;
  std::ofstream(path + "/" + kIdentityName, std::ios::trunc) << store_.text(kReplica) << "\n";
}

bool SyncEngine::isReplicaItself() const {
  struct stat status = {};
  return ::stat(identityFolder().c_str(), &status) == 0 && status.st_ino == storageInode_;
}

// The keeper, which still runs, does things in order: when it has looked, all flags before are in its
// table.
void SyncEngine::noteEnd() {
  const auto seen = std::make_shared<std::promise<void>>();
  states_.flush();
  states_.lookAt({QVUbiquitousDefaultContainerID}, [seen] { seen->set_value(); });
  if (seen->get_future().wait_for(kLongestEnd) != std::future_status::ready) return;
  try {
    store_.setNumber(kEndedWell, 1);
  } catch (const SqlError &error) {
    os_log_error(qvc_default_log(), "[ERROR] the sync's database failed at the end: %s", error.what());
  }
}

void SyncEngine::bindAnew(const std::string &itemDatabase) {
  if (store_.text(kItemDatabase) == itemDatabase) return;
  store_.transaction([&] {
    store_.unbindAll();
    store_.setNumber("examinedRank", 0);
    store_.setText(kItemDatabase, itemDatabase);
  });
}

void SyncEngine::itemsChanged() {
  const Lock lock(mutex_);
  hasLocalNews_ = true;
  wake_.notify_all();
}

void SyncEngine::cloudChanged() {
  const Lock lock(mutex_);
  hasCloudNews_ = true;
  wake_.notify_all();
}

void SyncEngine::fetchNow(std::function<void(const NSError &)> done) {
  {
    const Lock lock(mutex_);
    if (!stop_) {
      fetches_.push_back(std::move(done));
      hasCloudNews_ = true;
      wake_.notify_all();
      return;
    }
  }
  done(qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
}

void SyncEngine::setSignedIn(bool isSignedIn) {
  {
    const Lock lock(mutex_);
    signedIn_ = isSignedIn;
    hasLocalNews_ = hasCloudNews_ = true;
    wake_.notify_all();
  }
  if (isSignedIn)
    downloads_->resume();
  else
    downloads_->pause(qvc_errorLoggedOut());
}

bool SyncEngine::perform(std::function<void()> work) {
  const Lock lock(mutex_);
  if (stop_) return false;
  work_.push_back(std::move(work));
  wake_.notify_all();
  return true;
}

bool SyncEngine::performAndWait(std::function<void()> work) {
  auto done = std::make_shared<std::promise<void>>();
  std::future<void> future = done->get_future();
  const bool isTaken = perform([done = std::move(done), work = std::move(work)] {
    work();
    done->set_value();
  });
  if (!isTaken) return false;
  future.wait();  // work that is dropped breaks its promise
  try {
    future.get();
    return true;
  } catch (const std::future_error &) {
    return false;
  }
}

// What was written here gets a name of its own, and the cloud's version takes the document's, by one step.
// All of it happens between two looks of the sync at what changed, and the items are told apart before the
// next.
ContentsResult SyncEngine::keepBoth(const FileLocation &location, PreparedFile &prepared) {
  const std::string folder = location.path.substr(0, location.path.size() - location.name.size());
  const auto row = store_.byItem(location.item.id);
  if (!row) return ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  std::string copy;
  ContentsResult result;
  if (!conflicts_.nameAside(location, &copy)) {
    const DocumentLook look = storage_->classify(location.folder.get(), location.name);
    result = storage_->replaceContents(location.folder.get(), location.name, prepared, look.facts);
    conflicts_.nameAsideOver(location, copy, result.isDone());
  } else if (!conflicts_.setAside(location, &copy)) {
    // No second names here: for a moment nothing has the document's.
    result = storage_->publishNew(prepared, location.folder.get(), location.name);
  } else {
    result = ContentsResult::failed(ContentsOutcome::changedMeanwhile);
  }
  if (!result.isDone()) return result;
  auto looked = std::make_shared<std::promise<void>>();
  states_.lookAt({location.path, folder + copy}, [looked] { looked->set_value(); });
  looked->get_future().wait();
  ItemRecord item;
  if (files_.itemAtPath(location.path, &item)) examiner_.bindTo(row->record, item.id);
  if (files_.itemAtPath(folder + copy, &item)) examiner_.examineItem(item.id);
  return result;
}

void SyncEngine::whenUploaded(std::vector<ItemNumber> items, std::function<void(const NSError &)> done,
                              std::shared_ptr<const CKCancellation> cancellation) {
  {
    const Lock lock(mutex_);
    if (!stop_) {
      const bool isAll = items.empty();
      waiters_.push_back({std::move(items), isAll, std::move(done), std::move(cancellation)});
      hasLocalNews_ = true;
      wake_.notify_all();
      return;
    }
  }
  done(qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
}

void SyncEngine::answerDeletions(bool carryOut) {
  perform([this, carryOut] {
    if (!carryOut) {
      for (auto held = store_.held(500); !held.empty(); held = store_.held(500)) {
        for (const QueuedUpload &deletion : held) {
          const auto row = store_.byItem(deletion.item);
          store_.dropQueued(deletion.item);
          if (row) applier_.bringBack(*row);
        }
      }
      const Lock lock(mutex_);
      hasCloudNews_ = true;
    }
    if (scope().isShared()) adoptContainer();
    examiner_.allowDeletions();
  });
}

void SyncEngine::announceDeletions(const std::vector<ItemNumber> &items) {
  const auto now = std::chrono::duration_cast<std::chrono::milliseconds>(
      std::chrono::system_clock::now().time_since_epoch());
  store_.allowDeletions(items, now.count(), (now + options_.deletionGuard.announced).count());
}

bool SyncEngine::isPinnedOrBelowPin(ItemNumber item) {
  const std::vector<ItemNumber> pins = store_.pins();
  if (pins.empty()) return false;
  for (int depth = 0; item != kReplicaFolder && item != kLimboFolder && depth < 4096; ++depth) {
    if (std::find(pins.begin(), pins.end(), item) != pins.end()) return true;
    const auto record = files_.item(item);
    if (!record) return false;
    item = record->parent;
  }
  return false;
}

SyncEngine::Status SyncEngine::status() {
  Status status;
  status.cloud = cloud_->description();
  const Uploader::Totals totals = uploader_.totals();
  status.uploadsDone = totals.documents;
  status.uploadsFailed = totals.failed;
  status.bytesUploaded = totals.bytes;
  status.conflicts = conflicts_.made();
  const Lock lock(mutex_);
  status.cloudProblem = cloudProblem_;
  status.uploadRate = uploadRate_.bytesPerSecond();
  return status;
}

}  // namespace droxa::keld
