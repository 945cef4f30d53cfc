#include "platform/foundation/NSNotificationCenter.h"

#include <algorithm>
#include <atomic>
#include <vector>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

struct Registration {
  const void *key;
  bool isWeak;
  std::weak_ptr<const void> owner;
  NSNotificationHandler handler;
  std::string name;
  std::atomic<bool> isRemoved = false;

  bool isGone() const { return isRemoved || (isWeak && owner.expired()); }
};

using Registrations = std::vector<std::shared_ptr<Registration>>;

bool isEmptyHandle(const std::weak_ptr<const void> &owner) {
  const std::weak_ptr<const void> none;
  return !owner.owner_before(none) && !none.owner_before(owner);
}

}  // namespace

struct NSNotificationCenter::State {
  mutable Mutex mutex;
  Registrations registrations GUARDED_BY(mutex);  // in the order of registration

  // Takes out all that match. They come back to the caller, so that what their handlers hold is released
  // after the lock.
  template <class Predicate>
  Registrations take(Predicate matches) EXCLUDES(mutex) {
    const Lock lock(mutex);
    const auto end = std::stable_partition(registrations.begin(), registrations.end(),
                                           [&](const auto &registration) { return !matches(*registration); });
    Registrations taken(end, registrations.end());
    registrations.erase(end, registrations.end());
    for (const auto &registration : taken) registration->isRemoved = true;
    return taken;
  }
};

NSNotificationCenter &NSNotificationCenter::defaultCenter() {
  static auto *center = new NSNotificationCenter;  // never destroyed: threads may post while the process ends
  return *center;
}

NSNotificationCenter::NSNotificationCenter() : state_(std::make_unique<State>()) {}

NSNotificationCenter::~NSNotificationCenter() = default;

void NSNotificationCenter::addObserver(const void *observer, NSNotificationHandler handler,
                                       std::string_view name) {
  add(observer, {}, std::move(handler), name);
}

void NSNotificationCenter::add(const void *key, std::weak_ptr<const void> owner,
                               NSNotificationHandler handler, std::string_view name) {
  auto registration = std::make_shared<Registration>();
  registration->key = key;
  registration->isWeak = !isEmptyHandle(owner);
  registration->owner = std::move(owner);
  registration->handler = std::move(handler);
  registration->name = name;
  const Lock lock(state_->mutex);
  state_->registrations.push_back(std::move(registration));
}

void NSNotificationCenter::removeObserver(const void *observer) {
  state_->take([&](const Registration &registration) { return registration.key == observer; });
}

void NSNotificationCenter::removeObserver(const void *observer, std::string_view name) {
  state_->take([&](const Registration &registration) {
    return registration.key == observer && registration.name == name;
  });
}

void NSNotificationCenter::postNotificationName(std::string_view name) {
  Registrations receivers;
  {
    const Lock lock(state_->mutex);
    for (const auto &registration : state_->registrations) {
      if (registration->name == name) receivers.push_back(registration);
    }
  }
  bool anyGone = false;
  for (const auto &receiver : receivers) {
    const std::shared_ptr<const void> keptAlive = receiver->owner.lock();
    if (receiver->isWeak && !keptAlive) {
      anyGone = true;
    } else if (!receiver->isRemoved) {
      receiver->handler();
    }
  }
  if (anyGone) state_->take([](const Registration &registration) { return registration.isGone(); });
}

std::size_t NSNotificationCenter::registrationCount(const void *observer) const {
  const Lock lock(state_->mutex);
  return static_cast<std::size_t>(std::count_if(
      state_->registrations.begin(), state_->registrations.end(),
      [&](const auto &registration) { return registration->key == observer && !registration->isGone(); }));
}

}  // namespace droxa
