#pragma once

#include <memory>
#include <string>

#include "platform/cloudkit/CKCloud.h"
#include "platform/foundation/Paths.h"

namespace droxa::keld {

// The cloud of the home's drive, in a folder. For a drive that was in a cloud before, one that isn't there
// now (a disk that isn't mounted, a server that is away) is opened when it is back; until then its calls say
// so, and nothing is made in its place. Else it is made where it is missing; null with `error` when it can't
// be used. Throws SqlError.
std::shared_ptr<CKCloud> OpenDriveCloud(const DroxaHome &home, const std::string &folder,
                                        const std::string &account, const std::string &device,
                                        NSError *error);

}  // namespace droxa::keld
