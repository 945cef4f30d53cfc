#include "keld/sync/Downloads.h"

#include <algorithm>
#include <cerrno>

#include "keld/sync/CloudErrors.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kMostFinishedKept = 1000;
constexpr std::size_t kMostFailuresKept = 10000;

NSError cancelledError() {
  return qvc_error(QVErrorCancelled, "nobody wants it any more");
}

}  // namespace

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
  const Lock lock(mutex_);
  if (stopped_) return interest;  // of nothing: it is told as cancelled
  Transfer &transfer = transferOf(item, size, priority);
  interest->transfer_ = transfer.number;
  interest->number_ = ++lastNumber_;
  transfer.interests[interest->number_];
  startMore();
  return interest;
}

void Downloads::fetchInBackground(ItemNumber item, std::uint64_t size) {
  const Lock lock(mutex_);
  if (stopped_) return;
  transferOf(item, size, DownloadPriority::background).isKept = true;
  startMore();
}

Downloads::Interest::~Interest() {
  if (downloads_) downloads_->release(transfer_, number_, cancelledError());
}

void Downloads::Interest::cancel() {
  downloads_->release(transfer_, number_, cancelledError());
}

void Downloads::Interest::whenEnded(Ended ended) {
  NSError outcome = cancelledError();
  {
    const Lock lock(downloads_->mutex_);
    const auto transfer = downloads_->transfers_.find(transfer_);
    if (transfer != downloads_->transfers_.end()) {
      const auto interest = transfer->second.interests.find(number_);
      if (interest != transfer->second.interests.end()) {
        interest->second.push_back(std::move(ended));
        return;
      }
    } else if (const auto known = downloads_->finished_.find(transfer_);
               known != downloads_->finished_.end()) {
      outcome = known->second.error;
    }
  }
  dispatch_async_global([ended = std::move(ended), outcome] { ended(outcome); });
}

void Downloads::Interest::progress(std::uint64_t *done, std::uint64_t *total) const {
  const Lock lock(downloads_->mutex_);
  const auto transfer = downloads_->transfers_.find(transfer_);
  if (transfer != downloads_->transfers_.end()) {
    *done = transfer->second.done;
    *total = transfer->second.total;
    return;
  }
  const auto known = downloads_->finished_.find(transfer_);
  *done = known == downloads_->finished_.end() ? 0 : known->second.done;
  *total = known == downloads_->finished_.end() ? 0 : known->second.total;
}

void Downloads::release(std::uint64_t number, std::uint64_t interest, const NSError &error) {
  std::vector<Ended> told;
  {
    const Lock lock(mutex_);
    const auto found = transfers_.find(number);
    if (found == transfers_.end()) return;
    Transfer &transfer = found->second;
    auto node = transfer.interests.extract(interest);
    if (!node) return;
    told = std::move(node.mapped());
    if (transfer.interests.empty() && !transfer.isKept) {
      transfer.cancellation->cancel();
      if (!transfer.isRunning) {
        waiting_.erase({-static_cast<int>(transfer.priority), number});
        byItem_.erase(transfer.item);
        transfers_.erase(found);
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

void Downloads::end(std::uint64_t number, const NSError &error) {
  std::vector<Ended> told;
  {
    const Lock lock(mutex_);
    auto node = transfers_.extract(number);
    if (!node) return;
    Transfer &transfer = node.mapped();
    byItem_.erase(transfer.item);
    --running_;
    if (!error) {
      ++done_;
      failures_.erase(transfer.item);
    } else if (!error.is(QVTessalyErrorDomain, QVErrorCancelled)) {
      ++failed_;
      if (failures_.size() < kMostFailuresKept) failures_[transfer.item] = error;
    }
    for (auto &[interest, waiting] : transfer.interests)
      for (Ended &ended : waiting) told.push_back(std::move(ended));
    finished_[number] = {error, error ? transfer.done : transfer.total, transfer.total};
    if (finished_.size() > kMostFinishedKept) finished_.erase(finished_.begin());
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
