#include "platform/foundation/Paths.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <deque>
#include <filesystem>
#include <sys/stat.h>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

std::string absolutePath(const std::string &path) {
  std::error_code ignored;
  std::string text = std::filesystem::absolute(path, ignored).lexically_normal().string();
  while (text.size() > 1 && text.ends_with('/')) text.pop_back();
  return text;
}

std::string environment(const char *name) {
  const char *value = std::getenv(name);
  return value ? value : "";
}

bool fail(std::string *problem, const std::string &folder, int code) {
  if (problem) *problem = folder + ": " + std::strerror(code);
  return false;
}

bool isFolder(const std::string &path) {
  struct stat status {};
  return stat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

// Makes the folder and those above it that are missing.
bool makeFolders(const std::string &path, std::string *problem) {
  for (std::size_t end = path.find('/', 1);; end = path.find('/', end + 1)) {
    const std::string folder = path.substr(0, end);
    if (mkdir(folder.c_str(), 0700) != 0) {
      const int code = errno == EEXIST ? ENOTDIR : errno;
      if (!isFolder(folder)) return fail(problem, folder, code);
    }
    if (end == std::string::npos) return true;
  }
}

// The homes that were ever set. Never destroyed, and none is dropped: who asked earlier keeps a reference.
struct ProcessHomes {
  Mutex mutex;
  std::deque<DroxaHome> homes GUARDED_BY(mutex);
};

ProcessHomes &processHomes() {
  static auto *homes = new ProcessHomes;
  return *homes;
}

}  // namespace

DroxaHome DroxaHome::resolve(const std::optional<std::string> &folder) {
  if (folder && !folder->empty()) return DroxaHome(*folder);
  const std::string fromEnvironment = environment("DROXA_HOME");
  if (!fromEnvironment.empty()) return DroxaHome(fromEnvironment);
  const std::string data = environment("XDG_DATA_HOME");
  if (data.starts_with('/')) return DroxaHome(data + "/droxa");
  return DroxaHome(NSHomeDirectory() + "/.local/share/droxa");
}

std::string DroxaHome::defaultMountPoint() const {
  const std::string data = environment("XDG_DATA_HOME");
  const DroxaHome usual(data.starts_with('/') ? data + "/droxa" : NSHomeDirectory() + "/.local/share/droxa");
  return (root_ == usual.root() ? NSHomeDirectory() : root_) + "/Droxa Drive";
}

DroxaHome::DroxaHome(std::string root) : root_(absolutePath(root)) {}

bool DroxaHome::create(std::string *problem) const {
  if (!makeFolders(root_, problem)) return false;
  for (const std::string &folder : {replica(), state(), configuration(), run(), logs()}) {
    if (!makeFolders(folder, problem)) return false;
    if (chmod(folder.c_str(), 0700) != 0) return fail(problem, folder, errno);
  }
  return true;
}

const DroxaHome &DroxaProcessHome() {
  ProcessHomes &all = processHomes();
  const Lock lock(all.mutex);
  if (all.homes.empty()) all.homes.push_back(DroxaHome::resolve(std::nullopt));
  return all.homes.back();
}

void DroxaSetProcessHome(DroxaHome home) {
  ProcessHomes &all = processHomes();
  const Lock lock(all.mutex);
  all.homes.push_back(std::move(home));
}

}  // namespace droxa
