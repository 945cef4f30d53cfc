#pragma once

#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// NSFileProviderErrorServerUnreachable with words of the host's own.
NSError unreachableError(const std::string &description);

// The drive always has a root: when the extension doesn't find it, the daemon hasn't told where it is.
NSError rootIsUnknown();
// `error`, or that one when the root was asked for and wasn't found.
NSError explainedError(const std::string &identifier, const NSError &error);

}  // namespace droxa
