#pragma once

#include <cstdint>
#include <deque>
#include <map>
#include <memory>
#include <string>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// Tells the daemon's notifications to whoever subscribed: to each in order, one at a time; one that waits
// already isn't told twice. Thread contract: any thread; receivers are called on the pool.
class NotificationHub : public std::enable_shared_from_this<NotificationHub> {
 public:
  std::uint64_t subscribe(std::shared_ptr<QVDaemonNotificationReceiving> receiver);
  void unsubscribe(std::uint64_t subscription);
  void post(const std::string &name);
  std::size_t subscriptions() const;

 private:
  struct Subscription {
    std::shared_ptr<QVDaemonNotificationReceiving> receiver;
    std::deque<std::string> waiting;
    bool telling = false;
  };
  void pump(std::uint64_t subscription);
  void told(std::uint64_t subscription);

  mutable Mutex mutex_;
  std::map<std::uint64_t, Subscription> subscriptions_ GUARDED_BY(mutex_);
  std::uint64_t next_ GUARDED_BY(mutex_) = 1;
};

}  // namespace droxa::keld
