#include <cerrno>
#include <fcntl.h>

#include "platform/fileprovider/operations/FPCopy.h"
#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"
#include "platform/fileprovider/operations/FPReplacement.h"

namespace droxa {
namespace {

constexpr char kCopy[] = "item";

// Reads the source under coordination, which is given back before the destination's is asked for.
NSError CopyInto(const FPReplacement &replacement, const NSURL &source, const FPProgress &progress) {
  NSError error;
  const FPAccess access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::readingIntent(source)}, progress, &error);
  if (!access) return error;
  return FPCopyItem(source, replacement.folder(), kCopy, FPCopyPurpose::import, progress);
}

NSError Publish(const FPReplacement &replacement, const NSURL &url, const FPProgress &progress) {
  NSError error;
  const FPAccess access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url)}, progress, &error);
  if (!access) return error;
  if (progress && progress->isCancelled()) return FPCancelledError(url);
  if (FPIsTakenByOtherForm({url, url})) return FPCollisionError(url);
  const int code = FPMoveAt(replacement.folder(), kCopy, AT_FDCWD, url.path());
  return code == EEXIST ? FPCollisionError(url)
                        : FPErrorFromPOSIX(code, "the copy can't be put at " + url.path());
}

}  // namespace

FPOutcome FPImport(const NSURL &source, const NSURL &folder, const FPProgress &progress) {
  if (!source.isFileURL() || !FPExists(source.path())) return {{}, FPNoSuchFileError(source)};
  NSError error;
  if (!FPIsFolder(folder, &error)) return {{}, error};
  if (FPIsWithin(folder, source)) {
    return {{}, FPErrorFromPOSIX(EINVAL, source.path() + " can't be copied into itself")};
  }
  const NSURL url = folder.URLByAppendingPathComponent(source.lastPathComponent());
  // Asked again at the end; this spares a copy that nobody could use.
  if (FPExists(url.path()) || FPIsTakenByOtherForm({url, url})) return {{}, FPCollisionError(url)};
  const auto replacement = FPReplacement::make(url, &error);
  if (!replacement) return {{}, error};
  if ((error = CopyInto(*replacement, source, progress))) return {{}, error};
  if ((error = Publish(*replacement, url, progress))) return {{}, error};
  FPFinishCopiedMode(source, url);
  return {url, {}};
}

}  // namespace droxa
