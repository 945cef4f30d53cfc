#include "keld/UpdateSender.h"

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {
constexpr std::size_t kMostItemsAPush = 1000;
}  // namespace

UpdateSender::UpdateSender(std::weak_ptr<UpdateSenderHost> host,
                           std::shared_ptr<QVItemNotificationReceiving> receiver, std::uint64_t made)
    : host_(std::move(host)), receiver_(std::move(receiver)), made_(made) {}

UpdateSender::~UpdateSender() {
  // Nobody can see it end any more but those who wait for the end of their boost.
  for (QVReply &boost : boosts_) dispatch_async_global(std::move(boost));
}

void UpdateSender::boostPriority(QVReply block) {
  {
    const Lock lock(mutex_);
    if (receiver_) {
      boosts_.push_back(std::move(block));
      return;
    }
  }
  block();
}

void UpdateSender::watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) {
  const auto host = host_.lock();
  if (!host) return gatherReply(qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
  std::uint64_t since = host->lastCommit();
  {
    const Lock lock(mutex_);
    watch_.reset();
    since = made_.value_or(since);
  }
  host->findWatchTarget(
      url, [self = shared_from_this(), options, url, since, gatherReply = std::move(gatherReply)](
               std::optional<UpdateWatch> watch, const NSError &error) {
        if (!watch) return gatherReply(error ? error : qvc_errorNoSuchItem(url.path()));
        watch->options = options;
        gatherReply(self->watchFound(*watch, since));
      });
}

// The watch stands before the item is looked at again: a death in between is seen by one or the other.
NSError UpdateSender::watchFound(const UpdateWatch &watch, std::uint64_t since) {
  const auto host = host_.lock();
  if (!host) return qvc_error(QVErrorShuttingDown, "the daemon is shutting down");
  if (const NSError error = host->beginWatch(*this, watch, since)) return error;
  if (host->exists(watch.folder)) return NSError();
  stopWatching();
  return qvc_errorNoSuchItem(QVFileObjectID::folderOrAliasID(watch.folder).asString());
}

void UpdateSender::beginWatch(const UpdateWatch &watch, const std::vector<PendingPush> &missed) {
  {
    const Lock lock(mutex_);
    if (!receiver_) return;
    watch_ = watch;
    made_.reset();
    append(missed);
  }
  pump();
}

void UpdateSender::stopWatching() {
  const Lock lock(mutex_);
  watch_.reset();
}

void UpdateSender::invalidate() {
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  std::vector<QVReply> boosts;
  {
    const Lock lock(mutex_);
    receiver.swap(receiver_);
    boosts.swap(boosts_);
    watch_.reset();
    queue_.clear();
    places_.clear();
  }
  for (QVReply &boost : boosts) dispatch_async_global(std::move(boost));
}

std::shared_ptr<QVItemNotificationSender> UpdateSender::remoteObjectProxyWithErrorHandler(NSXPCErrorHandler) {
  return shared_from_this();
}

std::optional<UpdateWatch> UpdateSender::watch() const {
  const Lock lock(mutex_);
  return watch_;
}

bool UpdateSender::isBoosted() const {
  const Lock lock(mutex_);
  return !boosts_.empty();
}

bool UpdateSender::isInvalidated() const {
  const Lock lock(mutex_);
  return receiver_ == nullptr;
}

void UpdateSender::enqueue(const std::vector<PendingPush> &pushes, bool last) {
  {
    const Lock lock(mutex_);
    if (!receiver_ || !watch_) return;
    append(pushes);
    if (last) watch_.reset();
  }
  pump();
}

void UpdateSender::append(const std::vector<PendingPush> &pushes) {
  const bool coalesces = (watch_->options & QVWatchCoalesced) != 0;
  for (const PendingPush &push : pushes) {
    if (const auto waiting = places_.find(push.id); coalesces && waiting != places_.end())
      queue_.erase(waiting->second);
    places_[push.id] = nextPlace_;
    queue_.emplace(nextPlace_++, push);
  }
}

void UpdateSender::pump() {
  {
    const Lock lock(mutex_);
    if (pushing_ || !receiver_ || queue_.empty()) return;
    pushing_ = true;
  }
  dispatch_async_global([self = shared_from_this()] { self->push(); });
}

void UpdateSender::push() {
  std::vector<PendingPush> pushes;
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  {
    const Lock lock(mutex_);
    receiver = receiver_;
    while (!queue_.empty() && pushes.size() < kMostItemsAPush) {
      const auto first = queue_.begin();
      const auto place = places_.find(first->second.id);
      if (place != places_.end() && place->second == first->first) places_.erase(place);
      pushes.push_back(first->second);
      queue_.erase(first);
    }
  }
  const auto host = host_.lock();
  const QVQueryItems items = host && receiver ? host->itemsForPush(pushes) : QVQueryItems();
  if (items.empty()) return pushEnded();
  // A receiver that can't be reached is given up: the end of its connection, or its own wish, ends the
  // sender.
  const auto proxy = NSXPCProxyWithErrorHandler<QVItemNotificationReceiving>(
      receiver, [weak = weak_from_this()](const NSError &error) {
        os_log_info(qvc_default_log(), "[INFO] an update receiver can't be reached: %@", error);
        if (const auto self = weak.lock()) self->invalidate();
      });
  proxy->receiveUpdates(items, {}, {}, [self = shared_from_this()] { self->pushEnded(); });
}

void UpdateSender::pushEnded() {
  {
    const Lock lock(mutex_);
    pushing_ = false;
  }
  pump();
}

}  // namespace droxa::keld
