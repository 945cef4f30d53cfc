#include "platform/fileprovider/operations/FPMoveAcross.h"

#include <cerrno>
#include <fcntl.h>
#include <unistd.h>

#include "platform/fileprovider/operations/FPCopy.h"
#include "platform/fileprovider/operations/FPDescriptor.h"
#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"
#include "platform/fileprovider/operations/FPTakeAway.h"

namespace droxa {
namespace {

constexpr char kCopy[] = "item";

int MakeNameDurable(const std::string &folder) {
  const FPDescriptor opened(open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  return opened.get() >= 0 && fsync(opened.get()) == 0 ? 0 : errno;
}

NSError Publish(const FPReplacement &replacement, const FPPlace &to) {
  const int code = FPMoveAt(replacement.folder(), kCopy, AT_FDCWD, to.onDisk.path());
  if (code == EEXIST) return FPCollisionError(to.logical);
  return FPErrorFromPOSIX(code, "the copy can't be put at " + to.logical.path());
}

}  // namespace

NSError FPMoveAcross(const FPPlace &from, const FPPlace &to, const FPProgress &progress) {
  // Before the copy, so that it isn't made in vain.
  if (FPExists(to.onDisk.path())) return FPCollisionError(to.logical);
  NSError error;
  const auto replacement = FPReplacement::make(to.onDisk, &error);
  if (!replacement) return error;
  error = FPCopyItem(from.onDisk, replacement->folder(), kCopy, FPCopyPurpose::move, progress);
  if (error) return error;
  if (progress && progress->isCancelled()) return FPCancelledError(from.logical);
  if ((error = Publish(*replacement, to))) return error;
  const int code = MakeNameDurable(to.onDisk.URLByDeletingLastPathComponent().path());
  error = FPErrorFromPOSIX(code, to.logical.path() + " can't be made durable");
  FPFinishCopiedMode(from.onDisk, to.onDisk);
  if (!error && FPTakeAway(from.onDisk, &error)) return {};
  (void)FPMoveAt(AT_FDCWD, to.onDisk.path(), replacement->folder(), kCopy);
  return error;
}

}  // namespace droxa
