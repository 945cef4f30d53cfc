#pragma once

#include <functional>
#include <string>

#include "keld/sync/ReplicaFiles.h"

namespace droxa::keld {

// Returns when everything that was done in the replica before the call has reached the item table: watchers
// tell in order, so a mark that is made now is seen after all of it. nil, or why it can't be known. Blocks.
// `isGivenUp` (may be null) is asked all the while; then the answer is QVErrorCancelled.
NSError WaitUntilReplicaIsSeen(const std::string &replicaPath, const ReplicaFiles::Read &read,
                               const std::function<bool()> &isGivenUp = nullptr);
// Removes the marks of waits that a killed process left.
void RemoveOldMarks(const std::string &replicaPath);

}  // namespace droxa::keld
