#pragma once

#include <capnp/capability.h>
#include <memory>
#include <utility>

#include "platform/xpc/NSXPCProxyCreating.h"
#include "platform/xpc/capnp/Session.h"

namespace droxa {

// An object of the peer, with the way in which its calls are made.
// Thread contract: a value; `object` is looked into on the loop only, and released there whoever lets go of
// it.
struct RemoteObject {
  std::shared_ptr<Session> session;
  std::shared_ptr<capnp::Capability::Client> object;  // null: the connection's exported object
  NSXPCErrorHandler errorHandler;                     // null: failures are logged
  bool synchronous = false;

  RemoteObject withErrorHandler(NSXPCErrorHandler handler) const {
    return {session, object, std::move(handler), false};
  }
  // Of an object that came with a reply or, without a handler, as an argument. On the loop.
  static RemoteObject received(Session &session, capnp::Capability::Client client,
                               NSXPCErrorHandler handler) {
    return {session.shared_from_this(), makeSharedOnLoop<capnp::Capability::Client>(kj::mv(client)),
            std::move(handler), false};
  }
  // On the loop.
  template <class Schema>
  typename Schema::Client as() const {
    return (object ? *object : session->peerObject()).castAs<Schema>();
  }
};

}  // namespace droxa
