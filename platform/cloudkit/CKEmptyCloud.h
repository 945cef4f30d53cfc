#pragma once

#include <memory>

#include "platform/cloudkit/CKCloud.h"

namespace droxa {

// A database of the same account that has no zones, and in which none can be made (invalidArguments). Its
// records and assets are answered as those of any cloud without zones: zoneNotFound, unknownItem.
std::shared_ptr<CKCloud> CKEmptyCloudBeside(std::shared_ptr<CKCloud> accountCloud);

}  // namespace droxa
