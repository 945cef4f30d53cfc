#include "fileproviderd/HostMount.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <utility>

#include "fileproviderd/mount/Announcer.h"
#include "fileproviderd/mount/Mount.h"
#include "platform/dispatch/dispatch.h"
#include "platform/oslog/os_log.h"

namespace droxa {

namespace {

using namespace std::chrono_literals;

constexpr auto kRetry = 500ms;

const os_log_t &hostLog() {
  static const os_log_t log = os_log_create("com.quorva.fileproviderd", "mount");
  return log;
}

std::string firstLine(const std::string &file) {
  std::ifstream stream(file);
  std::string line;
  std::getline(stream, line);
  return line;
}

// <configuration>/mount-patience: how many seconds a read waits for contents that don't come.
std::chrono::milliseconds patienceOf(const DroxaHome &home) {
  std::ifstream stream(home.configuration() + "/mount-patience");
  double seconds = 0;
  constexpr double kMost = 86'400;
  if (!(stream >> seconds) || seconds <= 0 || seconds > kMost) return 60s;
  return std::chrono::milliseconds(static_cast<std::int64_t>(seconds * 1000));
}

}  // namespace

HostMount::HostMount(std::shared_ptr<ExtensionCalls> calls, std::shared_ptr<Providings> providings,
                     DroxaHome home)
    : calls_(std::move(calls)), providings_(std::move(providings)), home_(std::move(home)) {}

HostMount::~HostMount() = default;

void HostMount::begin(const std::string &program) {
  if (!program.empty()) announcer_ = Announcer::start(program);
  const std::string path = firstLine(home_.mountFile());
  if (!path.empty()) dispatch_async_global([self = shared_from_this(), path] { self->keepTrying(path); });
}

void HostMount::keepTrying(const std::string &path) {
  const Lock work(working_);
  {
    const Lock held(lock_);
    if (isEnded_ || mount_) return;
  }
  if (firstLine(home_.mountFile()) != path) return;
  bool isForNow = false;
  const std::string problem = tryToMount(path, &isForNow);
  tell(isForNow ? std::string() : problem);
  if (isForNow) dispatch_after_global(kRetry, [self = shared_from_this(), path] { self->keepTrying(path); });
}

std::string HostMount::tryToMount(const std::string &path, bool *isForNow) {
  MountSettings settings;
  settings.path = path;
  settings.source = "droxa:" + home_.root();
  settings.replica = home_.replica();
  settings.patience = patienceOf(home_);
  settings.announcer = announcer_;
  settings.folderOpened = folderOpened_;
  auto mount = std::make_shared<Mount>(calls_, providings_, settings);
  std::string problem = mount->start(isForNow);
  if (!problem.empty()) return problem;
  const Lock held(lock_);
  mount_ = std::move(mount);
  return {};
}

void HostMount::takeOff() {
  std::shared_ptr<Mount> mount;
  {
    const Lock held(lock_);
    mount = std::exchange(mount_, nullptr);
    problem_.clear();
  }
  if (mount) mount->stop();
}

void HostMount::tell(const std::string &problem) {
  if (!problem.empty()) os_log_error(hostLog(), "[ERROR] the drive isn't mounted: %s", problem);
  const Lock held(lock_);
  problem_ = problem;
}

void HostMount::end() {
  const Lock work(working_);
  {
    const Lock held(lock_);
    isEnded_ = true;
  }
  takeOff();
}

std::string HostMount::mount(const std::string &path) {
  const std::string wanted = path.empty() ? home_.defaultMountPoint() : path;
  const Lock work(working_);
  if (state().path == wanted) return {};
  takeOff();
  std::ofstream(home_.mountFile()) << wanted;
  bool isForNow = false;
  std::string problem = tryToMount(wanted, &isForNow);
  tell(problem);
  if (!problem.empty()) {
    std::error_code ignored;
    std::filesystem::remove(home_.mountFile(), ignored);
  }
  return problem;
}

void HostMount::unmount() {
  const Lock work(working_);
  std::error_code ignored;
  std::filesystem::remove(home_.mountFile(), ignored);
  takeOff();
}

HostMount::State HostMount::state() const {
  const Lock held(lock_);
  return {mount_ && mount_->isMounted() ? mount_->path() : std::string(), problem_};
}

std::vector<ShownFolder> HostMount::shownFolders() const {
  std::shared_ptr<Mount> mount;
  {
    const Lock held(lock_);
    mount = mount_;
  }
  return mount ? mount->shownFolders() : std::vector<ShownFolder>();
}

std::string HostMount::drivePath(const std::string &path) const {
  const std::string mountPoint = state().path;
  if (mountPoint.empty() || !path.starts_with(mountPoint)) return path;
  const std::string rest = path.substr(mountPoint.size());
  return rest.empty() || rest.front() == '/' ? "/" + rest : path;
}

}  // namespace droxa
