#pragma once

#include <cstdint>
#include <memory>
#include <string>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// This process's subscription to the daemon's notifications. It posts each on the default notification
// centre, the caches brought up to date before. When the daemon has gone it tries again, at growing
// intervals, for ever; once the daemon is back it posts both notifications, because what happened in between
// isn't known. Thread contract: any thread. Notifications are posted on threads of the daemon connection or
// the pool, one after the other as far as the daemon sends them so, with no lock held.
class QVDaemonNotifications final : public std::enable_shared_from_this<QVDaemonNotifications> {
 public:
  static const std::shared_ptr<QVDaemonNotifications> &shared();

  // Subscribes unless it is done or under way on that connection.
  void subscribeIfNeeded(const std::shared_ptr<QVDaemonConnection> &connection);

 private:
  class Receiver;
  void attempt(std::uint64_t number);
  void succeeded(std::uint64_t number);
  void failed(std::uint64_t number, const NSError &error);
  bool isCurrent(std::uint64_t number);
  static void post(const std::string &name);

  Mutex mutex_;
  std::weak_ptr<QVDaemonConnection> connection_ GUARDED_BY(mutex_);  // once it is gone, nobody tries any more
  std::uint64_t attempt_ GUARDED_BY(mutex_) =
      0;  // the one that counts; what comes from older ones is ignored
  std::uint32_t failures_ GUARDED_BY(mutex_) = 0;  // since it last stood
  bool missedSome_ GUARDED_BY(mutex_) = false;     // since the process first wanted to know
};

}  // namespace droxa
