#include "tests/support/FakeItemNotificationSender.h"

#include <algorithm>
#include <gtest/gtest.h>
#include <utility>

#include "tests/support/FakeDaemon.h"
#include "tests/support/Once.h"

namespace droxa {

namespace {

bool contains(const std::vector<std::uint64_t> &folders, std::uint64_t folder) {
  return std::find(folders.begin(), folders.end(), folder) != folders.end();
}

}  // namespace

bool FakeWatchSees(const FakeDriveChange &change, std::uint64_t watched, std::uint64_t options) {
  if (change.item->isDead() && change.item->fileObjectID().number() == watched) return true;
  if ((options & (change.item->isDead() ? QVWatchDeaths : QVWatchUpdates)) == 0) return false;
  if (options & QVWatchSubtree)
    return contains(change.foldersBefore, watched) || contains(change.foldersAfter, watched);
  return (!change.foldersBefore.empty() && change.foldersBefore.front() == watched) ||
         (!change.foldersAfter.empty() && change.foldersAfter.front() == watched);
}

// A proxy of a sender: passes calls on, or fails them in transport when the test asked for it.
class FakeSenderProxy final : public QVItemNotificationSender {
 public:
  FakeSenderProxy(std::shared_ptr<FakeItemNotificationSender> sender, NSXPCErrorHandler handler)
      : sender_(std::move(sender)), handler_(std::move(handler)) {}

  void boostPriority(QVReply block) override {
    if (!failed("boostPriority")) sender_->boostPriority(std::move(block));
  }
  void watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) override {
    if (!failed("watchItemAtURL")) sender_->watchItemAtURL(url, options, std::move(gatherReply));
  }
  void invalidate() override {
    if (!failed("invalidate")) sender_->invalidate();
  }
  std::shared_ptr<QVItemNotificationSender> remoteObjectProxyWithErrorHandler(
      NSXPCErrorHandler handler) override {
    return sender_->remoteObjectProxyWithErrorHandler(std::move(handler));
  }

 private:
  bool failed(const char *operation) {
    const NSError failure = sender_->replies_->takeTransportFailure(operation);
    if (!failure) return false;
    sender_->log(operation);
    sender_->replies_->give(operation, [handler = handler_, failure] { handler(failure); });
    return true;
  }
  const std::shared_ptr<FakeItemNotificationSender> sender_;
  const NSXPCErrorHandler handler_;
};

FakeItemNotificationSender::FakeItemNotificationSender(std::uint64_t index, std::weak_ptr<FakeDaemon> daemon,
                                                       std::shared_ptr<CallLog> log,
                                                       std::shared_ptr<FakeReplies> replies,
                                                       std::shared_ptr<QVItemNotificationReceiving> receiver)
    : index_(index),
      daemon_(std::move(daemon)),
      log_(std::move(log)),
      replies_(std::move(replies)),
      receiver_(std::move(receiver)) {}

FakeItemNotificationSender::~FakeItemNotificationSender() = default;

void FakeItemNotificationSender::log(const std::string &call) {
  log_->add("sender " + std::to_string(index_) + ": " + call);
}

void FakeItemNotificationSender::boostPriority(QVReply block) {
  log("boostPriority");
  {
    const Lock lock(mutex_);
    if (!invalidated_) {
      boosts_.push_back(std::move(block));
      return;
    }
  }
  replies_->give("boostPriority", std::move(block));
}

void FakeItemNotificationSender::watchItemAtURL(const NSURL &url, std::uint64_t options,
                                                QVErrorReply gatherReply) {
  log("watchItemAtURL(" + url.path() + ", options " + std::to_string(options) + ")");
  NSError error = replies_->takeFailure("watchItemAtURL");
  const std::shared_ptr<FakeDaemon> daemon = daemon_.lock();
  const std::uint64_t number = daemon && !error ? daemon->numberAtPath(url.path()) : 0;
  if (!error && number == 0) error = qvc_errorNoSuchItem(url.path());
  {
    const Lock lock(mutex_);
    watched_.reset();
    options_ = options;
    if (!error && !invalidated_) {
      watched_ = number;
      hasWatched_ = true;
      for (const FakeDriveChange &one : std::exchange(early_, {}))
        if (FakeWatchSees(one, number, options)) pending_.push_back(one.item);
    }
  }
  replies_->run([self = shared_from_this()] { self->pump(); });
  replies_->give("watchItemAtURL", [gatherReply = std::move(gatherReply), error] { gatherReply(error); });
}

void FakeItemNotificationSender::invalidate() {
  log("invalidate");
  std::vector<QVReply> boosts;
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  {
    const Lock lock(mutex_);
    invalidated_ = true;
    watched_.reset();
    pending_.clear();
    boosts.swap(boosts_);
    receiver.swap(receiver_);
  }
  for (QVReply &block : boosts) replies_->give("boostPriority", std::move(block));
}

std::shared_ptr<QVItemNotificationSender> FakeItemNotificationSender::remoteObjectProxyWithErrorHandler(
    NSXPCErrorHandler handler) {
  log("remoteObjectProxyWithErrorHandler");
  {
    const Lock lock(mutex_);
    handlers_.push_back(handler);
  }
  return std::make_shared<FakeSenderProxy>(shared_from_this(), std::move(handler));
}

void FakeItemNotificationSender::push(const QVQueryItems &items) {
  {
    const Lock lock(mutex_);
    if (invalidated_) return;
    for (const auto &item : items) {
      if (options_.value_or(0) & QVWatchCoalesced) {
        const auto same = [&item](const auto &other) {
          return other->fileObjectID() == item->fileObjectID();
        };
        pending_.erase(std::remove_if(pending_.begin(), pending_.end(), same), pending_.end());
      }
      pending_.push_back(item);
    }
  }
  replies_->run([self = shared_from_this()] { self->pump(); });
}

void FakeItemNotificationSender::pump() {
  QVQueryItems batch;
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  {
    const Lock lock(mutex_);
    if (pushing_ || invalidated_ || pending_.empty() || !receiver_) return;
    pushing_ = true;
    batch.swap(pending_);
    receiver = receiver_;
  }
  receiver->receiveUpdates(
      batch, {}, {},
      exactlyOnce("reply to receiveUpdates",
                  std::function<void()>([self = shared_from_this()] { self->pushReplied(); })));
}

void FakeItemNotificationSender::pushReplied() {
  {
    const Lock lock(mutex_);
    pushing_ = false;
  }
  replies_->run([self = shared_from_this()] { self->pump(); });
}

void FakeItemNotificationSender::pushProgress(const std::vector<std::string> &updates) {
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  {
    const Lock lock(mutex_);
    receiver = receiver_;
  }
  if (!receiver) return;
  receiver->receiveProgressUpdates(updates, [self = shared_from_this()] {
    const Lock lock(self->mutex_);
    ++self->progressReplies_;
  });
}

std::size_t FakeItemNotificationSender::progressReplies() const {
  const Lock lock(mutex_);
  return progressReplies_;
}

void FakeItemNotificationSender::callErrorHandlers(const NSError &error) {
  std::vector<NSXPCErrorHandler> handlers;
  {
    const Lock lock(mutex_);
    handlers = handlers_;
  }
  for (const NSXPCErrorHandler &handler : handlers) handler(error);
}

std::size_t FakeItemNotificationSender::proxiesMade() const {
  const Lock lock(mutex_);
  return handlers_.size();
}

bool FakeItemNotificationSender::isInvalidated() const {
  const Lock lock(mutex_);
  return invalidated_;
}

bool FakeItemNotificationSender::isIdle() const {
  const Lock lock(mutex_);
  return !pushing_ && pending_.empty();
}

std::optional<std::uint64_t> FakeItemNotificationSender::watchOptions() const {
  const Lock lock(mutex_);
  return options_;
}

std::optional<std::uint64_t> FakeItemNotificationSender::watchedNumber() const {
  const Lock lock(mutex_);
  return watched_;
}

bool FakeItemNotificationSender::keepIfNotWatching(const std::vector<FakeDriveChange> &changes) {
  const Lock lock(mutex_);
  if (hasWatched_ || invalidated_) return false;
  early_.insert(early_.end(), changes.begin(), changes.end());
  return true;
}

void FakeItemNotificationSender::stopWatching() {
  const Lock lock(mutex_);
  watched_.reset();
}

void FakeItemNotificationSender::drop() {
  std::shared_ptr<QVItemNotificationReceiving> receiver;
  std::vector<NSXPCErrorHandler> handlers;
  std::vector<QVReply> boosts;
  const Lock lock(mutex_);
  receiver.swap(receiver_);
  handlers.swap(handlers_);
  boosts.swap(boosts_);
}

}  // namespace droxa
