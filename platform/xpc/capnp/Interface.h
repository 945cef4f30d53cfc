#pragma once

#include <memory>
#include <utility>

#include "platform/xpc/NSXPCInterface.h"
#include "platform/xpc/capnp/RemoteObject.h"
#include "platform/xpc/capnp/Session.h"

namespace droxa {

class NSXPCInterface {
 public:
  const char *protocol;
  capnp::Capability::Client (*exportObject)(Session &session, std::shared_ptr<void> object);  // on the loop
  std::shared_ptr<void> (*makeProxy)(RemoteObject remote);                                    // any thread
};

// Describes the protocol that `Server` exports and `Proxy` stands in for.
template <class Protocol, class Server, class Proxy>
NSXPCInterface makeXPCInterface(const char *protocol) {
  return {protocol,
          [](Session &session, std::shared_ptr<void> object) -> capnp::Capability::Client {
            return kj::heap<Server>(session, std::static_pointer_cast<Protocol>(std::move(object)));
          },
          [](RemoteObject remote) -> std::shared_ptr<void> {
            return std::shared_ptr<Protocol>(std::make_shared<Proxy>(std::move(remote)));
          }};
}

}  // namespace droxa
