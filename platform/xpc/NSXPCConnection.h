#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/xpc/NSXPCInterface.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {

// The process at the other end, as the kernel tells it (never as the peer says).
struct NSXPCPeer {
  std::int32_t processIdentifier = 0;
  std::uint32_t userIdentifier = 0;
  std::uint32_t groupIdentifier = 0;
  // A descriptor of the process itself (pidfd), which a later process of the same number can't take over; -1
  // when the kernel gives none. Owned by the connection.
  int processDescriptor = -1;
};

class NSXPCListenerEndpoint;

// One end of a connection. It is set up (interfaces, object, handlers), then resumed; before resume() nothing
// is delivered.
//
// A connection ends once: by invalidate(), or because the peer closed, died or sent what makes no sense. Then
// every call under way is answered through its error handler, after that the interruption handler (if the
// peer ended it) and last the invalidation handler run, each at most once. A resumed connection keeps itself
// alive until it ends: whoever made it and needs it no longer invalidates it.
//
// Thread contract: any thread. Handlers, replies and calls into exported objects run on the process's pool,
// never on the transport's loop; calls into one exported object run one after the other in the order of their
// arrival when its interface says so, else concurrently.
class NSXPCConnection {
 public:
  // A connection to the listener at a socket in the file system; null with `error` (may be null) set:
  // NSXPCConnectionInvalid with the system's error (NSPOSIXErrorDomain) beneath.
  static std::shared_ptr<NSXPCConnection> connectionWithSocketPath(const std::string &path, NSError *error);
  // Takes ownership of a connected stream socket, of whichever end.
  static std::shared_ptr<NSXPCConnection> connectionWithDescriptor(int descriptor);
  static std::shared_ptr<NSXPCConnection> connectionWithListenerEndpoint(
      const NSXPCListenerEndpoint &endpoint, NSError *error);
  virtual ~NSXPCConnection() = default;

  // What the peer may call here. Without it the peer's calls are refused.
  template <class Protocol>
  void setExportedObject(const NSXPCInterface &interface, std::shared_ptr<Protocol> object) {
    setExportedObjectErased(interface, std::static_pointer_cast<void>(std::move(object)));
  }
  // How this end sees the peer's exported object.
  virtual void setRemoteObjectInterface(const NSXPCInterface &interface) = 0;
  virtual void setInterruptionHandler(std::function<void()> handler) = 0;
  virtual void setInvalidationHandler(std::function<void()> handler) = 0;
  // The deadline of every call made through this connection and the objects received over it, unless its
  // interface gives the call one of its own. Default: 30 s.
  virtual void setCallDeadline(std::chrono::milliseconds deadline) = 0;
  virtual void resume() = 0;
  // Replies given and calls made before still reach a peer that reads them within a second; the calls fail
  // all the same.
  virtual void invalidate() = 0;

  // The peer's exported object. `Protocol` is what the remote object interface describes.
  template <class Protocol>
  std::shared_ptr<Protocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) {
    return std::static_pointer_cast<Protocol>(remoteObjectProxyErased(std::move(handler), false));
  }
  // The same, but a call returns when its reply or the error handler has run, on the calling thread. Must not
  // be called on the transport's loop.
  template <class Protocol>
  std::shared_ptr<Protocol> synchronousRemoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) {
    return std::static_pointer_cast<Protocol>(remoteObjectProxyErased(std::move(handler), true));
  }

  virtual NSXPCPeer peer() const = 0;
  // The connection whose call the calling thread is serving; null outside of one.
  static std::shared_ptr<NSXPCConnection> currentConnection();

 protected:
  virtual void setExportedObjectErased(const NSXPCInterface &interface, std::shared_ptr<void> object) = 0;
  virtual std::shared_ptr<void> remoteObjectProxyErased(NSXPCErrorHandler handler, bool synchronous) = 0;
};

}  // namespace droxa
