#include "cli/HomeCloud.h"

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>
#include <pwd.h>
#include <unistd.h>

#include "cli/Text.h"
#include "tessaly/QVHomeCloud.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;
using Json = nlohmann::ordered_json;

std::string settingsFile(const DroxaHome &home) {
  return home.configuration() + "/cloud.json";
}

std::string absolute(const std::string &path) {
  std::error_code code;
  const fs::path real = fs::weakly_canonical(path, code);
  std::string text = code ? fs::absolute(path, code).native() : real.native();
  while (text.size() > 1 && text.back() == '/') text.pop_back();
  return text;
}

bool isAtOrBelow(const std::string &path, const std::string &folder) {
  return path == folder || path.rfind(folder + "/", 0) == 0;
}

// nullopt when nothing is remembered; with `problem` when it can't be read.
std::optional<HomeCloud> remembered(const DroxaHome &home, std::string *problem) {
  NSError error;
  const auto known = QVHomeCloudRead(home, &error);
  if (error) {
    *problem = settingsFile(home) +
               " can't be read; it says which cloud this home's drive is in. Put it right, "
               "or remove it and name the cloud with --cloud";
  }
  if (!known) return std::nullopt;
  return HomeCloud{known->folder, known->device, known->account};
}

// Until keld has opened the cloud for the first time, nothing depends on it.
bool isBound(const DroxaHome &home) {
  std::error_code code;
  return fs::exists(home.state() + "/sync.sqlite", code);
}

std::string userName() {
  const passwd *entry = getpwuid(getuid());
  return entry && entry->pw_name ? entry->pw_name : "";
}

// A drive stays its account's.
bool setAccount(const DroxaHome &home, const std::optional<HomeCloud> &known, const std::string &account,
                HomeCloud *cloud, std::string *problem) {
  if (account.empty() || account.size() > 255 || !isValidUTF8(account)) {
    *problem = "\"" + escapedText(account) + "\" isn't an account's name";
    return false;
  }
  const std::string before = known && !known->account.empty() ? known->account : userName();
  if (isBound(home) && account != before) {
    *problem = "the drive of " + escapedText(home.root()) + " is the account \"" + escapedText(before) +
               "\"'s, and can't become \"" + escapedText(account) +
               "\"'s; leave --account out, or name another --home";
    return false;
  }
  cloud->account = account;
  return true;
}

}  // namespace

std::vector<std::string> HomeCloud::keldOptions() const {
  std::vector<std::string> options;
  if (!folder.empty()) options.insert(options.end(), {"--cloud", folder});
  if (!device.empty()) options.insert(options.end(), {"--device", device});
  if (!account.empty()) options.insert(options.end(), {"--account", account});
  return options;
}

std::string rememberedAccount(const DroxaHome &home) {
  std::string ignored;
  const auto cloud = remembered(home, &ignored);
  return cloud ? cloud->account : "";
}

std::string cloudFolder(const DroxaHome &home, const HomeCloud &cloud) {
  return cloud.folder.empty() ? absolute(home.root() + "/cloud") : cloud.folder;
}

std::optional<HomeCloud> resolveHomeCloud(const DroxaHome &home, const std::optional<std::string> &folder,
                                          const std::optional<std::string> &device,
                                          const std::optional<std::string> &account, std::string *problem) {
  problem->clear();
  const auto known = remembered(home, problem);
  if (!problem->empty()) return std::nullopt;
  HomeCloud cloud = known.value_or(HomeCloud());
  if (folder) {
    HomeCloud named{absolute(*folder), {}};
    if (named.folder == cloudFolder(home, HomeCloud())) named.folder.clear();
    const std::string path = cloudFolder(home, named);
    if (known && isBound(home) && named.folder != known->folder) {
      *problem = "the drive of " + escapedText(home.root()) + " is in the cloud " +
                 escapedText(cloudFolder(home, *known)) + ", and can't change to " + escapedText(path) +
                 "; leave --cloud out, or name another --home";
      return std::nullopt;
    }
    if (!isValidUTF8(path)) {
      *problem = escapedText(path) + ": a cloud's folder needs a name in UTF-8";
      return std::nullopt;
    }
    if (isAtOrBelow(path, absolute(home.replica())) || isAtOrBelow(absolute(home.replica()), path)) {
      *problem = "the cloud can't be in " + escapedText(path) + ", where the documents themselves are";
      return std::nullopt;
    }
    cloud.folder = named.folder;
  }
  if (device) cloud.device = *device;
  if (account && !setAccount(home, known, *account, &cloud, problem)) return std::nullopt;
  return cloud;
}

// Put in place in one step: a home always knows its cloud.
bool rememberHomeCloud(const DroxaHome &home, const HomeCloud &cloud, std::string *problem) {
  const auto orNull = [](const std::string &text) { return text.empty() ? Json(nullptr) : Json(text); };
  const std::string path = settingsFile(home);
  const std::string made = path + ".new";
  std::ofstream file(made, std::ios::trunc);
  file << Json{{"cloud", orNull(cloud.folder)},
               {"device", orNull(cloud.device)},
               {"account", orNull(cloud.account)}}
              .dump(2, ' ', false, Json::error_handler_t::replace)
       << "\n";
  file.close();
  if (file && std::rename(made.c_str(), path.c_str()) == 0) return true;
  *problem = "can't write " + path + ": " + std::strerror(errno);
  return false;
}

}  // namespace droxa
