#pragma once

#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"

// The store's trash: <replica>/<trash container>/files with the items, beside it `info` with the notes of
// where they came from (tessaly/QVTrashInfo.h). Any thread; blocks on the file system and on the daemon.

namespace droxa {

// Moves the item at `url` into the trash, under its name or "name 2.ext", "name 3.ext", …. Its note is
// durable before it is moved, and goes again when it can't be. nil, or why it wasn't moved: QVFileErrors'; 22
// for what isn't an item that can be trashed.
NSError QVMoveToTrash(const NSURL &url, NSURL *resultingURL);
// Where the trashed item at `url` was: in the folder that held it, wherever that is now, else at the noted
// path. nil with `error` (may be null): QVErrorInvalidArgument for what isn't in the trash,
// NSFileReadNoSuchFileError when nothing usable is noted.
NSURL QVPutBackURL(const NSURL &url, NSError *error);

}  // namespace droxa
