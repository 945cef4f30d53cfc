#pragma once

#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// What went wrong with the file at `path`, as file operations tell it: NSCocoaErrorDomain 4 (nothing there),
// 513, 514, 516, 640, 642, else 512, over the POSIX error `code`. `what` says it to a person, without the
// path. Any thread.
NSError QVFileError(int code, const std::string &path, const std::string &what);

}  // namespace droxa
