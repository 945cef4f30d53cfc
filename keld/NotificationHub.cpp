#include "keld/NotificationHub.h"

#include <algorithm>
#include <vector>

#include "platform/dispatch/dispatch.h"

namespace droxa::keld {

std::uint64_t NotificationHub::subscribe(std::shared_ptr<QVDaemonNotificationReceiving> receiver) {
  const Lock lock(mutex_);
  subscriptions_[next_].receiver = std::move(receiver);
  return next_++;
}

void NotificationHub::unsubscribe(std::uint64_t subscription) {
  std::shared_ptr<QVDaemonNotificationReceiving> receiver;  // released outside the lock
  const Lock lock(mutex_);
  const auto found = subscriptions_.find(subscription);
  if (found == subscriptions_.end()) return;
  receiver = std::move(found->second.receiver);
  subscriptions_.erase(found);
}

void NotificationHub::post(const std::string &name) {
  std::vector<std::uint64_t> all;
  {
    const Lock lock(mutex_);
    for (auto &entry : subscriptions_) {
      auto &waiting = entry.second.waiting;
      if (std::find(waiting.begin(), waiting.end(), name) == waiting.end()) waiting.push_back(name);
      all.push_back(entry.first);
    }
  }
  for (const std::uint64_t subscription : all) pump(subscription);
}

void NotificationHub::pump(std::uint64_t subscription) {
  std::shared_ptr<QVDaemonNotificationReceiving> receiver;
  std::string name;
  {
    const Lock lock(mutex_);
    const auto found = subscriptions_.find(subscription);
    if (found == subscriptions_.end() || found->second.telling || found->second.waiting.empty()) return;
    found->second.telling = true;
    name = found->second.waiting.front();
    found->second.waiting.pop_front();
    receiver = found->second.receiver;
  }
  dispatch_async_global([self = shared_from_this(), subscription, receiver, name] {
    const auto proxy = NSXPCProxyWithErrorHandler<QVDaemonNotificationReceiving>(
        receiver, [self, subscription](const NSError &) { self->unsubscribe(subscription); });
    proxy->receiveNotification(name, [self, subscription] { self->told(subscription); });
  });
}

void NotificationHub::told(std::uint64_t subscription) {
  {
    const Lock lock(mutex_);
    const auto found = subscriptions_.find(subscription);
    if (found == subscriptions_.end()) return;
    found->second.telling = false;
  }
  pump(subscription);
}

std::size_t NotificationHub::subscriptions() const {
  const Lock lock(mutex_);
  return subscriptions_.size();
}

}  // namespace droxa::keld
