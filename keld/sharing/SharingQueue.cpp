#include "keld/sharing/SharingQueue.h"

#include <algorithm>
#include <utility>

#include "keld/Sql.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

NSError shuttingDown() {
  return qvc_error(QVErrorShuttingDown, "the daemon is shutting down");
}

NSError clientGone() {
  return qvc_error(QVErrorCancelled, "the operation was cancelled: its client's connection has ended");
}

}  // namespace

void SharingQueue::start(const std::shared_ptr<SharingOwner> &owner,
                         std::shared_ptr<QVOperationClient> client, Task task) {
  const auto operation = std::make_shared<SharingOperation>(std::move(client), options_.timeout);
  operation->setCancelHandler([queue = weak_from_this(), raw = operation.get()] {
    if (const auto self = queue.lock()) self->takeOut(raw);
  });
  operation->offerCancelling();
  const auto entry = std::make_shared<Entry>(Entry{operation, owner, std::move(task)});
  const NSError refused = add(entry);
  if (!refused) return;
  operation->finish();
  entry->task.answer(refused);
}

NSError SharingQueue::add(const std::shared_ptr<Entry> &entry) {
  const Lock lock(mutex_);
  if (stopped_) return shuttingDown();
  if (entry->owner->hasEnded) return clientGone();
  // From here on a cancellation finds it in the table.
  if (entry->operation->stopped()) {
    runOnPool(entry);
    return NSError();
  }
  if (running_.size() >= options_.atOnce && waiting_.size() >= options_.mostWaiting)
    return qvc_error(QVErrorBusy, std::to_string(waiting_.size()) +
                                      " sharing operations wait already; ask again when some have ended");
  waiting_.push_back(entry);
  startMore();
  return NSError();
}

void SharingQueue::startMore() {
  while (!waiting_.empty() && running_.size() < options_.atOnce) {
    const auto next = std::move(waiting_.front());
    waiting_.pop_front();
    runOnPool(next);
  }
}

void SharingQueue::runOnPool(const std::shared_ptr<Entry> &entry) {
  running_.insert(entry);
  dispatch_async_global([self = shared_from_this(), entry] { self->run(entry); });
}

void SharingQueue::run(const std::shared_ptr<Entry> &entry) {
  SharingOperation &operation = *entry->operation;
  NSError error = operation.stopped();
  try {
    if (!error) error = entry->task.perform(operation);
  } catch (const SqlError &problem) {
    os_log_error(qvc_default_log(), "[ERROR] sharing: the sync's database failed: %s", problem.what());
    error = qvc_error(QVErrorDatabase, problem.what());
  }
  // Whatever a cancelled operation failed with, that it was cancelled is why.
  if (const NSError why = operation.stopped(); error && why) error = why;
  operation.finish();
  entry->task.answer(error);
  entry->task = {};  // what it held isn't held after stop()
  const Lock lock(mutex_);
  running_.erase(entry);
  startMore();
  idle_.notify_all();
}

void SharingQueue::takeOut(const SharingOperation *operation) {
  const Lock lock(mutex_);
  const auto found = std::find_if(waiting_.begin(), waiting_.end(), [operation](const auto &entry) {
    return entry->operation.get() == operation;
  });
  if (found == waiting_.end()) return;
  const auto entry = *found;
  waiting_.erase(found);
  runOnPool(entry);
}

SharingQueue::Entries SharingQueue::entriesOf(const SharingOwner *owner) const {
  Entries found;
  const Lock lock(mutex_);
  const auto take = [&](const auto &entry) {
    if (!owner || entry->owner.get() == owner) found.push_back(entry);
  };
  std::for_each(running_.begin(), running_.end(), take);
  std::for_each(waiting_.begin(), waiting_.end(), take);
  return found;
}

void SharingQueue::end(const std::shared_ptr<SharingOwner> &owner) {
  {
    const Lock lock(mutex_);
    owner->hasEnded = true;
  }
  for (const auto &entry : entriesOf(owner.get())) entry->operation->cancel(clientGone());
}

void SharingQueue::stop() {
  {
    const Lock lock(mutex_);
    stopped_ = true;
  }
  for (const auto &entry : entriesOf(nullptr)) entry->operation->cancel(shuttingDown());
  const Lock lock(mutex_);
  while (!running_.empty() || !waiting_.empty()) idle_.wait(mutex_);
}

std::size_t SharingQueue::count() const {
  const Lock lock(mutex_);
  return running_.size() + waiting_.size();
}

}  // namespace droxa::keld
