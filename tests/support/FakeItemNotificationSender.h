#pragma once

#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"
#include "tests/support/CallLog.h"
#include "tests/support/FakeDrive.h"
#include "tests/support/FakeReplies.h"

namespace droxa {

class FakeDaemon;

// Whether a watch of `watched` sees the change.
bool FakeWatchSees(const FakeDriveChange &change, std::uint64_t watched, std::uint64_t options);

// The fake daemon's side of one receiver. It writes what it is asked into the daemon's log ("sender 1:
// watchItemAtURL(/replica/…, options 19)"), each proxy made of it too, and pushes one batch at a time, the
// next after the receiver's reply, which must come exactly once. Thread contract: any thread; the receiver is
// called where the daemon's answers run.
class FakeItemNotificationSender final : public QVItemNotificationSender,
                                         public std::enable_shared_from_this<FakeItemNotificationSender> {
 public:
  FakeItemNotificationSender(std::uint64_t index, std::weak_ptr<FakeDaemon> daemon,
                             std::shared_ptr<CallLog> log, std::shared_ptr<FakeReplies> replies,
                             std::shared_ptr<QVItemNotificationReceiving> receiver);
  ~FakeItemNotificationSender() override;

  void boostPriority(QVReply block) override;
  void watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) override;
  void invalidate() override;
  std::shared_ptr<QVItemNotificationSender> remoteObjectProxyWithErrorHandler(
      NSXPCErrorHandler handler) override;

  // For tests.
  void push(const QVQueryItems &items);  // as if the daemon had seen the changes
  // receiveProgressUpdates; whether its reply came is told by progressReplies().
  void pushProgress(const std::vector<std::string> &updates);
  std::size_t progressReplies() const;
  void callErrorHandlers(const NSError &error);  // of every proxy made so far, as when the daemon goes
  std::size_t proxiesMade() const;
  bool isInvalidated() const;
  bool isIdle() const;  // nothing waits to be pushed or to be replied to
  std::optional<std::uint64_t> watchOptions() const;
  std::optional<std::uint64_t> watchedNumber() const;  // of the item, in the drive

  // For the daemon.
  // Before the first watch stands the changes are kept for it; false once it does.
  bool keepIfNotWatching(const std::vector<FakeDriveChange> &changes);
  void stopWatching();
  void drop();  // forgets the receiver, so that no cycle outlives the daemon

 private:
  friend class FakeSenderProxy;
  void log(const std::string &call);
  void pump();
  void pushReplied();

  const std::uint64_t index_;
  const std::weak_ptr<FakeDaemon> daemon_;
  const std::shared_ptr<CallLog> log_;
  const std::shared_ptr<FakeReplies> replies_;
  mutable Mutex mutex_;
  std::shared_ptr<QVItemNotificationReceiving> receiver_ GUARDED_BY(mutex_);
  std::vector<NSXPCErrorHandler> handlers_ GUARDED_BY(mutex_);
  std::vector<QVReply> boosts_ GUARDED_BY(mutex_);
  QVQueryItems pending_ GUARDED_BY(mutex_);
  std::vector<FakeDriveChange> early_ GUARDED_BY(mutex_);  // before the first watch
  bool hasWatched_ GUARDED_BY(mutex_) = false;
  std::optional<std::uint64_t> watched_ GUARDED_BY(mutex_);
  std::optional<std::uint64_t> options_ GUARDED_BY(mutex_);
  std::size_t progressReplies_ GUARDED_BY(mutex_) = 0;
  bool pushing_ GUARDED_BY(mutex_) = false;
  bool invalidated_ GUARDED_BY(mutex_) = false;
};

}  // namespace droxa
