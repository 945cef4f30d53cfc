#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSFileCoordinator.h"
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
// Whether an item of the place's name is there already in the other form: as itself where the place is a
// promise's, and the reverse. A file at the place itself is left to the step that never replaces one.
bool FPIsTakenByOtherForm(const FPPlace &place);
// The accesses for writing to all that the place has.
void FPAddWriting(const FPPlace &place, std::vector<NSFileAccessIntent> *intents);

// Whether there is a folder at `url`, also through a link; otherwise `error` is set.
bool FPIsFolder(const NSURL &url, NSError *error);
// Whether `folder` is the item at `url` or lies below it, whichever links lead there.
bool FPIsWithin(const NSURL &folder, const NSURL &url);

}  // namespace droxa
