#pragma once

#include <cstdint>
#include <map>
#include <memory>
#include <vector>

#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVDaemonConnection.h"
#include "tests/support/FakeDaemon.h"

namespace droxa {

// A connection to a fake daemon. Its proxies record their error handlers, and fail in transport when the test
// asks for it: the next call of an operation (replies().failNextInTransport), or all that are under way
// (breakOff). Thread contract: any thread.
class FakeDaemonConnection final : public QVDaemonConnection {
 public:
  struct State;
  explicit FakeDaemonConnection(std::shared_ptr<FakeDaemon> daemon);
  ~FakeDaemonConnection() override;

  std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override;
  std::unique_ptr<QVSyncProxy> newSyncProxy() override;
  void setInterruptionHandler(std::function<void()> handler) override;

  std::size_t proxiesMade() const;
  std::size_t syncProxiesMade() const;
  std::size_t callsUnderWay() const;
  // Ends every call under way through its error handler; their later answers are dropped. New calls pass.
  void breakOff(const NSError &error);
  // The daemon has gone: breakOff, the senders' error handlers, no subscribers any more, the interruption
  // handler.
  void loseDaemon(const NSError &error);
  // While set, every new call fails in transport; nil ends that.
  void setUnreachable(NSError error);

 private:
  friend class FakeDaemonProxy;
  const std::shared_ptr<FakeDaemon> daemon_;
  const std::shared_ptr<State> state_;
};

// A fake daemon that is the process's daemon while it lives, with the replica of the process's home.
class FakeDaemonScope final {
 public:
  FakeDaemonScope();
  ~FakeDaemonScope();
  FakeDaemonScope(const FakeDaemonScope &) = delete;
  FakeDaemonScope &operator=(const FakeDaemonScope &) = delete;

  const std::shared_ptr<FakeDaemon> daemon;
  const std::shared_ptr<FakeDaemonConnection> connection;
};

}  // namespace droxa
