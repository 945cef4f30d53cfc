#include "cli/HomeCloud.h"

#include <cstdio>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <nlohmann/json.hpp>

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
  return HomeCloud{known->folder, known->device};
}

// Until keld has opened the cloud for the first time, nothing depends on it.
bool isBound(const DroxaHome &home) {
  std::error_code code;
  return fs::exists(home.state() + "/sync.sqlite", code);
}

}  // namespace

std::vector<std::string> HomeCloud::keldOptions() const {
  std::vector<std::string> options;
  if (!folder.empty()) options.insert(options.end(), {"--cloud", folder});
  if (!device.empty()) options.insert(options.end(), {"--device", device});
  return options;
}

std::string cloudFolder(const DroxaHome &home, const HomeCloud &cloud) {
  return cloud.folder.empty() ? absolute(home.root() + "/cloud") : cloud.folder;
}

std::optional<HomeCloud> resolveHomeCloud(const DroxaHome &home, const std::optional<std::string> &folder,
                                          const std::optional<std::string> &device, std::string *problem) {
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
  return cloud;
}

// Put in place in one step: a home always knows its cloud.
bool rememberHomeCloud(const DroxaHome &home, const HomeCloud &cloud, std::string *problem) {
  const auto orNull = [](const std::string &text) { return text.empty() ? Json(nullptr) : Json(text); };
  const std::string path = settingsFile(home);
  const std::string made = path + ".new";
  std::ofstream file(made, std::ios::trunc);
  file << Json{{"cloud", orNull(cloud.folder)}, {"device", orNull(cloud.device)}}.dump(
              2, ' ', false, Json::error_handler_t::replace)
       << "\n";
  file.close();
  if (file && std::rename(made.c_str(), path.c_str()) == 0) return true;
  *problem = "can't write " + path + ": " + std::strerror(errno);
  return false;
}

}  // namespace droxa
