#include "tessaly/QVHomeCloud.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <pwd.h>
#include <unistd.h>

#include "tessaly/QVConfigurationFile.h"

namespace droxa {

std::optional<QVHomeCloud> QVHomeCloudRead(const DroxaHome &home, NSError *error) {
  const auto text = QVConfigurationFileRead(home.configuration() + "/cloud.json", error);
  if (!text) return std::nullopt;
  const nlohmann::json object = nlohmann::json::parse(*text);
  const auto value = [&object](const char *key) {
    const auto found = object.find(key);
    return found != object.end() && found->is_string() ? found->get<std::string>() : "";
  };
  return QVHomeCloud{value("cloud"), value("device"), value("account")};
}

QVHomeCloud QVHomeCloudWithDefaults(const DroxaHome &home, QVHomeCloud cloud) {
  if (cloud.folder.empty()) cloud.folder = home.root() + "/cloud";
  if (cloud.device.empty()) cloud.device = QVDeviceName(home);
  if (cloud.account.empty()) cloud.account = QVLocalUserName();
  return cloud;
}

std::string QVLocalUserName() {
  passwd entry;
  passwd *found = nullptr;
  char buffer[16384];
  const bool known = ::getpwuid_r(::getuid(), &entry, buffer, sizeof buffer, &found) == 0 && found;
  const std::string name = known ? found->pw_name : "";
  const bool isPlain = std::none_of(name.begin(), name.end(),
                                    [](char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7f; });
  return !name.empty() && isPlain ? name : "user" + std::to_string(::getuid());
}

std::string QVDeviceName(const DroxaHome &home) {
  char name[256] = {};
  if (::gethostname(name, sizeof name - 1) != 0 || name[0] == '\0') return "this device";
  std::string device = name;
  const std::string folder = home.root().substr(home.root().rfind('/') + 1);
  if (!folder.empty() && folder != "droxa") {
    device += "-";
    device += folder;
  }
  constexpr std::size_t kLongest = 200;
  return device.substr(0, kLongest);
}

}  // namespace droxa
