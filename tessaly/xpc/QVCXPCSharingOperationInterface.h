#pragma once

#include "platform/xpc/NSXPCInterface.h"

namespace droxa {

// The sharing operations (tessaly/QVShareOperationProtocol.h) as they cross a connection, with the operations
// that their calls pass along both ways. Thread contract: any thread.
const NSXPCInterface &QVCXPCSharingOperationInterface();

}  // namespace droxa
