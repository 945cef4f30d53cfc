#pragma once

#include <cstdint>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

// What the move of an item would be. The daemon answers with a set of the bits below: what stands in the way
// alone, when something does; otherwise everything about the move that holds.

namespace droxa {

enum QVMoveCapability : std::uint64_t {
  // Allowed as it is: the item's record follows, whether its contents are here or not.
  QVMoveWithinContainer = 1U << 0,
  QVMoveIntoTrash = 1U << 8,
  QVMoveOfAlias = 1U << 12,
  // Allowed as it is: what has to be written elsewhere is here.
  QVMoveAcrossContainers = 1U << 6,
  QVMoveOutOfDrive = 1U << 7,

  // Allowed, but what isn't here is needed first.
  QVMoveDatalessIntoLocalPlace = 1U << 1,  // private storage, or a folder that is excluded from sync
  QVMoveDatalessAcrossContainers = 1U << 3,
  QVMoveDatalessOutOfDrive = 1U << 4,
  QVMoveFolderAwayWithDataless = 1U << 5,  // across containers or out of the drive
  QVMoveDatalessOutOfShare = 1U << 10,
  QVMoveFolderIntoLocalPlaceWithDataless = 1U << 13,

  // Refused.
  QVMoveIntoItself = 1U << 2,   // or into a folder below itself
  QVMoveOfContainer = 1U << 9,  // the root, or a container's own folder
  QVMoveToReadOnlyPlace = 1U << 11,
};

// A set is that of an allowed move when it shares a bit with the first mask, and that of one which needs the
// contents here when it shares one with the second.
inline constexpr std::uint64_t QVMoveAllowed = 0x35fb;
inline constexpr std::uint64_t QVMoveNeedsContents = 0x243a;

// What there is to know about a move.
struct QVMove {
  bool isOfContainer = false;
  bool isIntoItself = false;
  bool isToReadOnlyPlace = false;
  bool isOfAlias = false;
  bool isOfFolder = false;
  bool isDataless = false;  // of a folder: something below it is
  bool leavesDrive = false;
  bool leavesContainer = false;  // for another one
  bool leavesShare = false;
  bool isIntoTrash = false;
  bool isIntoLocalPlace = false;  // private storage, or excluded from sync
};
std::uint64_t QVCapabilityOfMove(const QVMove &move);

// What moving `source` to `destination` (with its last name) would be; 0 with `error` (may be null) set when
// the daemon can't say. Blocks on the daemon. Any thread.
std::uint64_t qv_capabilityToMoveToURL(const NSURL &source, const NSURL &destination, NSError *error);

}  // namespace droxa
