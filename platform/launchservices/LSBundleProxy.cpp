#include "platform/launchservices/LSBundleProxy.h"

#include <cstdlib>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

#include "platform/launchservices/ApplicationFolders.h"
#include "platform/launchservices/KeyFile.h"

namespace droxa {
namespace {

constexpr char kGroup[] = "Desktop Entry";
constexpr std::size_t kLongestIdentifier = 255;

bool MayBeIdentifier(const std::string &identifier) {
  return !identifier.empty() && identifier.size() <= kLongestIdentifier && identifier.front() != '.' &&
         identifier.find('/') == std::string::npos && identifier.find('\0') == std::string::npos;
}

// The entry with that identifier below `folder`: a hyphen may stand for a folder.
std::optional<KeyFile> EntryIn(const std::string &folder, const std::string &identifier) {
  if (auto entry = KeyFile::read(folder + "/" + identifier + ".desktop")) return entry;
  for (std::size_t at = identifier.find('-'); at != std::string::npos; at = identifier.find('-', at + 1)) {
    const std::string below = folder + "/" + identifier.substr(0, at);
    const std::string rest = identifier.substr(at + 1);
    struct stat status {};
    if (at == 0 || rest.empty() || stat(below.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) continue;
    if (auto entry = EntryIn(below, rest)) return entry;
  }
  return std::nullopt;
}

// The program that an entry starts, without its quotes: the first word of the command line.
std::string FirstWord(const std::string &command) {
  if (command.empty()) return {};
  if (command.front() != '"') return command.substr(0, command.find(' '));
  return command.substr(1, command.find('"', 1) - 1);
}

std::string InPath(const std::string &program) {
  if (program.empty()) return {};
  if (program.front() == '/') return program;
  if (program.find('/') != std::string::npos) return {};
  const char *listed = std::getenv("PATH");
  const std::string path = listed ? listed : "/usr/local/bin:/usr/bin:/bin";
  for (std::size_t start = 0; start <= path.size();) {
    const std::size_t end = std::min(path.find(':', start), path.size());
    const std::string file = path.substr(start, end - start) + "/" + program;
    if (file.front() == '/' && access(file.c_str(), X_OK) == 0) return file;
    start = end + 1;
  }
  return {};
}

bool IsSameFile(const std::string &one, const std::string &other) {
  struct stat first {
  }, second{};
  return !one.empty() && stat(one.c_str(), &first) == 0 && stat(other.c_str(), &second) == 0 &&
         first.st_dev == second.st_dev && first.st_ino == second.st_ino;
}

}  // namespace

std::shared_ptr<const LSBundleProxy> LSBundleProxy::bundleProxyForIdentifier(const std::string &identifier) {
  if (!MayBeIdentifier(identifier)) return nullptr;
  for (const std::string &folder : ApplicationDataFolders()) {
    const auto entry = EntryIn(folder + "/applications", identifier);
    if (!entry) continue;
    // The first entry decides; one that is hidden says that the application isn't installed.
    if (entry->text(kGroup, "Type") != "Application" || entry->isTrue(kGroup, "Hidden")) return nullptr;
    auto proxy = std::make_shared<LSBundleProxy>(Passkey{});
    proxy->identifier_ = identifier;
    proxy->name_ = entry->text(kGroup, "Name");
    proxy->icon_ = entry->text(kGroup, "Icon");
    if (const std::string *flatpak = entry->value(kGroup, "X-Flatpak")) {
      proxy->flatpak_ = *flatpak;
    } else {
      proxy->executable_ = InPath(FirstWord(entry->text(kGroup, "Exec")));
    }
    return proxy;
  }
  return nullptr;
}

bool LSBundleProxy::isGranted(const EntitlementGrant &grant) const {
  if (grant.kind == EntitlementGrant::Kind::flatpak) return flatpak_ == grant.application;
  return !flatpak_ && IsSameFile(executable_, grant.application);
}

LSPropertyList LSBundleProxy::entitlementValuesForKeys(const std::set<std::string> &keys) const {
  std::map<std::string, EntitlementValue> values;
  for (const EntitlementGrant &grant : EntitlementFiles::processFiles().read().grants) {
    if (!isGranted(grant)) continue;
    for (const auto &[key, value] : grant.values)
      if (keys.contains(key)) values.try_emplace(key, value);
    for (const std::string &name : grant.entitlements)
      if (keys.contains(name)) values.try_emplace(name, true);
  }
  return LSPropertyList(std::move(values));
}

}  // namespace droxa
