#pragma once

#include <cstddef>

#include "platform/foundation/NSURL.h"

namespace droxa {

// Removes, with all that is in them, the folders in `directory` in which an operation prepared its work or
// threw away what it had taken out of sight, and which its process left when it ended. Those of operations
// under way stay. Gives the number that was removed; what can't be removed is logged. Any thread; blocks.
std::size_t FPRemoveAbandonedReplacements(const NSURL &directory);

}  // namespace droxa
