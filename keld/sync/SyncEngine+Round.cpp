// The sync's thread: what a round does, and what it waits for.

#include <algorithm>
#include <utility>

#include "keld/sync/SyncEngine.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::chrono::milliseconds kFirstPause{500};
constexpr std::chrono::milliseconds kLongestPause{60'000};
constexpr std::chrono::milliseconds kCallTimeout{60'000};
constexpr std::chrono::milliseconds kNoPause{0}, kFirstAgain{25}, kLongestAgain{5'000};
constexpr std::uint64_t kVersionsAtATime = 1000;
constexpr std::chrono::milliseconds kScanPoll{100};

}  // namespace

CKCallContext SyncEngine::call(std::chrono::milliseconds timeout) const {
  CKCallContext context = CKCallContext::withTimeout(timeout);
  context.cancellation = stopping_;
  return context;
}

void SyncEngine::run() {
  try {
    conflicts_.undoNameAside(false);
  } catch (const SqlError &error) {
    os_log_fault(qvc_default_log(), "[CRIT] the sync's database failed: %s", error.what());
  }
  if (!scope().isShared()) conflicts_.placeRescuedFiles();
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
      answerFetches(qvc_error(QVErrorDatabase, error.what()));
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
    for (auto &fetch : fetches_) fetching_.push_back(std::move(fetch));
    fetches_.clear();
  }
  moreIsDue_ = false;
  // Asked for first: what it has seen by then is in the feed.
  const bool isReplicaSeen = !hasSeenReplica_ && keeper_() && keeper_()->firstScanDone();
  examiner_.examine();
  if (hasSeenReplica_ || isReplicaSeen) examiner_.forgetHoldIfNothingIsHeld();
  if (isReplicaSeen) afterFirstScan();
  for (const auto &task : work) task();
  if (!isSignedIn || !prepareCloud()) {
    answerFetches(isSignedIn ? problems_[fetching] : qvc_errorLoggedOut());
    answerWaiters();
    return;
  }
  const bool isPoll = std::chrono::steady_clock::now() >= nextPoll_;
  const std::uint64_t applied = applier_.applied();
  if (fetches) fetch();
  if (fetches) answerFetches(problems_[fetching]);
  if (isPoll) bringBackUnseen();
  // What is new here may be known there, until all of that was seen.
  if (applier_.hasFetchedAll()) {
    send();
    makeThumbnails(isPoll || applier_.applied() != applied);
  }
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
  if (sent.needsFetch) cloudChanged();
  if (sent.cloudProblem)
    noteCloudProblem(sending, sent.cloudProblem);
  else if (sent.sent > 0 || store_.countQueued() == 0)
    noteCloudProblem(sending, NSError());
  moreIsDue_ = sent.moreIsDue || (!sent.newerRecords.empty() && !sent.cloudProblem);
}

void SyncEngine::makeThumbnails(bool isPoll) {
  const auto newer = thumbnails_->work(isPoll, call(kCallTimeout));
  if (!newer.empty()) applier_.applyRecords(newer, call(kCallTimeout));
}

// The whole replica was looked at once: a record that no file stands for has lost its file unseen, and what
// is held because of a replaced folder is all there is.
void SyncEngine::afterFirstScan() {
  hasSeenReplica_ = true;
  conflicts_.undoNameAside(true);
  applier_.replicaWasSeen();
  for (const SyncRow &row : store_.datalessRows())
    if (isPinnedOrBelowPin(row.item)) downloads_->fetchInBackground(row.item, row.content.size);
}

bool SyncEngine::isSameCloud() {
  const std::string known = store_.text(kSyncCloudIdentifier);
  return known.empty() || cloud_->cloudIdentifier().description() == known;
}

bool SyncEngine::prepareCloud() {
  const UUID identifier = cloud_->cloudIdentifier();
  const std::string text = identifier.description();
  if (identifier.isNull()) {
    const NSError why = cloud_->accountStatus(call(kCallTimeout)).error;
    noteCloudProblem(fetching, CKErrorMake(CKErrorCode::serviceUnavailable,
                                           cloud_->description() + " can't be reached" +
                                               (why ? ": " + why.localizedDescription() : std::string()),
                                           why));
    return false;
  }
  // Each time: it may have been replaced while this runs.
  const std::string known = store_.text(kSyncCloudIdentifier);
  if (!known.empty() && known != text) {
    noteCloudProblem(fetching,
                     CKErrorMake(CKErrorCode::invalidArguments,
                                 cloud_->description() + " isn't the cloud that this drive is in (" + known +
                                     "); nothing is sent or fetched until that one is back"));
    return false;
  }
  if (isCloudReady_) return true;
  if (known.empty()) store_.setText(kSyncCloudIdentifier, text);
  // Another's zone isn't this account's to make.
  const NSError problem = scope().isShared() ? NSError() : cloud_->saveZone(scope().zone, call(kCallTimeout));
  if (problem) {
    noteCloudProblem(fetching, problem);
    return false;
  }
  if (!subscription_) {
    NSError error;
    subscription_ = cloud_->subscribe(
        [this](const std::vector<CKRecordZoneID> &zones) {
          const bool concerns = std::find(zones.begin(), zones.end(), scope().zone) != zones.end();
          if (!scope().isShared() || zones.empty() || concerns) cloudChanged();
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
  if (!error && applier_.isZoneGone() && zoneGone_) zoneGone_();
  // What stood in the way of a change is gone before long, as a rule: the keeper was about to look.
  const bool isIncomplete = !error && store_.countToFetch() > 0;
  againPause_ = isIncomplete ? std::clamp(againPause_ * 2, kFirstAgain, kLongestAgain) : kNoPause;
  if (isIncomplete) nextPoll_ = std::min(nextPoll_, std::chrono::steady_clock::now() + againPause_);
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
  nextPoll_ = pauseEnd_ = std::chrono::steady_clock::now() + retryPause_;
}

// What was made here and was gone again before the keeper saw it: no deletion is known of it, so it comes
// back. Whatever the keeper is about to see has been seen one poll later.
void SyncEngine::bringBackUnseen() {
  std::set<std::string> before = std::exchange(unbound_, {});
  for (const SyncRow &row : store_.unbound(kVersionsAtATime)) {
    unbound_.insert(row.record);
    if (before.count(row.record) > 0) applier_.bringBack(row);
  }
}

// The versions that wait to replace what is here are fetched by the downloads.
void SyncEngine::startWaitingVersions() {
  for (const SyncRow &row : store_.withNewerVersion(kVersionsAtATime))
    if (row.item != 0) downloads_->fetchInBackground(row.item, row.newer.size);
}

void SyncEngine::answerFetches(const NSError &error) {
  // A fetch that was cut off by the end is told as the end.
  const bool isEnd = stopping_->isCancelled();
  const NSError told = isEnd ? qvc_error(QVErrorShuttingDown, "the daemon is shutting down") : error;
  for (auto &done : std::exchange(fetching_, {}))
    dispatch_async_global([done = std::move(done), told] { done(told); });
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
    if (waiter.cancellation && waiter.cancellation->isCancelled())
      failure = qvc_error(QVErrorCancelled, "nobody waits for it any more");
    if (isWaiting && !failure) {
      waiting_.push_back(std::move(waiter));
      continue;
    }
    // When whoever asks for the states sees that it is there.
    states_.flush([done = std::move(waiter.done), failure] { done(failure); });
  }
}

void SyncEngine::waitForWork() {
  if (moreIsDue_) return;
  auto until = nextPoll_;
  if (const auto retry = store_.nextRetry()) {
    const auto now = std::chrono::duration_cast<std::chrono::milliseconds>(
        std::chrono::system_clock::now().time_since_epoch());
    const auto wait = std::max(std::chrono::milliseconds(*retry) - now, std::chrono::milliseconds(5));
    // What wasn't due yet when the cloud could be reached again isn't left to the next poll.
    until = std::min(until, std::max(std::chrono::steady_clock::now() + wait, pauseEnd_));
  }
  if (const auto retry = downloads_->nextRetry()) until = std::min(until, *retry);
  // Nobody tells of the end of the first look at the replica.
  if (!hasSeenReplica_) until = std::min(until, std::chrono::steady_clock::now() + kScanPoll);
  until = std::max(until, std::chrono::steady_clock::now() + std::chrono::milliseconds(1));
  Lock lock(mutex_);
  while (!stop_ && !hasLocalNews_ && !hasCloudNews_ && work_.empty()) {
    if (wake_.wait_until(mutex_, until) == std::cv_status::timeout) return;
  }
}

}  // namespace droxa::keld
