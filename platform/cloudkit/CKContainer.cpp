#include "platform/cloudkit/CKContainer.h"

#include <map>
#include <utility>

#include "platform/cloudkit/CKError.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

// One container of the process: how it is opened, and what that gave. Thread contract: any thread; the mutex
// is held while it is opened, so that whoever comes meanwhile gets the same.
class ProcessContainer {
 public:
  ProcessContainer(std::string identifier, CKContainerOpening opening)
      : identifier_(std::move(identifier)), opening_(std::move(opening)) {}

  std::shared_ptr<CKContainer> container(NSError *error) {
    const Lock lock(mutex_);
    const std::shared_ptr<CKCloud> cloud = opening_(error);
    if (!cloud) return nullptr;
    if (!container_ || container_->privateCloudDatabase()->cloud() != cloud)
      container_ = std::make_shared<CKContainer>(identifier_, cloud);
    return container_;
  }

 private:
  const std::string identifier_;
  const CKContainerOpening opening_;
  Mutex mutex_;
  std::shared_ptr<CKContainer> container_ GUARDED_BY(mutex_);
};

struct ProcessContainers {
  Mutex mutex;
  std::map<std::string, std::shared_ptr<ProcessContainer>> byIdentifier GUARDED_BY(mutex);
};

ProcessContainers &OfProcess() {
  static ProcessContainers &containers = *new ProcessContainers;
  return containers;
}

std::shared_ptr<ProcessContainer> Registered(const std::string &identifier) {
  ProcessContainers &containers = OfProcess();
  const Lock lock(containers.mutex);
  const auto found = containers.byIdentifier.find(identifier);
  return found == containers.byIdentifier.end() ? nullptr : found->second;
}

}  // namespace

CKContainer::CKContainer(std::string containerIdentifier, const std::shared_ptr<CKCloud> &privateCloud)
    : identifier_(std::move(containerIdentifier)),
      private_(std::make_shared<CKDatabase>(privateCloud)),
      shared_(std::make_shared<CKDatabase>(privateCloud->sharedDatabase(), CKDatabaseScope::sharedDatabase)) {
}

std::shared_ptr<CKContainer> CKContainer::containerWithIdentifier(const std::string &identifier,
                                                                  NSError *error) {
  NSError failure;
  std::shared_ptr<CKContainer> container;
  if (const auto registered = Registered(identifier)) {
    container = registered->container(&failure);
  } else {
    failure =
        CKErrorMake(CKErrorCode::invalidArguments, "This process has no way to a container " + identifier);
  }
  if (!container && error) *error = failure;
  return container;
}

void CKContainer::registerContainer(const std::string &identifier, CKContainerOpening opening) {
  std::shared_ptr<ProcessContainer> released;
  ProcessContainers &containers = OfProcess();
  const Lock lock(containers.mutex);
  released =
      std::exchange(containers.byIdentifier[identifier],
                    opening ? std::make_shared<ProcessContainer>(identifier, std::move(opening)) : nullptr);
}

void CKContainer::setSourceApplicationBundleIdentifier(const std::string &bundleIdentifier) {
  private_->setSourceApplicationBundleIdentifier(bundleIdentifier);
  shared_->setSourceApplicationBundleIdentifier(bundleIdentifier);
}

}  // namespace droxa
