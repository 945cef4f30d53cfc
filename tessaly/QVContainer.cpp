#include "tessaly/QVContainer.h"

#include <nlohmann/json.hpp>
#include <optional>
#include <utility>

#include "platform/foundation/NSNotificationCenter.h"
#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVConfigurationFile.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVNotifications.h"

namespace droxa {

namespace {

using Containers = std::map<std::string, std::shared_ptr<const QVContainer>>;

// The list as the daemon last told it. A change of the list only marks it as out of date: whoever asks next,
// fetches it. Until that succeeds, the old list is what is known. Thread contract: any thread; mutex_ is
// never held during a call to the daemon.
class ContainerList {
 public:
  static ContainerList &shared() {
    static ContainerList *const list = new ContainerList;  // outlives every thread that may ask
    return *list;
  }

  Containers containers() {
    std::uint64_t asked = 0;
    {
      const Lock lock(mutex_);
      observe();
      if (upToDate_) return known_;
      asked = generation_;
    }
    std::optional<Containers> fetched = fetch();
    const Lock lock(mutex_);
    if (!fetched) return known_;
    if (generation_ == asked) {
      known_ = *fetched;
      upToDate_ = true;
    }
    return *std::move(fetched);  // of a list that changed meanwhile: right for this caller, not for the next
  }

  void markOutOfDate() {
    const Lock lock(mutex_);
    upToDate_ = false;
    ++generation_;
  }

  void forget() {
    const Lock lock(mutex_);
    upToDate_ = false;
    known_.clear();
    ++generation_;
  }

 private:
  void observe() REQUIRES(mutex_) {
    if (std::exchange(observing_, true)) return;
    NSNotificationCenter::defaultCenter().addObserver(
        this, [this] { markOutOfDate(); }, QVContainerListDidChangeNotification);
  }

  static std::optional<Containers> fetch() {
    using Descriptions = std::optional<std::vector<QVContainerDescription>>;
    const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
    (*proxy)->getContainers([&proxy](const std::vector<QVContainerDescription> &list, const NSError &error) {
      proxy->setObjResult(error ? Descriptions() : Descriptions(list), error);
    });
    const Descriptions descriptions = proxy->result<Descriptions>();
    if (!descriptions) {
      os_log_error(qvc_default_log(), "[ERROR] can't get the containers: %@", proxy->error());
      return std::nullopt;
    }
    Containers containers;
    for (const QVContainerDescription &description : *descriptions)
      containers[description.containerID] = std::make_shared<const QVContainer>(description);
    return containers;
  }

  Mutex mutex_;
  Containers known_ GUARDED_BY(mutex_);
  bool upToDate_ GUARDED_BY(mutex_) = false;
  bool observing_ GUARDED_BY(mutex_) = false;
  std::uint64_t generation_ GUARDED_BY(mutex_) = 0;  // advanced by every change of the list
};

Mutex gManagedMutex;
std::optional<bool> gManaged GUARDED_BY(gManagedMutex);

bool readManaged() {
  const std::string path = DroxaProcessHome().configuration() + "/provider.json";
  NSError error;
  const std::optional<std::string> text = QVConfigurationFileRead(path, &error);
  const nlohmann::json object = nlohmann::json::parse(text.value_or("{}"));
  if (error) {
    os_log(qvc_default_log(), "[WARNING] %s; the provider counts as not managed",
           error.localizedDescription());
    return false;
  }
  if (!object.is_object() || !object.contains("managed")) return false;
  if (object["managed"].is_boolean()) return object["managed"].get<bool>();
  os_log(qvc_default_log(), "[WARNING] %s: managed must be true or false; false is used", path);
  return false;
}

}  // namespace

const char *QVDocumentsFolderName(std::string_view containerID) {
  return containerID == QVUbiquitousTrashContainerID ? "files" : "Documents";
}

QVContainer::QVContainer(QVContainerDescription description) : description_(std::move(description)) {}

std::map<std::string, std::shared_ptr<const QVContainer>> QVContainer::allContainersByContainerID() {
  return ContainerList::shared().containers();
}

std::vector<std::shared_ptr<const QVContainer>> QVContainer::allContainers() {
  std::vector<std::shared_ptr<const QVContainer>> list;
  for (auto &entry : ContainerList::shared().containers()) list.push_back(entry.second);
  return list;
}

bool QVContainerCache::isManagedProvider() {
  const Lock lock(gManagedMutex);
  if (!gManaged) gManaged = readManaged();
  return *gManaged;
}

void QVContainerCache::setManagedProviderForTesting(bool managed) {
  const Lock lock(gManagedMutex);
  gManaged = managed;
}

void QVContainerCache::markOutOfDate() {
  ContainerList::shared().markOutOfDate();
}

void QVContainerCache::forget() {
  ContainerList::shared().forget();
  const Lock lock(gManagedMutex);
  gManaged.reset();
}

}  // namespace droxa
