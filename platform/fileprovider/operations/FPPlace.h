#pragma once

#include <string>
#include <sys/types.h>

#include "platform/foundation/NSURL.h"

namespace droxa {

// Where an item is for those who name it, and which file stands for it on the disk: the same, but for a
// document whose contents are elsewhere and for which a promise lies beside its place.
// Thread contract: a value.
struct FPPlace {
  NSURL logical;
  NSURL onDisk;
  bool isPromise() const { return !(logical == onDisk); }
};

// The place that `url` means: its own file, or with the physical property the file that stands for it.
FPPlace FPPlaceOfURL(const NSURL &url);
// The place of the item of that name in `folder`, of the same kind as `like`.
FPPlace FPPlaceOfName(const NSURL &folder, const std::string &name, const FPPlace &like);

// Whether something is at the path, a symbolic link to nothing included. `mode` (may be null) is set then.
bool FPExists(const std::string &path, mode_t *mode = nullptr);
// Whether an item of the place's name is there already, in one form or the other.
bool FPIsTaken(const FPPlace &place);

}  // namespace droxa
