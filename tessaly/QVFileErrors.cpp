#include "tessaly/QVFileErrors.h"

#include <cerrno>
#include <cstring>

namespace droxa {

namespace {

std::int64_t cocoaCode(int code) {
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
    default:
      return NSFileWriteUnknownError;
  }
}

}  // namespace

NSError QVFileError(int code, const std::string &path, const std::string &what) {
  return NSError(NSCocoaErrorDomain, cocoaCode(code),
                 {{NSLocalizedDescriptionKey, path + ": " + what + ": " + std::strerror(code)},
                  {NSUnderlyingErrorKey, NSError::errorWithPOSIXCode(code)}});
}

}  // namespace droxa
