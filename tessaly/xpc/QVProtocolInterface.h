#pragma once

#include "platform/xpc/NSXPCInterface.h"

namespace droxa {

// The daemon's protocol (tessaly/QVProtocol.h) as it crosses a connection, with the senders and receivers
// that its calls pass along. Thread contract: any thread.
const NSXPCInterface &QVProtocolInterface();

}  // namespace droxa
