#include "platform/fileprovider/operations/FPPlace.h"

#include <sys/stat.h>

#include "platform/foundation/NSFileManager.h"

namespace droxa {
namespace {

NSURL PromiseOfName(const NSURL &folder, const std::string &name) {
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  return provider ? provider->physicalURLForName(folder, name) : folder.URLByAppendingPathComponent(name);
}

}  // namespace

FPPlace FPPlaceOfURL(const NSURL &url) {
  const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider();
  if (!provider || !url.hasPhysicalProperty()) return {url, url};
  const NSURL physical = provider->physicalURLForURL(url);
  return {url, physical ? physical : url};
}

FPPlace FPPlaceOfName(const NSURL &folder, const std::string &name, const FPPlace &like) {
  const NSURL logical = folder.URLByAppendingPathComponent(name);
  return {logical, like.isPromise() ? PromiseOfName(folder, name) : logical};
}

bool FPExists(const std::string &path, mode_t *mode) {
  struct stat status {};
  if (lstat(path.c_str(), &status) != 0) return false;
  if (mode) *mode = status.st_mode;
  return true;
}

bool FPIsTaken(const FPPlace &place) {
  if (FPExists(place.logical.path())) return true;
  const NSURL promise =
      PromiseOfName(place.logical.URLByDeletingLastPathComponent(), place.logical.lastPathComponent());
  return !(promise == place.logical) && FPExists(promise.path());
}

}  // namespace droxa
