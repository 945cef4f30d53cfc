#include "keld/sync/Downloads.h"

#include <algorithm>
#include <cerrno>

#include "keld/sync/CloudErrors.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::chrono::seconds kFirstRetry{1};
constexpr std::chrono::seconds kLongestRetry{300};
constexpr std::size_t kMostFailuresKept = 10000;

NSError cancelledError() {
  return qvc_error(QVErrorCancelled, "nobody wants it any more");
}

}  // namespace

// What one who wants a document is told. Guarded by the downloads' mutex.
struct Downloads::Interest::State {
  std::vector<Ended> waiting;
  bool hasEnded = false;
  NSError outcome;
  std::uint64_t done = 0, total = 0;  // when it ended
};

Downloads::Downloads(std::shared_ptr<CKCloud> cloud, SyncStore &store, ReplicaFiles &files,
                     const ContentsStorage &storage, ItemStates &states, DownloadOptions options)
    : cloud_(std::move(cloud)),
      store_(store),
      files_(files),
      storage_(storage),
      states_(states),
      options_(options) {}

// --- Who wants what.

Downloads::Transfer &Downloads::transferOf(ItemNumber item, std::uint64_t size, DownloadPriority priority) {
  const auto known = byItem_.find(item);
  if (known != byItem_.end()) {
    Transfer &transfer = transfers_.at(known->second);
    if (priority > transfer.priority && !transfer.isRunning) {
      waiting_.erase({-static_cast<int>(transfer.priority), transfer.number});
      waiting_.insert({-static_cast<int>(priority), transfer.number});
    }
    transfer.priority = std::max(transfer.priority, priority);
    return transfer;
  }
  Transfer transfer;
  transfer.item = item;
  transfer.number = ++lastNumber_;
  transfer.total = size;
  transfer.priority = priority;
  byItem_[item] = transfer.number;
  waiting_.insert({-static_cast<int>(priority), transfer.number});
  return transfers_.emplace(transfer.number, std::move(transfer)).first->second;
}

std::unique_ptr<Downloads::Interest> Downloads::want(ItemNumber item, std::uint64_t size,
                                                     DownloadPriority priority) {
  auto interest = std::make_unique<Interest>();
  interest->downloads_ = shared_from_this();
  interest->state_ = std::make_shared<Interest::State>();
  const Lock lock(mutex_);
  if (stopped_ || pausedBecause_) {
    interest->state_->hasEnded = true;
    interest->state_->outcome = stopped_ ? cancelledError() : pausedBecause_;
    return interest;
  }
  Transfer &transfer = transferOf(item, size, priority);
  interest->transfer_ = transfer.number;
  transfer.interests.insert(interest->state_);
  startMore();
  return interest;
}

void Downloads::fetchInBackground(ItemNumber item, std::uint64_t size) {
  const Lock lock(mutex_);
  if (stopped_) return;
  const auto retry = retries_.find(item);
  if (pausedBecause_ || (retry != retries_.end() && retry->second.when > std::chrono::steady_clock::now())) {
    retries_[item].size = size;
    return;
  }
  transferOf(item, size, DownloadPriority::background).isKept = true;
  startMore();
}

void Downloads::retryDue() {
  const Lock lock(mutex_);
  if (stopped_ || pausedBecause_) return;
  const auto now = std::chrono::steady_clock::now();
  for (const auto &[item, retry] : retries_)
    if (retry.when <= now) transferOf(item, retry.size, DownloadPriority::background).isKept = true;
  startMore();
}

void Downloads::retryAllNow() {
  const Lock lock(mutex_);
  for (auto &[item, retry] : retries_) retry.when = {};
}

void Downloads::pause(const NSError &why) {
  std::vector<std::uint64_t> never;
  {
    const Lock lock(mutex_);
    if (stopped_) return;
    pausedBecause_ = why;
    waiting_.clear();
    for (auto &[number, transfer] : transfers_) {
      transfer.why = why;
      transfer.cancellation->cancel();
      if (!transfer.isRunning) never.push_back(number);
    }
    running_ += never.size();  // end() counts them as ended
  }
  for (const std::uint64_t number : never) end(number, why);
}

void Downloads::resume() {
  {
    const Lock lock(mutex_);
    pausedBecause_ = NSError();
  }
  retryAllNow();
  retryDue();
}

Downloads::Interest::~Interest() {
  cancel();
}

void Downloads::Interest::cancel() {
  downloads_->release(transfer_, state_);
}

void Downloads::Interest::whenEnded(Ended ended) {
  NSError outcome;
  {
    const Lock lock(downloads_->mutex_);
    if (!state_->hasEnded) {
      state_->waiting.push_back(std::move(ended));
      return;
    }
    outcome = state_->outcome;
  }
  dispatch_async_global([ended = std::move(ended), outcome] { ended(outcome); });
}

void Downloads::Interest::progress(std::uint64_t *done, std::uint64_t *total) const {
  const Lock lock(downloads_->mutex_);
  const auto transfer = downloads_->transfers_.find(transfer_);
  const bool isUnderWay = !state_->hasEnded && transfer != downloads_->transfers_.end();
  *done = isUnderWay ? transfer->second.done : state_->done;
  *total = isUnderWay ? transfer->second.total : state_->total;
}

// One that nobody wants any more is out of the list at once, so that whoever wants the document now gets a
// transfer of its own, and not the end of this one.
void Downloads::release(std::uint64_t number, const std::shared_ptr<Interest::State> &interest) {
  std::vector<Ended> told;
  const NSError error = cancelledError();
  {
    const Lock lock(mutex_);
    if (interest->hasEnded) return;
    interest->hasEnded = true;
    interest->outcome = error;
    told.swap(interest->waiting);
    const auto found = transfers_.find(number);
    if (found != transfers_.end()) {
      Transfer &transfer = found->second;
      interest->done = transfer.done;
      interest->total = transfer.total;
      transfer.interests.erase(interest);
      if (transfer.interests.empty() && !transfer.isKept) {
        transfer.cancellation->cancel();
        const auto known = byItem_.find(transfer.item);
        if (known != byItem_.end() && known->second == number) byItem_.erase(known);
        if (!transfer.isRunning) {
          waiting_.erase({-static_cast<int>(transfer.priority), number});
          transfers_.erase(found);
        }
      }
    }
  }
  for (Ended &ended : told) dispatch_async_global([ended = std::move(ended), error] { ended(error); });
}

void Downloads::startMore() {
  while (!stopped_ && !waiting_.empty()) {
    const bool forReader = waiting_.begin()->first == -static_cast<int>(DownloadPriority::reader);
    // A reader never waits behind what nobody waits for.
    const std::size_t most = forReader ? options_.atOnce * 4 : options_.atOnce;
    if (running_ >= most) return;
    const std::uint64_t number = waiting_.begin()->second;
    waiting_.erase(waiting_.begin());
    Transfer &transfer = transfers_.at(number);
    transfer.isRunning = true;
    ++running_;
    dispatch_async_global([self = shared_from_this(), number, item = transfer.item,
                           cancellation = transfer.cancellation] { self->run(number, item, cancellation); });
  }
}

void Downloads::noteOutcome(const Transfer &transfer, const NSError &error) {
  if (!error) {
    ++done_;
    failures_.erase(transfer.item);
    retries_.erase(transfer.item);
    return;
  }
  const bool isCancelled = error.is(QVTessalyErrorDomain, QVErrorCancelled);
  if (!isCancelled) {
    ++failed_;
    if (failures_.size() < kMostFailuresKept) failures_[transfer.item] = error;
  }
  const bool isGone = error.is(QVTessalyErrorDomain, QVErrorNoSuchItem);
  if (!transfer.isKept || isGone) return;
  Retry &retry = retries_[transfer.item];
  retry.size = transfer.total;
  if (isCancelled || pausedBecause_) return;
  const auto pause =
      std::min<std::chrono::seconds>(kFirstRetry * (1 << std::min(retry.failures, 20)), kLongestRetry);
  ++retry.failures;
  retry.when = std::chrono::steady_clock::now() + pause;
  if (retryIsKnown_) retryIsKnown_();
}

std::optional<std::chrono::steady_clock::time_point> Downloads::nextRetry() const {
  const Lock lock(mutex_);
  std::optional<std::chrono::steady_clock::time_point> next;
  if (stopped_ || pausedBecause_) return next;
  for (const auto &[item, retry] : retries_)
    if (byItem_.count(item) == 0 && (!next || retry.when < *next)) next = retry.when;
  return next;
}

void Downloads::end(std::uint64_t number, const NSError &outcome) {
  std::vector<Ended> told;
  NSError error = outcome;
  {
    const Lock lock(mutex_);
    auto node = transfers_.extract(number);
    if (!node) return;
    Transfer &transfer = node.mapped();
    const auto known = byItem_.find(transfer.item);
    if (known != byItem_.end() && known->second == number) byItem_.erase(known);
    --running_;
    if (error && transfer.why) error = transfer.why;
    noteOutcome(transfer, error);
    for (const auto &interest : transfer.interests) {
      interest->hasEnded = true;
      interest->outcome = error;
      interest->done = error ? transfer.done : transfer.total;
      interest->total = transfer.total;
      for (Ended &ended : interest->waiting) told.push_back(std::move(ended));
      interest->waiting.clear();
    }
    startMore();
    idle_.notify_all();
  }
  for (Ended &ended : told) dispatch_async_global([ended = std::move(ended), error] { ended(error); });
}

void Downloads::stop() {
  std::vector<std::uint64_t> never;
  {
    const Lock lock(mutex_);
    stopped_ = true;
    for (auto &[number, transfer] : transfers_) {
      transfer.why = cancelledError();  // whatever it meets while everything ends
      transfer.cancellation->cancel();
      if (!transfer.isRunning) never.push_back(number);
    }
    waiting_.clear();
    running_ += never.size();  // end() counts them as ended
  }
  for (const std::uint64_t number : never) end(number, cancelledError());
  Lock lock(mutex_);
  while (running_ > 0) idle_.wait(mutex_);
}

QVTransferCounts Downloads::counts() const {
  const Lock lock(mutex_);
  QVTransferCounts counts;
  counts.active = running_;
  counts.queued = waiting_.size();
  counts.done = done_;
  counts.failed = failed_;
  TransferRate rate = rate_;
  counts.bytesDone = rate.total();
  counts.bytesPerSecond = rate.bytesPerSecond();
  for (const auto &[number, transfer] : transfers_)
    counts.bytesLeft += transfer.total - std::min(transfer.done, transfer.total);
  return counts;
}

std::optional<std::uint64_t> Downloads::transferred(ItemNumber item) const {
  const Lock lock(mutex_);
  const auto known = byItem_.find(item);
  if (known == byItem_.end()) return std::nullopt;
  return transfers_.at(known->second).done;
}

NSError Downloads::lastError(ItemNumber item) const {
  const Lock lock(mutex_);
  const auto known = failures_.find(item);
  return known == failures_.end() ? NSError() : known->second;
}

}  // namespace droxa::keld
