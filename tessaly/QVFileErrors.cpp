#include "tessaly/QVFileErrors.h"

#include "platform/fileprovider/operations/FPErrors.h"

namespace droxa {

NSError QVFileError(int code, const std::string &path, const std::string &what) {
  return FPErrorFromPOSIX(code, path + ": " + what);
}

}  // namespace droxa
