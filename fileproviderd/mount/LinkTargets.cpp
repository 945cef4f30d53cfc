#include "fileproviderd/mount/LinkTargets.h"

#include <filesystem>
#include <optional>

namespace droxa {

namespace fs = std::filesystem;

namespace {

// The shown folder that a path of the replica lies in.
std::optional<std::string> folderOf(const std::string &path, const ShownFolders &shown) {
  for (const auto &[name, folder] : shown)
    if (path == folder || path.starts_with(folder + "/")) return name;
  return std::nullopt;
}

}  // namespace

std::string shownLinkTarget(const std::string &target, const std::string &shownFolder,
                            const std::string &replicaFolder, const ShownFolders &shown) {
  const std::string full = (fs::path(replicaFolder) / target).lexically_normal().native();
  const auto ofTarget = folderOf(full, shown);
  const bool isBeside = ofTarget == folderOf(replicaFolder, shown) && !target.starts_with('/');
  if (!ofTarget || isBeside) return target;
  const std::string below = full.substr(shown.at(*ofTarget).size());
  const fs::path led = fs::path("/" + *ofTarget + below).lexically_normal();
  return led.lexically_relative("/" + shownFolder).native();
}

}  // namespace droxa
