#pragma once

#include <memory>

#include "platform/fileprovider/operations/FPReplacement.h"

namespace droxa {

// Moves the item at `url`, with all below it, out of sight in one step; it is removed when the replacement
// that is given goes. Null, with `error` set and the item where it was, when it can't be. The caller
// coordinates.
std::unique_ptr<FPReplacement> FPTakeAway(const NSURL &url, NSError *error);

}  // namespace droxa
