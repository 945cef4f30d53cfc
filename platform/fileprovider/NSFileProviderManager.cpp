#include "platform/fileprovider/NSFileProviderManager.h"

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {

struct NSFileProviderManager::State {
  Mutex mutex;
  std::shared_ptr<NSFileProviderHostLink> link GUARDED_BY(mutex);
};

NSFileProviderManager &NSFileProviderManager::defaultManager() {
  static auto *manager =
      new NSFileProviderManager;  // never destroyed: threads may signal while the process ends
  return *manager;
}

NSFileProviderManager::NSFileProviderManager() : state_(std::make_unique<State>()) {}

NSFileProviderManager::~NSFileProviderManager() = default;

void NSFileProviderManager::signalEnumeratorForContainerItemIdentifier(
    const std::string &identifier, NSFileProviderSignalCompletion completion) {
  std::shared_ptr<NSFileProviderHostLink> link;
  {
    const Lock lock(state_->mutex);
    link = state_->link;
  }
  if (link) {
    link->signalEnumeratorForContainerItemIdentifier(identifier, std::move(completion));
  } else if (completion) {
    // Later, as a link would: the caller may hold a lock that its completion takes.
    dispatch_async_global([completion = std::move(completion)] {
      completion(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid));
    });
  }
}

void NSFileProviderManager::setHostLink(std::shared_ptr<NSFileProviderHostLink> link) {
  const Lock lock(state_->mutex);
  state_->link.swap(link);  // the one before is released after the lock
}

}  // namespace droxa
