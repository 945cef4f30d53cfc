#include "platform/fileprovider/operations/FPTakeAway.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>

#include "platform/fileprovider/operations/FPErrors.h"
#include "platform/fileprovider/operations/FPMove.h"

namespace droxa {
namespace {

constexpr char kGone[] = "item";

// A folder that its owner may not write in can't change its parent; for the step it gets that right.
int MoveFolderWithoutRights(const std::string &path, const FPReplacement &replacement) {
  struct stat status {};
  if (lstat(path.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) return EACCES;
  if ((status.st_mode & S_IWUSR) != 0 || chmod(path.c_str(), S_IRWXU) != 0) return EACCES;
  const int error = FPMoveAt(AT_FDCWD, path, replacement.folder(), kGone);
  if (error) (void)chmod(path.c_str(), status.st_mode & 07777U);
  return error;
}

}  // namespace

std::unique_ptr<FPReplacement> FPTakeAway(const NSURL &url, NSError *error) {
  auto replacement = FPReplacement::make(url, error);
  if (!replacement) {
    const bool isFull = error->code() == NSFileWriteOutOfSpaceError;
    return isFull ? FPReplacement::makeOfFolderAtURL(url, error) : nullptr;
  }
  int code = FPMoveAt(AT_FDCWD, url.path(), replacement->folder(), kGone);
  if (code == EACCES) code = MoveFolderWithoutRights(url.path(), *replacement);
  if (code == 0) return replacement;
  *error = FPErrorFromPOSIX(code, url.path() + " can't be removed");
  return nullptr;
}

}  // namespace droxa
