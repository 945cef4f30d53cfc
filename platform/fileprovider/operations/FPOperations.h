#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSFileCoordinator.h"
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

// Gives back the coordination when it goes. Null with an error.
using FPAccess = std::unique_ptr<NSFileAccess>;
using FPProgress = std::shared_ptr<NSProgress>;

// The access for writing that a deletion of the item needs; NSFileNoSuchFileError where there is none.
FPAccess FPAccessForDeletion(const NSURL &url, const FPProgress &progress, NSError *error);

FPOutcome FPImport(const NSURL &source, const NSURL &folder, const FPProgress &progress);
FPOutcome FPCreateSubFolder(const NSURL &parent, const std::string &name, const FPProgress &progress);
FPOutcome FPRename(const NSURL &url, const std::string &name, const FPProgress &progress);
FPOutcome FPReparent(const NSURL &url, const NSURL &folder, const std::optional<std::string> &newName,
                     bool allowBouncing, const FPProgress &progress);
// Gives no URL.
FPOutcome FPDelete(const NSURL &url, const FPProgress &progress);

}  // namespace droxa
