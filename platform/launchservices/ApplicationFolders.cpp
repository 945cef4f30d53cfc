#include "platform/launchservices/ApplicationFolders.h"

#include <algorithm>
#include <cstdlib>

#include "platform/foundation/NSFileHandle.h"

namespace droxa {
namespace {

constexpr char kDefaultFolders[] = "/usr/local/share:/usr/share";
constexpr char kSystemExports[] = "/var/lib/flatpak/exports/share";

std::string Environment(const char *name) {
  const char *value = std::getenv(name);
  return value ? value : "";
}

}  // namespace

std::vector<std::string> ApplicationDataFolders() {
  std::vector<std::string> folders;
  // Relative ones are invalid by the rules, and left out.
  const auto add = [&folders](std::string folder) {
    while (folder.size() > 1 && folder.back() == '/') folder.pop_back();
    const bool isNew = std::find(folders.begin(), folders.end(), folder) == folders.end();
    if (!folder.empty() && folder.front() == '/' && isNew) folders.push_back(std::move(folder));
  };
  std::string home = Environment("XDG_DATA_HOME");
  if (home.empty() || home.front() != '/') home = NSHomeDirectory() + "/.local/share";
  add(home);
  add(home + "/flatpak/exports/share");
  std::string listed = Environment("XDG_DATA_DIRS");
  if (listed.empty()) listed = kDefaultFolders;
  for (std::size_t start = 0; start <= listed.size();) {
    const std::size_t end = std::min(listed.find(':', start), listed.size());
    add(listed.substr(start, end - start));
    start = end + 1;
  }
  add(kSystemExports);
  return folders;
}

}  // namespace droxa
