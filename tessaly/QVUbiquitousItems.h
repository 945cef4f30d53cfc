#pragma once

#include "platform/foundation/NSURL.h"

namespace droxa {

// Whether there is a document at `url` whose contents aren't here, by the extended attribute that the daemon
// keeps on every document of the replica: "user.droxa.document", whose second field, after the version "1"
// and a blank, is "d" (dataless) or "e" (being evicted). Asks the file system alone. Any thread.
bool qv_isDataless(const NSURL &url);

// The daemon's own folder in the replica, and the one in it where actions on items are prepared.
inline constexpr char QVPrivateStorageName[] = ".droxa-private";
inline constexpr char QVActionsFolderName[] = "actions";

// Makes the daemon this process's sync service: NSFileManager evicts through it, and the reachability of a
// URL counts dataless documents out. Whether an item is shared is asked of the daemon. May be called again.
// Any thread.
void QVInstallUbiquitousItemProvider();

}  // namespace droxa
