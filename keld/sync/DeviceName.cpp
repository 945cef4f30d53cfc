#include "keld/sync/DeviceName.h"

#include <unistd.h>

namespace droxa::keld {

std::string DeviceName(const DroxaHome &home) {
  char name[256] = {};
  if (::gethostname(name, sizeof name - 1) != 0 || name[0] == '\0') return "this device";
  std::string device = name;
  const std::string folder = home.root().substr(home.root().rfind('/') + 1);
  if (!folder.empty() && folder != "droxa") {
    device += "-";
    device += folder;
  }
  return device.substr(0, 200);
}

}  // namespace droxa::keld
