#include "platform/xpc/NSXPCConnection.h"

#include <fcntl.h>
#include <unistd.h>
#include <utility>

#include "platform/xpc/NSXPCListener.h"
#include "platform/xpc/UnixSocket.h"
#include "platform/xpc/capnp/Connection.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

NSError connectError(int code, const std::string &target) {
  const NSError cause = NSError::errorWithPOSIXCode(code, "Can't connect to " + target);
  return {
      NSCocoaErrorDomain,
      NSXPCConnectionInvalid,
      {{NSLocalizedDescriptionKey, "There is no connection to " + target}, {NSUnderlyingErrorKey, cause}}};
}

std::shared_ptr<NSXPCConnection> connected(int socket, const std::string &target, NSError *error) {
  if (socket >= 0) return XPCConnection::create(socket);
  if (error) *error = connectError(-socket, target);
  return nullptr;
}

}  // namespace

void xpcLogFailure(const NSError &error) {
  os_log_info(xpcLog(), "[INFO] a call to a received object failed: %@", error);
}

void xpcLogWaitOnLoop() {
  os_log_fault(xpcLog(), "[CRIT] Assertion failed: a synchronous call isn't made on the loop");
}

void xpcLogSecondAnswer() {
  os_log_fault(xpcLog(), "[CRIT] Assertion failed: a call is answered once");
}

std::shared_ptr<NSXPCConnection> NSXPCConnection::connectionWithSocketPath(const std::string &path,
                                                                           NSError *error) {
  return connected(connectToSocketPath(path), path, error);
}

std::shared_ptr<NSXPCConnection> NSXPCConnection::connectionWithDescriptor(int descriptor) {
  return XPCConnection::create(descriptor);
}

std::shared_ptr<NSXPCConnection> NSXPCConnection::connectionWithListenerEndpoint(
    const NSXPCListenerEndpoint &endpoint, NSError *error) {
  return connected(connectToSocketDescriptor(endpoint.descriptor()), "the listener's endpoint", error);
}

std::shared_ptr<XPCConnection> XPCConnection::create(int socket) {
  fcntl(socket, F_SETFD, FD_CLOEXEC);
  fcntl(socket, F_SETFL, fcntl(socket, F_GETFL) | O_NONBLOCK);
  const NSXPCPeer peer = peerOfSocket(socket);
  auto session = Session::create(socket, peer.processIdentifier);
  return std::shared_ptr<XPCConnection>(new XPCConnection(std::move(session), peer));
}

XPCConnection::XPCConnection(std::shared_ptr<Session> session, const NSXPCPeer &peer)
    : session_(std::move(session)), peer_(peer) {}

XPCConnection::~XPCConnection() {
  session_->end(nullptr);
  if (peer_.processDescriptor >= 0) close(peer_.processDescriptor);
  // The loop may be the last to know this connection, but a user's objects aren't released there.
  Setup released;
  {
    const Lock lock(mutex_);
    released = std::move(setup_);
  }
  if (XPCLoop::shared().isCurrent()) {
    dispatch_async_global([kept = std::make_shared<Setup>(std::move(released))] {});
  }
}

void XPCConnection::setExportedObjectErased(const NSXPCInterface &interface, std::shared_ptr<void> object) {
  const Lock lock(mutex_);
  setup_.exportedInterface = &interface;
  setup_.exportedObject.swap(object);
}

void XPCConnection::setRemoteObjectInterface(const NSXPCInterface &interface) {
  const Lock lock(mutex_);
  setup_.remoteInterface = &interface;
}

void XPCConnection::setInterruptionHandler(std::function<void()> handler) {
  const Lock lock(mutex_);
  if (!ended_) setup_.interruptionHandler.swap(handler);
}

void XPCConnection::setInvalidationHandler(std::function<void()> handler) {
  const Lock lock(mutex_);
  if (!ended_) setup_.invalidationHandler.swap(handler);
}

bool XPCConnection::wasResumed() const {
  const Lock lock(mutex_);
  return resumed_ || ended_;
}

void XPCConnection::resume() {
  const NSXPCInterface *interface = nullptr;
  std::shared_ptr<void> object;
  {
    const Lock lock(mutex_);
    if (std::exchange(resumed_, true)) return;
    interface = setup_.exportedInterface;
    object = std::move(setup_.exportedObject);
  }
  session_->start(shared_from_this(), [interface, kept = std::move(object)](Session &session) mutable {
    if (!interface || !kept) {
      return capnp::Capability::Client(KJ_EXCEPTION(UNIMPLEMENTED, "this process exports nothing here"));
    }
    return interface->exportObject(session, std::move(kept));
  });
}

void XPCConnection::invalidate() {
  session_->end(shared_from_this());
}

void XPCConnection::sessionDidEnd(bool byPeer) {
  Setup setup;
  {
    const Lock lock(mutex_);
    ended_ = true;
    setup = std::move(setup_);
    setup_ = Setup();
    setup_.remoteInterface = setup.remoteInterface;  // proxies may still be asked for; their calls fail
  }
  if (byPeer && setup.interruptionHandler) setup.interruptionHandler();
  if (setup.invalidationHandler) setup.invalidationHandler();
}

std::shared_ptr<void> XPCConnection::remoteObjectProxyErased(NSXPCErrorHandler handler, bool synchronous) {
  const NSXPCInterface *interface = nullptr;
  {
    const Lock lock(mutex_);
    interface = setup_.remoteInterface;
  }
  if (!interface) {
    os_log_fault(xpcLog(), "[CRIT] Assertion failed: the connection has a remote object interface");
    return nullptr;
  }
  return interface->makeProxy({session_, nullptr, std::move(handler), synchronous});
}

}  // namespace droxa
