#include <cstdlib>
#include <pwd.h>
#include <unistd.h>
#include <vector>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

struct HomeSetting {
  Mutex mutex;
  std::optional<std::string> path GUARDED_BY(mutex);
};

// Never destroyed: threads may still ask while the process ends.
HomeSetting &homeSetting() {
  static auto *setting = new HomeSetting;
  return *setting;
}

std::string homeFromPasswordDatabase() {
  std::vector<char> buffer(16 * 1024);
  passwd entry{};
  passwd *found = nullptr;
  if (getpwuid_r(getuid(), &entry, buffer.data(), buffer.size(), &found) != 0 || !found) return "/";
  return found->pw_dir && *found->pw_dir ? found->pw_dir : "/";
}

}  // namespace

std::string NSHomeDirectory() {
  {
    HomeSetting &setting = homeSetting();
    const Lock lock(setting.mutex);
    if (setting.path) return *setting.path;
  }
  const char *home = std::getenv("HOME");
  return home && *home ? home : homeFromPasswordDatabase();
}

void NSSetHomeDirectory(std::optional<std::string> path) {
  HomeSetting &setting = homeSetting();
  const Lock lock(setting.mutex);
  setting.path = std::move(path);
}

}  // namespace droxa
