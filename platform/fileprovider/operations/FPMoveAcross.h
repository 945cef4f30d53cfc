#pragma once

#include "platform/fileprovider/operations/FPOperations.h"
#include "platform/fileprovider/operations/FPPlace.h"

namespace droxa {

// Moves the item to another file system: a copy is prepared there, durable and out of sight, appears in one
// step, and then the source goes in one step. Where the source can't go, the copy does. A kill leaves the
// source, the copy, or, for a moment, both. The caller coordinates both places.
NSError FPMoveAcross(const FPPlace &from, const FPPlace &to, const FPProgress &progress);

}  // namespace droxa
