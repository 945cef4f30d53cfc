#pragma once

namespace droxa {

// Describes one protocol (an abstract class) to the transport: how an object of it is exported and how a
// remote one is stood in for. One per protocol, with static lifetime, made by the protocol's adapter
// (`const NSXPCInterface &QVProtocolInterface()`). Opaque outside platform/xpc/ and the adapters.
// Thread contract: immutable.
class NSXPCInterface;

}  // namespace droxa
