#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/NSURL.h"

// The operations of FPURLOperations.h as calls that return when all is done. Each takes the coordination that
// it needs, and looks at `progress` (may be null) while it waits and works. Any thread; they block.

namespace droxa {

// Where the item is now, or why it isn't.
struct FPOutcome {
  NSURL url;
  NSError error;
};

using FPProgress = std::shared_ptr<NSProgress>;

FPOutcome FPCreateSubFolder(const NSURL &parent, const std::string &name, const FPProgress &progress);
FPOutcome FPRename(const NSURL &url, const std::string &name, const FPProgress &progress);

}  // namespace droxa
