#pragma once

#include <string>

#include "keld/sync/SyncStore.h"
#include "platform/foundation/Paths.h"

namespace droxa::keld {

// The account in the cloud that the home's drive belongs to: the one that it was opened with first, else
// `asked`, else who runs this process. Throws std::runtime_error with what to do when `asked` (not "") is
// another one than before, or can't be an account's name; SqlError.
std::string DriveAccount(const DroxaHome &home, const std::string &asked);
// From now on the drive is the account's.
void RememberDriveAccount(SyncStore &store, const std::string &account);

}  // namespace droxa::keld
