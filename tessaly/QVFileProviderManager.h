#pragma once

#include "platform/fileprovider/NSFileProviderManager.h"

namespace droxa {

// The framework's manager for this provider.
NSFileProviderManager &qv_sharedProviderManager();

}  // namespace droxa
