#include "platform/fileprovider/operations/FPErrors.h"

#include <cerrno>
#include <system_error>

#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {
namespace {

std::int64_t CocoaCode(int code) {
  switch (code) {
    case ENOENT:
    case ENOTDIR:
      return NSFileNoSuchFileError;
    case EACCES:
    case EPERM:
      return NSFileWriteNoPermissionError;
    case ENAMETOOLONG:
      return NSFileWriteInvalidFileNameError;
    case EEXIST:
      return NSFileWriteFileExistsError;
    case ENOSPC:
    case EDQUOT:
      return NSFileWriteOutOfSpaceError;
    case EROFS:
      return NSFileWriteVolumeReadOnlyError;
    case ECANCELED:
      return NSUserCancelledError;
    default:
      return NSFileWriteUnknownError;
  }
}

NSUserInfo Describe(int code, const std::string &description) {
  return {{NSLocalizedDescriptionKey, description},
          {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(code)}};
}

}  // namespace

NSError FPErrorFromPOSIX(int code, const std::string &description) {
  if (code == 0) return {};
  const std::string reason = std::generic_category().message(code);
  return {NSCocoaErrorDomain, CocoaCode(code), Describe(code, description + ": " + reason)};
}

NSError FPCollisionError(const NSURL &url) {
  NSUserInfo info = Describe(EEXIST, "there is an item at " + url.path() + " already; choose another name");
  info[FPCollidingURLKey] = url;
  return {NSCocoaErrorDomain, NSFileWriteFileExistsError, std::move(info)};
}

NSError FPCancelledError(const NSURL &url) {
  return {NSCocoaErrorDomain, NSUserCancelledError,
          Describe(ECANCELED, "the work on " + url.path() + " was cancelled")};
}

NSError FPNoSuchFileError(const NSURL &url) {
  const std::string name =
      url.isFileURL() ? url.path() : "\"" + url.absoluteString() + "\", which is no file's URL";
  return {NSCocoaErrorDomain, NSFileNoSuchFileError, Describe(ENOENT, "there is nothing at " + name)};
}

}  // namespace droxa
