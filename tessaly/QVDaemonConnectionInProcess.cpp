#include "tessaly/QVDaemonConnectionInProcess.h"

#include <utility>

#include "tessaly/QVSyncProxyOverAsynchronous.h"

namespace droxa {

QVDaemonConnectionInProcess::QVDaemonConnectionInProcess(std::shared_ptr<QVProtocol> daemon)
    : daemon_(std::move(daemon)) {}

std::shared_ptr<QVProtocol> QVDaemonConnectionInProcess::remoteObjectProxyWithErrorHandler(
    NSXPCErrorHandler /*handler*/) {
  return daemon_;
}

std::unique_ptr<QVSyncProxy> QVDaemonConnectionInProcess::newSyncProxy() {
  return QVSyncProxyOverAsynchronous([daemon = daemon_](const NSXPCErrorHandler &) { return daemon; });
}

}  // namespace droxa
