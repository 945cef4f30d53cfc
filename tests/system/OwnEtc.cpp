#include "tests/system/OwnEtc.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <map>
#include <nlohmann/json.hpp>
#include <sched.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/system/Process.h"

namespace droxa::testing {

namespace {

namespace fs = std::filesystem;
constexpr char kFolder[] = "/etc/droxa/entitlements.d";
using Grants = std::map<std::string, std::vector<std::string>>;  // by the program's path

std::string &problem() {
  static std::string text = "OwnEtc::enter() wasn't called";
  return text;
}

Grants &grants() {
  static Grants all;
  return all;
}

bool write(const char *path, const std::string &text) {
  try {
    writeFile(path, text);
    return true;
  } catch (const std::runtime_error &) {
    return false;
  }
}

// A namespace of mounts; for who isn't root, within one of users in which they are.
bool unshareMounts() {
  const auto user = getuid();
  const auto group = getgid();
  if (unshare(user == 0 ? CLONE_NEWNS : CLONE_NEWNS | CLONE_NEWUSER) != 0) return false;
  if (user == 0) return true;
  return write("/proc/self/setgroups", "deny") &&
         write("/proc/self/uid_map", "0 " + std::to_string(user) + " 1") &&
         write("/proc/self/gid_map", "0 " + std::to_string(group) + " 1");
}

// The layer lies in memory, where no file system below can be in its way; its own place in the tree isn't
// needed once it is part of /etc.
bool coverEtc() {
  if (mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0) return false;
  std::string layer = fs::temp_directory_path().string() + "/droxa-etc-XXXXXX";
  if (!mkdtemp(layer.data())) return false;
  bool done = mount("tmpfs", layer.c_str(), "tmpfs", MS_NOSUID | MS_NODEV, "mode=755") == 0;
  if (done) {
    done = mkdir((layer + "/upper").c_str(), 0755) == 0 && mkdir((layer + "/work").c_str(), 0755) == 0;
    const std::string options = "lowerdir=/etc,upperdir=" + layer + "/upper,workdir=" + layer + "/work";
    done = done && mount("overlay", "/etc", "overlay", 0, options.c_str()) == 0;
    const int error = errno;
    umount2(layer.c_str(), MNT_DETACH);
    errno = error;
  }
  const int error = errno;
  rmdir(layer.c_str());
  errno = error;
  return done;
}

bool makeFolder() {
  std::error_code error;
  fs::remove_all(kFolder, error);  // grants of the machine's own are none of the tests' affair
  const mode_t before = umask(022);
  fs::create_directories(kFolder, error);
  umask(before);
  return !error && chmod("/etc/droxa", 0755) == 0 && chmod(kFolder, 0755) == 0;
}

void writeGrants() {
  nlohmann::json applications = nlohmann::json::array();
  for (const auto &[path, entitlements] : grants())
    applications.push_back({{"executable", path}, {"entitlements", entitlements}});
  const std::string made = std::string(kFolder) + "/made";
  writeFile(made, nlohmann::json{{"applications", applications}}.dump());
  fs::permissions(made, static_cast<fs::perms>(0644));
  fs::rename(made, std::string(kFolder) + "/tests.json");  // nobody reads half of it
}

}  // namespace

void OwnEtc::enter() {
  if (!unshareMounts())
    problem() = std::string("no namespace of mounts can be made here: ") + std::strerror(errno);
  else if (!coverEtc())
    problem() = std::string("/etc can't be covered here: ") + std::strerror(errno);
  else if (!makeFolder())
    problem() = std::string(kFolder) + " can't be made: " + std::strerror(errno);
  else
    problem().clear();
}

const std::string &OwnEtc::whyNot() {
  return problem();
}

void OwnEtc::grant(const std::string &path, const std::vector<std::string> &entitlements) {
  grants()[fs::canonical(path).string()] = entitlements;
  writeGrants();
}

void OwnEtc::revokeAll() {
  grants().clear();
  writeGrants();
}

}  // namespace droxa::testing
