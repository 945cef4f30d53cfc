#pragma once

#include "platform/xpc/NSXPCInterface.h"

namespace droxa {

// The collaboration service (tessaly/QVPlendaCollaboration.h) as it crosses a connection. Thread contract:
// any thread.
const NSXPCInterface &QVPlendaCollaborationInterface();

}  // namespace droxa
