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

// Under the name in the folder, or not at all.
FPOutcome MoveTo(const NSURL &url, const NSURL &folder, const std::string &name, const FPProgress &progress) {
  std::vector<NSFileAccessIntent> intents;
  FPAddWriting(url, &intents);
  FPAddWriting(folder.URLByAppendingPathComponent(name), &intents);
  NSError error;
  const FPAccess access =
      NSFileCoordinator::defaultCoordinator()->coordinateAccess(intents, progress, &error);
  if (!access) return {{}, error};
  const FPPlace from = FPPlaceOfURL(url);
  const FPPlace to = FPPlaceOfName(folder, name, from);
  if (!FPExists(from.onDisk.path())) return {{}, FPNoSuchFileError(url)};
  if (from.logical == to.logical) return {to.logical, {}};
  if (FPIsTakenByOtherForm(to)) return {{}, FPCollisionError(to.logical)};
  const int code = FPMove(from.onDisk.path(), to.onDisk.path());
  if (code == EEXIST) return {{}, FPCollisionError(to.logical)};
  if (code == EXDEV) return {to.logical, FPMoveAcross(from, to, progress)};
  return {to.logical, FPErrorFromPOSIX(code, url.path() + " can't be moved to " + to.logical.path())};
}

bool IsCollision(const NSError &error) {
  return error.is(NSCocoaErrorDomain, NSFileWriteFileExistsError);
}

// Under the first name that is free. Names that are seen to be taken are passed over without coordination.
FPOutcome Bounce(const NSURL &url, const NSURL &folder, const std::string &name, const FPProgress &progress) {
  mode_t mode = 0;
  const FPPlace from = FPPlaceOfURL(url);
  FPBouncedNames names(name, FPExists(from.onDisk.path(), &mode) && S_ISDIR(mode));
  FPOutcome outcome;
  for (int tried = 0; tried < kMostBounces; ++tried) {
    const std::string next = names.next();
    const FPPlace to = FPPlaceOfName(folder, next, from);
    outcome = {{}, FPCollisionError(to.logical)};
    if (FPExists(to.onDisk.path()) || FPIsTakenByOtherForm(to)) continue;
    outcome = MoveTo(url, folder, next, progress);
    if (!IsCollision(outcome.error)) break;
  }
  return outcome;
}

}  // namespace

FPOutcome FPReparent(const NSURL &url, const NSURL &folder, const std::optional<std::string> &newName,
                     bool allowBouncing, const FPProgress &progress) {
  if (!url.isFileURL() || url.path() == "/") return {{}, FPNoSuchFileError(url)};
  const std::string name = newName.value_or(url.lastPathComponent());
  NSError error = FPCheckName(name);
  if (error || !FPIsFolder(folder, &error)) return {{}, error};
  const NSURL onDisk = FPPlaceOfURL(url).onDisk;
  if (!FPExists(onDisk.path())) return {{}, FPNoSuchFileError(url)};
  if (FPIsWithin(folder, onDisk)) {
    const std::string text = url.path() + " can't be moved into itself, to " + folder.path();
    return {{}, FPErrorFromPOSIX(EINVAL, text)};
  }
  const FPOutcome outcome = MoveTo(url, folder, name, progress);
  if (!allowBouncing || !IsCollision(outcome.error)) return outcome;
  return Bounce(url, folder, name, progress);
}

}  // namespace droxa
