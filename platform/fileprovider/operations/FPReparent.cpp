#include <cerrno>
#include <sys/stat.h>
#include <vector>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPMoveAcross.h"
#include "platform/fileprovider/operations/FPNames.h"
#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {
namespace {

// So many names are tried before a folder is taken for one that has them all.
constexpr int kMostBounces = 10'000;

NSError MoveTo(const FPPlace &from, const FPPlace &to, const FPProgress &progress) {
  std::vector<NSFileAccessIntent> intents;
  FPAddWriting(from, &intents);
  FPAddWriting(to, &intents);
  NSError error;
  const FPAccess access =
      NSFileCoordinator::defaultCoordinator()->coordinateAccess(intents, progress, &error);
  if (!access) return error;
  if (!FPExists(from.onDisk.path())) return FPNoSuchFileError(from.logical);
  if (from.logical == to.logical) return {};
  if (FPIsTakenByOtherForm(to)) return FPCollisionError(to.logical);
  const int code = FPMove(from.onDisk.path(), to.onDisk.path());
  if (code == EEXIST) return FPCollisionError(to.logical);
  if (code == EXDEV) return FPMoveAcross(from, to, progress);
  return FPErrorFromPOSIX(code, from.logical.path() + " can't be moved to " + to.logical.path());
}

bool IsCollision(const NSError &error) {
  return error.is(NSCocoaErrorDomain, NSFileWriteFileExistsError);
}

// Under the first name that is free. Names that are seen to be taken are passed over without coordination.
FPOutcome Bounce(const FPPlace &from, const NSURL &folder, const std::string &name,
                 const FPProgress &progress) {
  mode_t mode = 0;
  FPBouncedNames names(name, FPExists(from.onDisk.path(), &mode) && S_ISDIR(mode));
  NSError error;
  for (int tried = 0; tried < kMostBounces; ++tried) {
    const FPPlace to = FPPlaceOfName(folder, names.next(), from);
    error = FPCollisionError(to.logical);
    if (FPExists(to.onDisk.path()) || FPIsTakenByOtherForm(to)) continue;
    error = MoveTo(from, to, progress);
    if (!error) return {to.logical, {}};
    if (!IsCollision(error)) break;
  }
  return {{}, error};
}

}  // namespace

FPOutcome FPReparent(const NSURL &url, const NSURL &folder, const std::optional<std::string> &newName,
                     bool allowBouncing, const FPProgress &progress) {
  if (!url.isFileURL() || url.path() == "/") return {{}, FPNoSuchFileError(url)};
  const std::string name = newName.value_or(url.lastPathComponent());
  NSError error = FPCheckName(name);
  if (error || !FPIsFolder(folder, &error)) return {{}, error};
  const FPPlace from = FPPlaceOfURL(url);
  if (!FPExists(from.onDisk.path())) return {{}, FPNoSuchFileError(url)};
  if (FPIsWithin(folder, from.onDisk)) {
    const std::string text = url.path() + " can't be moved into itself, to " + folder.path();
    return {{}, FPErrorFromPOSIX(EINVAL, text)};
  }
  const FPPlace to = FPPlaceOfName(folder, name, from);
  error = MoveTo(from, to, progress);
  if (!error) return {to.logical, {}};
  return allowBouncing && IsCollision(error) ? Bounce(from, folder, name, progress) : FPOutcome{{}, error};
}

}  // namespace droxa
