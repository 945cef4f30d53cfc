#pragma once

#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

// The errors of the operations, as FPURLOperations.h lists them. Any thread.

namespace droxa {

// The error of a system call that answered `code`; nil for 0. `description` says what couldn't be done to
// which item; the system's reason is added.
NSError FPErrorFromPOSIX(int code, const std::string &description);
// 516: something stands at `url` already.
NSError FPCollisionError(const NSURL &url);
// 3072: somebody cancelled the work on `url`.
NSError FPCancelledError(const NSURL &url);
// 4: there is nothing at `url`, which may be nil.
NSError FPNoSuchFileError(const NSURL &url);

}  // namespace droxa
