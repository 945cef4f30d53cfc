#pragma once

#include <string>

#include "keld/ItemRecord.h"

namespace droxa::keld {

// What the user notes on an item, on its file (tessaly/QVItemMetadata.h), by the file's name in an open
// folder (which may be open as a path alone). Any thread.

// Replaces `metadata` by what the file bears. It is left as it is where the file can't be read or couldn't
// bear any of it. Gives whether the file may bear a document's marker. One system call for a file that bears
// nothing.
bool ReadMetadataOfFile(int folder, const std::string &name, ItemMetadata *metadata);
// 0 or an errno; ENOTSUP where the file can't bear it: then Reconciler::applyMetadata keeps it in the item's
// row.
int ApplyMetadataToFile(int folder, const std::string &name, const QVItemMetadataChange &change);

}  // namespace droxa::keld
