#include <cerrno>
#include <sys/stat.h>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPNames.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {

FPOutcome FPCreateSubFolder(const NSURL &parent, const std::string &name, const FPProgress & /*progress*/) {
  if (!parent.isFileURL()) return {{}, FPNoSuchFileError(parent)};
  if (const NSError error = FPCheckName(name)) return {{}, error};
  const NSURL url = parent.URLByAppendingPathComponent(name);
  if (FPIsTaken({url, url})) return {{}, FPCollisionError(url)};
  if (mkdir(url.path().c_str(), 0777) == 0) return {url, {}};
  if (errno == EEXIST) return {{}, FPCollisionError(url)};
  return {{}, FPErrorFromPOSIX(errno, "the folder " + url.path() + " can't be made")};
}

}  // namespace droxa
