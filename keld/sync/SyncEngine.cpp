#include "keld/sync/SyncEngine.h"

#include <algorithm>
#include <cerrno>
#include <fstream>
#include <sys/stat.h>
#include <system_error>
#include <utility>

#include "keld/sync/CloudErrors.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::chrono::milliseconds kFirstPause{500};
constexpr std::chrono::milliseconds kLongestPause{60'000};
constexpr std::chrono::milliseconds kCallTimeout{60'000};
constexpr std::uint64_t kVersionsAtATime = 1000;
constexpr std::chrono::milliseconds kScanPoll{100};
constexpr char kCloudIdentifier[] = "cloudIdentifier";
constexpr char kItemDatabase[] = "itemDatabase";
constexpr char kReplica[] = "replica";
constexpr char kIdentityName[] = "identity";

std::unique_ptr<ContentsStorage> openStorage(const std::string &replicaPath,
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
    : cloud_(std::move(cloud)),
      options_(std::move(options)),
      keeper_(std::move(keeper)),
      store_(databasePath),
      files_(replicaPath, read, store_),
      storage_(openStorage(replicaPath, options_.contents)),
      states_(keeper_),
      context_{store_, files_, *storage_, states_, *cloud_, cloud_->deviceName()},
      assets_(std::make_shared<AssetUploads>(cloud_, options_.downloads.stallTimeout,
                                             [this](ItemNumber item) {
                                               store_.retryNow(item);
                                               itemsChanged();
                                             })),
      downloads_(std::make_shared<Downloads>(cloud_, store_, files_, *storage_, states_, options_.downloads)),
      conflicts_(context_),
      uploader_(context_, *assets_, conflicts_),
      applier_(context_, conflicts_),
      examiner_(store_, files_, *storage_, states_, read, options_.deletionGuard) {
  examiner_.setBoundHandler([this](ItemNumber item, const SyncRow &row) {
    if (row.isDataless && isPinnedOrBelowPin(item)) downloads_->fetchInBackground(item, row.content.size);
  });
  examiner_.setReplicaCheck([this] { return isReplicaItself(); });
  applier_.setCloudCheck([this] { return isSameCloud(); });
  uploader_.setNeedsContents(
      [this](const ItemRecord &item) { downloads_->fetchInBackground(item.id, item.facts.size); });
}

SyncEngine::~SyncEngine() {
  stop();
}

void SyncEngine::start(const std::string &itemDatabase) {
  checkReplica();
  bindAnew(itemDatabase);
  storage_->recover();
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
  if (assets_) assets_->stop();
  if (downloads_) downloads_->stop();
  if (thread_.joinable()) thread_.join();
  subscription_.reset();
  std::vector<Waiter> waiters;
  std::vector<std::function<void(const NSError &)>> fetchers;
  {
    const Lock lock(mutex_);
    waiters.swap(waiters_);
    fetchers.swap(fetchers_);
  }
  for (Waiter &waiter : waiting_) waiters.push_back(std::move(waiter));
  waiting_.clear();
  const NSError error = qvc_error(QVErrorShuttingDown, "the daemon is shutting down");
  for (Waiter &waiter : waiters)
    dispatch_async_global([done = std::move(waiter.done), error] { done(error); });
  for (auto &done : fetchers) dispatch_async_global([done = std::move(done), error] { done(error); });
}

// Another folder in the replica's place has none of its documents, and nobody has deleted them. The folder is
// told by a name that it was given once.
void SyncEngine::checkReplica() {
  const std::string path = files_.replicaPath() + "/" + kContentsStorageName;
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
                 files_.replicaPath());
    examiner_.holdDeletions();
  }
  if (known.empty()) known = found.empty() ? NewRecordName() : found;
  if (found != known) std::ofstream(path + "/" + kIdentityName, std::ios::trunc) << known << "\n";
  store_.setText(kReplica, known);
}

bool SyncEngine::isReplicaItself() const {
  struct stat status = {};
  const std::string path = files_.replicaPath() + "/" + kContentsStorageName;
  return ::stat(path.c_str(), &status) == 0 && status.st_ino == storageInode_;
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

void SyncEngine::perform(std::function<void()> work) {
  const Lock lock(mutex_);
  if (stop_) return;
  work_.push_back(std::move(work));
  wake_.notify_all();
}

void SyncEngine::fetchNow(std::function<void(const NSError &)> done) {
  {
    const Lock lock(mutex_);
    if (!stop_) {
      fetchers_.push_back(std::move(done));
      hasCloudNews_ = true;
      wake_.notify_all();
      return;
    }
  }
  done(qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
}

void SyncEngine::whenUploaded(std::vector<ItemNumber> items, std::function<void(const NSError &)> done) {
  {
    const Lock lock(mutex_);
    if (!stop_) {
      const bool isAll = items.empty();
      waiters_.push_back({std::move(items), isAll, std::move(done)});
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
    examiner_.allowDeletions();
  });
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

// --- The sync's thread.

CKCallContext SyncEngine::call(std::chrono::milliseconds timeout) const {
  CKCallContext context = CKCallContext::withTimeout(timeout);
  context.cancellation = stopping_;
  return context;
}

void SyncEngine::run() {
  conflicts_.placeRescuedFiles();
  for (;;) {
    {
      const Lock lock(mutex_);
      if (stop_) return;
    }
    try {
      round();
    } catch (const SqlError &error) {
      os_log_fault(qvc_default_log(), "[CRIT] the sync's database failed: %s", error.what());
      noteCloudProblem(fetching, qvc_error(QVErrorDatabase, error.what()));
    }
    waitForWork();
  }
}

void SyncEngine::round() {
  bool isSignedIn = false, fetches = false;
  std::vector<std::function<void()>> work;
  {
    const Lock lock(mutex_);
    isSignedIn = signedIn_;
    hasLocalNews_ = false;
    fetches = hasCloudNews_ || std::chrono::steady_clock::now() >= nextPoll_;
    hasCloudNews_ = false;
    work.swap(work_);
    // What they wait for is examined now, and not before.
    for (Waiter &waiter : waiters_) waiting_.push_back(std::move(waiter));
    waiters_.clear();
  }
  moreIsDue_ = false;
  // Asked for first: what it has seen by then is in the feed.
  const bool isReplicaSeen = !hasSeenReplica_ && keeper_() && keeper_()->firstScanDone();
  examiner_.examine();
  if (hasSeenReplica_ || isReplicaSeen) examiner_.forgetHoldIfNothingIsHeld();
  if (isReplicaSeen) afterFirstScan();
  for (const auto &task : work) task();
  if (!isSignedIn || !prepareCloud()) {
    answerFetchers(isSignedIn ? problems_[fetching] : qvc_errorLoggedOut());
    answerWaiters();
    return;
  }
  if (fetches) fetch();
  // What is new here may be known there, until all of that was seen.
  if (applier_.hasFetchedAll()) send();
  downloads_->retryDue();
  startWaitingVersions();
  answerWaiters();
}

void SyncEngine::send() {
  const std::uint64_t before = uploader_.totals().bytes;
  const Uploader::Round sent = uploader_.sendDue(call(kCallTimeout));
  {
    const Lock lock(mutex_);
    uploadRate_.add(uploader_.totals().bytes - before);
  }
  if (!sent.newerRecords.empty()) applier_.applyRecords(sent.newerRecords, call(kCallTimeout));
  if (sent.cloudProblem)
    noteCloudProblem(sending, sent.cloudProblem);
  else if (sent.sent > 0 || store_.countQueued() == 0)
    noteCloudProblem(sending, NSError());
  moreIsDue_ = sent.moreIsDue || (!sent.newerRecords.empty() && !sent.cloudProblem);
}

// The whole replica was looked at once: a record that no file stands for has lost its file unseen, and what
// is held because of a replaced folder is all there is.
void SyncEngine::afterFirstScan() {
  hasSeenReplica_ = true;
  applier_.bringBackWhatIsMissing();
  for (const SyncRow &row : store_.datalessRows())
    if (isPinnedOrBelowPin(row.item)) downloads_->fetchInBackground(row.item, row.content.size);
}

bool SyncEngine::isSameCloud() {
  const std::string known = store_.text(kCloudIdentifier);
  return known.empty() || cloud_->cloudIdentifier().description() == known;
}

bool SyncEngine::prepareCloud() {
  const UUID identifier = cloud_->cloudIdentifier();
  const std::string text = identifier.description();
  if (identifier.isNull()) {
    noteCloudProblem(
        fetching, CKErrorMake(CKErrorCode::serviceUnavailable, cloud_->description() + " can't be reached"));
    return false;
  }
  // Each time: it may have been replaced while this runs.
  const std::string known = store_.text(kCloudIdentifier);
  if (!known.empty() && known != text) {
    noteCloudProblem(fetching,
                     CKErrorMake(CKErrorCode::invalidArguments,
                                 cloud_->description() + " isn't the cloud that this drive is in (" + known +
                                     "); nothing is sent or fetched until that one is back"));
    return false;
  }
  if (isCloudReady_) return true;
  if (known.empty()) store_.setText(kCloudIdentifier, text);
  const NSError problem = cloud_->saveZone(DriveZone(), call(kCallTimeout));
  if (problem) {
    noteCloudProblem(fetching, problem);
    return false;
  }
  if (!subscription_) {
    NSError error;
    subscription_ = cloud_->subscribe(
        [this](const std::vector<CKRecordZoneID> &) {
          const Lock lock(mutex_);
          hasCloudNews_ = true;
          wake_.notify_all();
        },
        &error);
    if (!subscription_) os_log_error(qvc_default_log(), "[ERROR] the cloud's changes aren't told: %@", error);
  }
  isCloudReady_ = true;
  return true;
}

void SyncEngine::fetch() {
  nextPoll_ = std::chrono::steady_clock::now() + options_.pollInterval;
  const NSError error = applier_.fetchAndApply(call(kCallTimeout));
  noteCloudProblem(fetching, error);
  answerFetchers(error);
}

void SyncEngine::answerFetchers(const NSError &error) {
  std::vector<std::function<void(const NSError &)>> fetchers;
  {
    const Lock lock(mutex_);
    fetchers.swap(fetchers_);
  }
  for (auto &done : fetchers) dispatch_async_global([done = std::move(done), error] { done(error); });
}

// Each direction has its own: one that works doesn't end the other's pause.
void SyncEngine::noteCloudProblem(Direction direction, const NSError &error) {
  if (stopping_->isCancelled()) return;
  const bool wasWell = !problems_[fetching] && !problems_[sending];
  problems_[direction] = error;
  const NSError &shown = problems_[fetching] ? problems_[fetching] : problems_[sending];
  const std::string text = shown ? shown.localizedDescription() : std::string();
  bool isNews = false;
  {
    const Lock lock(mutex_);
    isNews = cloudProblem_ != text;
    cloudProblem_ = text;
  }
  if (!shown) {
    retryPause_ = {};
    if (wasWell) return;
    store_.retryAllNow();
    downloads_->retryAllNow();
    return;
  }
  if (!error) return;
  if (isNews) os_log_error(qvc_default_log(), "[ERROR] the cloud: %@", error);
  retryPause_ = std::min(std::max(retryPause_ * 2, kFirstPause), kLongestPause);
  if (const auto asked = CKErrorRetryAfter(error)) retryPause_ = std::max(retryPause_, *asked);
  nextPoll_ = std::chrono::steady_clock::now() + retryPause_;
}

// The versions that wait to replace what is here are fetched by the downloads.
void SyncEngine::startWaitingVersions() {
  for (const SyncRow &row : store_.withNewerVersion(kVersionsAtATime))
    if (row.item != 0) downloads_->fetchInBackground(row.item, row.newer.size);
}

void SyncEngine::answerWaiters() {
  if (waiting_.empty()) return;
  std::vector<Waiter> waiters = std::exchange(waiting_, {});
  const std::vector<QueuedUpload> queued = store_.allQueued(UINT32_MAX);
  for (Waiter &waiter : waiters) {
    bool isWaiting = false;
    NSError failure;
    for (const QueuedUpload &upload : queued) {
      const bool concerns =
          waiter.isAll || std::binary_search(waiter.items.begin(), waiter.items.end(), upload.item);
      if (!concerns) continue;
      isWaiting = true;
      if (upload.error) failure = upload.error;
      if (upload.isHeld)
        failure = qvc_error(QVErrorUnsentChanges, "deletions wait for an answer: droxa deletions");
    }
    if (isWaiting && !failure) {
      waiting_.push_back(std::move(waiter));
      continue;
    }
    dispatch_async_global([done = std::move(waiter.done), failure] { done(failure); });
  }
}

void SyncEngine::waitForWork() {
  if (moreIsDue_) return;
  auto until = nextPoll_;
  if (const auto retry = store_.nextRetry()) {
    const auto now = std::chrono::duration_cast<std::chrono::milliseconds>(
        std::chrono::system_clock::now().time_since_epoch());
    const auto wait = std::max(std::chrono::milliseconds(*retry) - now, std::chrono::milliseconds(5));
    if (retryPause_.count() == 0) until = std::min(until, std::chrono::steady_clock::now() + wait);
  }
  // Nobody tells of the end of the first look at the replica.
  if (!hasSeenReplica_) until = std::min(until, std::chrono::steady_clock::now() + kScanPoll);
  until = std::max(until, std::chrono::steady_clock::now() + std::chrono::milliseconds(1));
  Lock lock(mutex_);
  while (!stop_ && !hasLocalNews_ && !hasCloudNews_ && work_.empty()) {
    if (wake_.wait_until(mutex_, until) == std::cv_status::timeout) return;
  }
}

}  // namespace droxa::keld
