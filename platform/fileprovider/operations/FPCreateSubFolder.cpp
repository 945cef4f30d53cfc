#include <cerrno>
#include <sys/stat.h>
#include <vector>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPNames.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {

FPOutcome FPCreateSubFolder(const NSURL &parent, const std::string &name, const FPProgress &progress) {
  NSError error;
  if (!FPIsFolder(parent, &error)) return {{}, error};
  if ((error = FPCheckName(name))) return {{}, error};
  const NSURL url = parent.URLByAppendingPathComponent(name);
  const FPAccess access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url)}, progress, &error);
  if (!access) return {{}, error};
  if (FPIsTakenByOtherForm({url, url})) return {{}, FPCollisionError(url)};
  if (mkdir(url.path().c_str(), 0777) == 0) return {url, {}};
  if (errno == EEXIST) return {{}, FPCollisionError(url)};
  return {{}, FPErrorFromPOSIX(errno, "the folder " + url.path() + " can't be made")};
}

}  // namespace droxa
