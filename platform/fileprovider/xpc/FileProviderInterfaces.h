#pragma once

#include "platform/xpc/NSXPCInterface.h"

namespace droxa {

// The framework's protocols (platform/fileprovider/NSFileProviderRemote.h) as they cross a connection.
// Thread contract: any thread.
const NSXPCInterface &NSFileProviderExtensionInterface();  // NSFileProviderExtensionProtocol
const NSXPCInterface &NSFileProviderHostInterface();       // NSFileProviderHostProtocol
const NSXPCInterface &FPDControlInterface();               // FPDControlProtocol

}  // namespace droxa
