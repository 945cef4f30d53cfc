#include <cerrno>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPNames.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {

FPOutcome FPRename(const NSURL &url, const std::string &name, const FPProgress & /*progress*/) {
  if (!url.isFileURL() || url.path() == "/") return {{}, FPNoSuchFileError(url)};
  if (const NSError error = FPCheckName(name)) return {{}, error};
  const FPPlace from = FPPlaceOfURL(url);
  if (!FPExists(from.onDisk.path())) return {{}, FPNoSuchFileError(url)};
  const FPPlace to = FPPlaceOfName(url.URLByDeletingLastPathComponent(), name, from);
  if (name == url.lastPathComponent()) return {to.logical, {}};
  const int error = FPMove(from.onDisk.path(), to.onDisk.path());
  if (error == 0) return {to.logical, {}};
  if (error == EEXIST) return {{}, FPCollisionError(to.logical)};
  return {{}, FPErrorFromPOSIX(error, url.path() + " can't be renamed to \"" + name + "\"")};
}

}  // namespace droxa
