#include <cerrno>
#include <vector>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPNames.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {

FPOutcome FPRename(const NSURL &url, const std::string &name, const FPProgress &progress) {
  if (!url.isFileURL() || url.path() == "/") return {{}, FPNoSuchFileError(url)};
  NSError error = FPCheckName(name);
  if (error) return {{}, error};
  const FPPlace from = FPPlaceOfURL(url);
  const FPPlace to = FPPlaceOfName(url.URLByDeletingLastPathComponent(), name, from);
  std::vector<NSFileAccessIntent> intents;
  FPAddWriting(from, &intents);
  FPAddWriting(to, &intents);
  const FPAccess access =
      NSFileCoordinator::defaultCoordinator()->coordinateAccess(intents, progress, &error);
  if (!access) return {{}, error};
  if (!FPExists(from.onDisk.path())) return {{}, FPNoSuchFileError(url)};
  if (name == url.lastPathComponent()) return {to.logical, {}};
  if (FPIsTakenByOtherForm(to)) return {{}, FPCollisionError(to.logical)};
  const int code = FPMove(from.onDisk.path(), to.onDisk.path());
  if (code == 0) return {to.logical, {}};
  if (code == EEXIST) return {{}, FPCollisionError(to.logical)};
  return {{}, FPErrorFromPOSIX(code, url.path() + " can't be renamed to \"" + name + "\"")};
}

}  // namespace droxa
