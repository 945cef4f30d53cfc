#pragma once

#include "platform/foundation/NSError.h"

namespace droxa {

// What a program that reads through the mount is told of an error of the extension or the sync: an errno of
// the same meaning, EIO for what has none. Never 0, and never ENOENT: a program would take a document that
// can't be fetched for one that was deleted. Any thread.
int errnoForError(const NSError &error);

}  // namespace droxa
