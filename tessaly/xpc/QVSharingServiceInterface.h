#pragma once

#include "platform/xpc/NSXPCInterface.h"

namespace droxa {

// The sharing service (tessaly/QVSharingService.h) as it crosses a connection. Thread contract: any thread.
const NSXPCInterface &getSharingServiceInterface();

}  // namespace droxa
