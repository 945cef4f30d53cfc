#include "tessaly/xpc/QVProtocolInterface.h"

#include "platform/xpc/capnp/Interface.h"
#include "tessaly/xpc/QVProtocolProxy.h"
#include "tessaly/xpc/QVProtocolServer.h"

namespace droxa {

const NSXPCInterface &QVProtocolInterface() {
  static const auto interface = makeXPCInterface<QVProtocol, QVProtocolServer, QVProtocolProxy>("QVProtocol");
  return interface;
}

}  // namespace droxa
