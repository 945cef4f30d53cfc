#pragma once

#include <memory>

#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// The way to a daemon that is an object of this process: calls never fail in transport, so error handlers are
// never called. Thread contract: any thread.
class QVDaemonConnectionInProcess final : public QVDaemonConnection {
 public:
  explicit QVDaemonConnectionInProcess(std::shared_ptr<QVProtocol> daemon);

  std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;
  std::unique_ptr<QVSyncProxy> newSyncProxy() override;

 private:
  const std::shared_ptr<QVProtocol> daemon_;
};

}  // namespace droxa
