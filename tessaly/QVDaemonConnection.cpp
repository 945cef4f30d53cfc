#include "tessaly/QVDaemonConnection.h"

#include <utility>

#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnectionOverXPC.h"

namespace droxa {

namespace {

Mutex gMutex;
std::shared_ptr<QVDaemonConnection> gConnection GUARDED_BY(gMutex);

}  // namespace

void QVSyncProxy::setObjResult(std::any result, NSError error) {
  result_ = std::move(result);
  error_ = std::move(error);
}

std::shared_ptr<QVDaemonConnection> QVDaemonConnection::defaultConnection() {
  const Lock lock(gMutex);
  if (!gConnection)
    gConnection = std::make_shared<QVDaemonConnectionOverXPC>(DroxaProcessHome().daemonSocket());
  return gConnection;
}

void QVDaemonConnection::setDefaultConnection(std::shared_ptr<QVDaemonConnection> connection) {
  const Lock lock(gMutex);
  gConnection.swap(connection);  // the old one is released after the lock
}

void QVDaemonConnection::setInterruptionHandler(std::function<void()> /*handler*/) {}

}  // namespace droxa
