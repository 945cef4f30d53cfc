#include "platform/fileprovider/operations/FPPlace.h"

#include <cerrno>
#include <filesystem>
#include <sys/stat.h>
#include <system_error>

#include "platform/fileprovider/operations/FPErrors.h"
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

bool FPIsTakenByOtherForm(const FPPlace &place) {
  if (place.isPromise()) return FPExists(place.logical.path());
  const NSURL folder = place.logical.URLByDeletingLastPathComponent();
  const NSURL promise = PromiseOfName(folder, place.logical.lastPathComponent());
  return !(promise == place.logical) && FPExists(promise.path());
}

void FPAddWriting(const FPPlace &place, std::vector<NSFileAccessIntent> *intents) {
  intents->push_back(NSFileAccessIntent::writingIntent(place.logical));
  if (place.isPromise()) intents->push_back(NSFileAccessIntent::writingIntent(place.onDisk));
}

bool FPIsFolder(const NSURL &url, NSError *error) {
  struct stat status {};
  if (!url.isFileURL()) {
    *error = FPNoSuchFileError(url);
  } else if (stat(url.path().c_str(), &status) != 0) {
    *error = FPErrorFromPOSIX(errno, "there is no folder at " + url.path());
  } else if (!S_ISDIR(status.st_mode)) {
    *error = FPErrorFromPOSIX(ENOTDIR, "there is no folder at " + url.path());
  } else {
    return true;
  }
  return false;
}

bool FPIsWithin(const NSURL &folder, const NSURL &url) {
  // The item itself may be a link, which nothing lies below.
  struct stat status {};
  if (lstat(url.path().c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) return false;
  std::error_code error;
  const auto inner = std::filesystem::canonical(folder.path(), error);
  if (error) return false;
  const auto outer = std::filesystem::canonical(url.path(), error);
  if (error) return false;
  return NSURL::fileURLWithPath(inner.native()).isEqualToOrBelow(NSURL::fileURLWithPath(outer.native()));
}

}  // namespace droxa
