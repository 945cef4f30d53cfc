#include "tessaly/QVDaemonConnectionOverXPC.h"

#include <chrono>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVUnreachableDaemon.h"
#include "tessaly/QVUserDefaults.h"
#include "tessaly/xpc/QVProtocolInterface.h"

namespace droxa {

namespace {

class SyncProxyOverXPC final : public QVSyncProxy {
 public:
  SyncProxyOverXPC(const std::shared_ptr<NSXPCConnection> &connection, const NSError &connectError) {
    if (connection) {
      daemon_ = connection->synchronousRemoteObjectProxyWithErrorHandler<QVProtocol>(
          [this](const NSError &error) { setObjResult({}, error); });
    } else {
      daemon_ = QVUnreachableDaemon([this, connectError] { setObjResult({}, connectError); });
    }
  }
  QVProtocol *operator->() override { return daemon_.get(); }

 private:
  std::shared_ptr<QVProtocol> daemon_;
};

}  // namespace

QVDaemonConnectionOverXPC::QVDaemonConnectionOverXPC(std::string socketPath)
    : socketPath_(std::move(socketPath)) {}

QVDaemonConnectionOverXPC::~QVDaemonConnectionOverXPC() {
  std::shared_ptr<NSXPCConnection> connection;
  {
    const Lock lock(mutex_);
    connection.swap(connection_);
  }
  if (connection) connection->invalidate();
}

std::shared_ptr<QVProtocol> QVDaemonConnectionOverXPC::remoteObjectProxyWithErrorHandler(
    NSXPCErrorHandler handler) {
  NSError error;
  const std::shared_ptr<NSXPCConnection> there = connection(&error);
  if (there) return there->remoteObjectProxyWithErrorHandler<QVProtocol>(std::move(handler));
  return QVUnreachableDaemon(
      [handler = std::move(handler), error] { dispatch_async_global([handler, error] { handler(error); }); });
}

std::unique_ptr<QVSyncProxy> QVDaemonConnectionOverXPC::newSyncProxy() {
  NSError error;
  const std::shared_ptr<NSXPCConnection> there = connection(&error);
  return std::make_unique<SyncProxyOverXPC>(there, error);
}

void QVDaemonConnectionOverXPC::setInterruptionHandler(std::function<void()> handler) {
  const Lock lock(mutex_);
  interruptionHandler_ = std::move(handler);
}

// The connection that stands, else a new one; null with `error` set when nobody listens.
std::shared_ptr<NSXPCConnection> QVDaemonConnectionOverXPC::connection(NSError *error) {
  const Lock lock(mutex_);
  if (connection_) return connection_;
  std::shared_ptr<NSXPCConnection> made = NSXPCConnection::connectionWithSocketPath(socketPath_, error);
  if (!made) {
    os_log_info(qvc_default_log(), "[INFO] can't connect to the daemon at %s: %@", socketPath_, *error);
    return nullptr;
  }
  made->setRemoteObjectInterface(QVProtocolInterface());
  made->setCallDeadline(
      std::chrono::milliseconds(QVUserDefaults::standardUserDefaults().daemonCallDeadlineMilliseconds()));
  const auto ended = [weak = weak_from_this(), raw = made.get()] {
    if (const auto self = weak.lock()) self->lost(raw);
  };
  made->setInterruptionHandler(ended);
  made->setInvalidationHandler(ended);
  connection_ = made;
  made->resume();
  return made;
}

// Each connection is lost once, whichever of its handlers comes first.
void QVDaemonConnectionOverXPC::lost(const NSXPCConnection *connection) {
  std::shared_ptr<NSXPCConnection> dropped;
  std::function<void()> handler;
  {
    const Lock lock(mutex_);
    if (connection_.get() != connection) return;
    dropped.swap(connection_);
    handler = interruptionHandler_;
  }
  os_log_info(qvc_default_log(), "[INFO] lost the connection to the daemon at %s", socketPath_);
  dropped->invalidate();
  if (handler) handler();
}

}  // namespace droxa
