#include "keld/sync/SharedZones.h"

#include <cerrno>
#include <cstring>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

#include "keld/SharedContainer.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr char kFolder[] = "/shared";
constexpr char kSuffix[] = ".sqlite";
constexpr char kOwner[] = "zoneOwner";
constexpr char kTitle[] = "zoneTitle";
constexpr std::chrono::milliseconds kCallTimeout{60'000};
constexpr std::chrono::milliseconds kSoon{1'000};  // until what couldn't be done is tried again

std::vector<std::string> databasesIn(const std::string &folder) {
  std::vector<std::string> paths;
  std::error_code problem;
  for (std::filesystem::directory_iterator entry(folder, problem), end; !problem && entry != end;
       entry.increment(problem))
    if (entry->path().extension() == kSuffix) paths.push_back(entry->path().string());
  return paths;
}

void removeDatabase(const std::string &path) {
  for (const char *suffix : {"", "-wal", "-shm"}) ::unlink((path + suffix).c_str());
}

}  // namespace

SharedZones::SharedZones(SharedZonesHost host, std::shared_ptr<SyncEngine> drive,
                         std::shared_ptr<CKCloud> cloud, std::chrono::milliseconds pollInterval)
    : host_(std::move(host)),
      drive_(std::move(drive)),
      cloud_(std::move(cloud)),
      pollInterval_(pollInterval) {}

SharedZones::~SharedZones() {
  stop();
}

void SharedZones::readTitles(const std::string &stateFolder,
                             const std::function<void(const std::string &, const std::string &)> &setTitle) {
  for (const std::string &path : databasesIn(stateFolder + kFolder)) {
    try {
      SyncStore store(path);
      const std::string owner = store.text(kOwner);
      const std::string title = store.text(kTitle);
      if (!owner.empty() && !title.empty()) setTitle(SharedContainerOf(owner), title);
    } catch (const SqlError &) {
      // start() tells.
    }
  }
}

void SharedZones::start() {
  beginKnown();
  nextPoll_ = std::chrono::steady_clock::now();
  thread_ = std::thread([this] { run(); });
}

void SharedZones::stop() {
  {
    const Lock lock(mutex_);
    stop_ = true;
    wake_.notify_all();
  }
  stopping_->cancel();
  if (thread_.joinable()) thread_.join();
  subscription_.reset();
  for (const auto &engine : engines()) engine->stop();
}

void SharedZones::setSignedIn(bool isSignedIn) {
  {
    const Lock lock(mutex_);
    signedIn_ = isSignedIn;
    hasNews_ = true;
    wake_.notify_all();
  }
  for (const auto &engine : engines()) engine->setSignedIn(isSignedIn);
}

void SharedZones::itemsChanged() {
  for (const auto &engine : engines()) engine->itemsChanged();
}

std::vector<std::shared_ptr<SyncEngine>> SharedZones::engines() const {
  const Lock lock(mutex_);
  std::vector<std::shared_ptr<SyncEngine>> engines;
  for (const auto &[container, engine] : engines_) engines.push_back(engine);
  return engines;
}

std::shared_ptr<SyncEngine> SharedZones::engineOf(const std::string &containerID) const {
  const Lock lock(mutex_);
  const auto found = engines_.find(containerID);
  return found == engines_.end() ? nullptr : found->second;
}

// --- Looking.

void SharedZones::run() {
  for (;;) {
    {
      const Lock lock(mutex_);
      if (stop_) return;
      hasNews_ = false;
    }
    try {
      look();
    } catch (const std::exception &error) {
      os_log_error(qvc_default_log(), "[ERROR] what others share can't be shown: %s",
                   std::string(error.what()));
      nextPoll_ = std::chrono::steady_clock::now() + kSoon;
    }
    waitForWork();
  }
}

void SharedZones::look() {
  nextPoll_ = std::chrono::steady_clock::now() + pollInterval_;
  std::set<std::string> gone;
  bool isSignedIn = false;
  {
    const Lock lock(mutex_);
    gone.swap(gone_);
    isSignedIn = signedIn_;
  }
  for (const std::string &container : gone)
    if (!end(container)) nextPoll_ = std::chrono::steady_clock::now() + kSoon;
  if (isSignedIn) lookForZones();
}

void SharedZones::lookForZones() {
  if (!subscription_) {
    NSError error;
    subscription_ = cloud_->subscribe(
        [this](const std::vector<CKRecordZoneID> &) {
          const Lock lock(mutex_);
          hasNews_ = true;
          wake_.notify_all();
        },
        &error);
  }
  // Another cloud in the place of the drive's shares nothing with it.
  const std::string known = drive_->store().text("cloudIdentifier");
  if (!known.empty() && known != cloud_->cloudIdentifier().description()) return;
  CKCallContext call = CKCallContext::withTimeout(kCallTimeout);
  call.cancellation = stopping_;
  const CKZoneList list = cloud_->listZones(call);
  if (list.error) return;  // the drive's engine tells what is wrong with the cloud
  std::set<std::string> listed;
  for (const CKRecordZoneID &zone : list.zones) {
    if (zone.zoneName != DriveZone().zoneName) continue;
    listed.insert(SharedContainerOf(zone.ownerName));
    tryToBegin(zone.ownerName);
    if (const auto engine = engineOf(SharedContainerOf(zone.ownerName))) refreshTitle(*engine);
  }
  // What isn't listed its engine has to find gone by itself: it knows what is to become of its items.
  for (const auto &engine : engines())
    if (listed.count(engine->scope().container) == 0) engine->cloudChanged();
}

void SharedZones::waitForWork() {
  Lock lock(mutex_);
  while (!stop_ && !hasNews_ && gone_.empty()) {
    if (wake_.wait_until(mutex_, nextPoll_) == std::cv_status::timeout) return;
  }
}

// --- Beginning and ending.

std::string SharedZones::databaseOf(const std::string &containerID) const {
  return host_.stateFolder + kFolder + "/" + containerID + kSuffix;
}

void SharedZones::beginKnown() {
  for (const std::string &path : databasesIn(host_.stateFolder + kFolder)) {
    try {
      const std::string owner = SyncStore(path).text(kOwner);
      // One that a killed process has just made.
      if (owner.empty())
        removeDatabase(path);
      else
        tryToBegin(owner);
    } catch (const SqlError &error) {
      os_log_error(qvc_default_log(), "[ERROR] %s: %s", path, std::string(error.what()));
    }
  }
}

// One zone that can't be shown leaves the others, and the drive, alone.
void SharedZones::tryToBegin(const std::string &owner) {
  try {
    begin(owner);
    failed_.erase(owner);
  } catch (const std::exception &error) {
    if (failed_.insert(owner).second)
      os_log_error(qvc_default_log(), "[ERROR] what %s shares can't be shown: %s", owner,
                   std::string(error.what()));
  }
}

std::string SharedZones::titleOf(const std::string &owner) const {
  CKCallContext call = CKCallContext::withTimeout(kCallTimeout);
  call.cancellation = stopping_;
  const CKShareParticipantsReply reply = cloud_->lookUpShareParticipants({owner}, call);
  if (reply.results.size() != 1 || reply.results.front().error) return "";
  const std::string &name = reply.results.front().participant.userIdentity.displayName;
  return SharedContainerTitle(name.empty() ? owner : name);
}

// Once a start: people seldom get another name.
void SharedZones::refreshTitle(SyncEngine &engine) {
  const std::string &container = engine.scope().container;
  if (titled_.count(container) != 0) return;
  const std::string title = titleOf(engine.scope().zone.ownerName);
  if (title.empty()) return;
  titled_.insert(container);
  if (title != engine.store().text(kTitle)) engine.store().setText(kTitle, title);
  host_.setTitle(container, title);
}

void SharedZones::makeContainer(const std::string &containerID) const {
  const std::string folder = host_.replicaPath + "/" + containerID;
  for (const std::string &path : {folder, folder + "/" + QVDocumentsFolderName(containerID)})
    if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST)
      throw std::system_error(errno, std::generic_category(), path);
}

// The database comes first: whatever is in the container's folder, somebody knows it.
void SharedZones::begin(const std::string &owner) {
  const std::string container = SharedContainerOf(owner);
  if (engineOf(container)) return;
  if (::mkdir((host_.stateFolder + kFolder).c_str(), 0700) != 0 && errno != EEXIST)
    throw std::system_error(errno, std::generic_category(), host_.stateFolder + kFolder);
  const SyncScope scope{{DriveZone().zoneName, owner}, container};
  auto engine = std::make_shared<SyncEngine>(*drive_, scope, databaseOf(container), cloud_, host_.read);
  if (engine->store().text(kOwner).empty()) {
    const std::string title = titleOf(owner);
    engine->store().setText(kTitle, title.empty() ? SharedContainerTitle(owner) : title);
    engine->store().setText(kOwner, owner);
    os_log(qvc_default_log(), "[NOTICE] %s shares with this account: it is shown in %s", owner, container);
  }
  host_.setTitle(container, engine->store().text(kTitle));
  makeContainer(container);
  engine->setZoneGoneHandler([this, container] { zoneIsGone(container); });
  host_.keeper()->lookAt(container + "/" + QVDocumentsFolderName(container), [] {});
  engine->start(host_.itemDatabase);
  const Lock lock(mutex_);
  engines_[container] = engine;
  engine->setSignedIn(signedIn_);
}

void SharedZones::zoneIsGone(const std::string &containerID) {
  const Lock lock(mutex_);
  gone_.insert(containerID);
  wake_.notify_all();
}

// False: somebody has put something there, which the engine moves into the drive first.
bool SharedZones::end(const std::string &containerID) {
  const auto engine = engineOf(containerID);
  if (!engine) return true;
  const std::string folder = host_.replicaPath + "/" + containerID;
  if (::rmdir((folder + "/" + QVDocumentsFolderName(containerID)).c_str()) != 0 && errno != ENOENT)
    return false;
  engine->stop();
  {
    const Lock lock(mutex_);
    engines_.erase(containerID);
  }
  ::unlink((folder + "/" + kIdentityName).c_str());
  if (::rmdir(folder.c_str()) != 0 && errno != ENOENT)
    os_log_error(qvc_default_log(), "[ERROR] can't remove %s: %s", folder, std::string(std::strerror(errno)));
  removeDatabase(databaseOf(containerID));
  host_.keeper()->lookAt(containerID, [] {});
  os_log(qvc_default_log(), "[NOTICE] %s shares nothing with this account any more",
         engine->scope().zone.ownerName);
  return true;
}

}  // namespace droxa::keld
