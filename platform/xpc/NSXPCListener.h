#pragma once

#include <memory>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// Names a listener in any process: a descriptor that can be passed on. A peer that connects through it is
// seen by the listener as itself, whoever passed the endpoint. Thread contract: immutable.
class NSXPCListenerEndpoint {
 public:
  // Takes ownership of an O_PATH descriptor of the listening socket.
  explicit NSXPCListenerEndpoint(int descriptor);
  NSXPCListenerEndpoint(const NSXPCListenerEndpoint &other);  // duplicates the descriptor
  NSXPCListenerEndpoint &operator=(const NSXPCListenerEndpoint &) = delete;
  ~NSXPCListenerEndpoint();
  int descriptor() const { return descriptor_; }

 private:
  const int descriptor_;
};

class NSXPCListener;

class NSXPCListenerDelegate {
 public:
  virtual ~NSXPCListenerDelegate() = default;
  // Called on the pool for each peer that connects. Sets the connection up and resumes it and returns true,
  // or returns false: then the connection is closed.
  virtual bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &listener,
                                                 const std::shared_ptr<NSXPCConnection> &connection) = 0;
};

// Accepts connections. The delegate is held weakly; without one every peer is refused.
// Thread contract: any thread.
class NSXPCListener {
 public:
  // Listens at a path, made with mode 0600; a socket that a dead process left there is replaced, a living one
  // is not. Paths longer than the kernel takes are bound through their folder. Null with `error` (may be
  // null) set: NSPOSIXErrorDomain, EADDRINUSE when a process listens there.
  static std::shared_ptr<NSXPCListener> listenerWithSocketPath(const std::string &path, NSError *error);
  // Takes ownership of a listening socket that somebody else made (socket activation).
  static std::shared_ptr<NSXPCListener> listenerWithDescriptor(int descriptor);
  // Reached through its endpoint alone.
  static std::shared_ptr<NSXPCListener> anonymousListener(NSError *error);
  virtual ~NSXPCListener() = default;

  virtual void setDelegate(std::weak_ptr<NSXPCListenerDelegate> delegate) = 0;
  virtual NSXPCListenerEndpoint endpoint() const = 0;
  virtual void resume() = 0;
  virtual void invalidate() = 0;  // accepted connections live on
};

}  // namespace droxa
