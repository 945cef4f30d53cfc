#include <cerrno>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"
#include "platform/fileprovider/operations/FPTakeAway.h"
#include "platform/foundation/NSFileManager.h"

namespace droxa {

FPAccess FPAccessForDeletion(const NSURL &url, const FPProgress &progress, NSError *error) {
  if (!url.isFileURL() || url.path() == "/") {
    *error = FPNoSuchFileError(url);
    return nullptr;
  }
  FPAccess access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url)}, progress, error);
  if (!access || FPExists(url.path())) return access;
  *error = FPNoSuchFileError(url);
  return nullptr;
}

FPOutcome FPDelete(const NSURL &url, const FPProgress &progress) {
  NSError error;
  FPAccess access = FPAccessForDeletion(url, progress, &error);
  if (!access) return {{}, error};
  if (const auto provider = NSFileManager::defaultManager()->ubiquitousItemProvider()) {
    provider->willDeleteItemAtURL(url);
  }
  mode_t mode = 0;
  if (FPExists(url.path(), &mode) && !S_ISDIR(mode)) {
    // One step as it is.
    if (unlink(url.path().c_str()) == 0) return {};
    return {{}, FPErrorFromPOSIX(errno, url.path() + " can't be removed")};
  }
  const auto gone = FPTakeAway(url, &error);
  // Nobody need wait while what is out of sight is removed.
  access.reset();
  return {{}, gone ? NSError() : error};
}

}  // namespace droxa
