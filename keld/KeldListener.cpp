#include "keld/KeldListener.h"

#include <unistd.h>

#include "keld/KeldSession.h"
#include "tessaly/QVLog.h"
#include "tessaly/xpc/QVProtocolInterface.h"

namespace droxa::keld {

KeldListener::KeldListener(std::weak_ptr<Keld> daemon, std::shared_ptr<NSXPCListener> listener)
    : daemon_(std::move(daemon)), listener_(std::move(listener)) {}

KeldListener::~KeldListener() {
  invalidate();
}

std::shared_ptr<KeldListener> KeldListener::listen(const std::shared_ptr<Keld> &daemon,
                                                   const std::string &socketPath, NSError *error) {
  auto listener = NSXPCListener::listenerWithSocketPath(socketPath, error);
  if (!listener) return nullptr;
  std::shared_ptr<KeldListener> delegate(new KeldListener(daemon, listener));
  listener->setDelegate(delegate);
  listener->resume();
  return delegate;
}

void KeldListener::invalidate() {
  listener_->invalidate();
}

bool KeldListener::listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> & /*listener*/,
                                                     const std::shared_ptr<NSXPCConnection> &connection) {
  const auto daemon = daemon_.lock();
  if (!daemon) return false;
  // The replica is one user's; the socket's mode says the same.
  const NSXPCPeer peer = connection->peer();
  if (peer.userIdentifier != ::getuid() && peer.userIdentifier != 0) {
    os_log(qvc_default_log(), "[WARNING] refused a connection of user %u", peer.userIdentifier);
    return false;
  }
  const auto session = std::make_shared<KeldSession>(daemon);
  connection->setExportedObject(QVProtocolInterface(), std::static_pointer_cast<QVProtocol>(session));
  connection->setInvalidationHandler([session] { session->end(); });
  connection->resume();
  return true;
}

}  // namespace droxa::keld
