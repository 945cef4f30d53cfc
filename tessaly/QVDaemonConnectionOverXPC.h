#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// The way to a daemon that listens at a socket. It connects at the first call; when the connection is lost,
// the calls under way are answered through their error handlers and the next call connects anew. While nobody
// listens, each call is answered through its error handler. Thread contract: any thread; handlers run on the
// process's pool.
class QVDaemonConnectionOverXPC final : public QVDaemonConnection,
                                        public std::enable_shared_from_this<QVDaemonConnectionOverXPC> {
 public:
  explicit QVDaemonConnectionOverXPC(std::string socketPath);
  ~QVDaemonConnectionOverXPC() override;

  std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;
  std::unique_ptr<QVSyncProxy> newSyncProxy() override;
  void setInterruptionHandler(std::function<void()> handler) override;

 private:
  std::shared_ptr<NSXPCConnection> connection(NSError *error);
  void lost(const NSXPCConnection *connection);

  const std::string socketPath_;
  Mutex mutex_;
  std::shared_ptr<NSXPCConnection> connection_ GUARDED_BY(mutex_);
  std::function<void()> interruptionHandler_ GUARDED_BY(mutex_);
};

}  // namespace droxa
