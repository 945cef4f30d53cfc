#include "platform/foundation/NSFileManager.h"

#include <utility>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

bool NSUbiquitousItemProviding::isShared(const NSURL & /*url*/, bool *value, NSError * /*error*/) {
  *value = false;
  return true;
}

NSURL NSUbiquitousItemProviding::itemReplacementDirectoryForURL(const NSURL & /*url*/) {
  return {};
}

void NSUbiquitousItemProviding::willDeleteItemAtURL(const NSURL & /*url*/) {}

NSURL NSUbiquitousItemProviding::physicalURLForURL(const NSURL &url) {
  return url;
}

NSURL NSUbiquitousItemProviding::physicalURLForName(const NSURL &folder, const std::string &name) {
  return folder.URLByAppendingPathComponent(name);
}

struct NSFileManager::State {
  mutable Mutex mutex;
  std::shared_ptr<NSUbiquitousItemProviding> provider GUARDED_BY(mutex);
};

NSFileManager::NSFileManager() : state_(std::make_unique<State>()) {}

NSFileManager::~NSFileManager() = default;

NSFileManager *NSFileManager::defaultManager() {
  static NSFileManager &manager = *new NSFileManager;
  return &manager;
}

void NSFileManager::setUbiquitousItemProvider(std::shared_ptr<NSUbiquitousItemProviding> provider) {
  const Lock lock(state_->mutex);
  state_->provider.swap(provider);
}

std::shared_ptr<NSUbiquitousItemProviding> NSFileManager::ubiquitousItemProvider() const {
  const Lock lock(state_->mutex);
  return state_->provider;
}

bool NSFileManager::evictUbiquitousItemAtURL(const NSURL &url, NSError *error) const {
  const auto provider = ubiquitousItemProvider();
  const NSError failure =
      provider ? provider->evictItemAtURL(url)
               : NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError,
                         {{NSLocalizedDescriptionKey, "no sync service keeps documents here"}});
  if (error && failure) *error = failure;
  return !failure;
}

}  // namespace droxa
