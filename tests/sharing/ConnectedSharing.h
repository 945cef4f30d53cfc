#pragma once

#include <memory>
#include <vector>

#include "tessaly/QVDaemonConnectionOverXPC.h"
#include "tessaly/xpc/QVProtocolInterface.h"
#include "tests/sharing/ClientProcess.h"
#include "tests/sharing/SharingFixture.h"

namespace droxa {

// Accepts the daemon's clients, and can end their connections.
class DaemonListener final : public NSXPCListenerDelegate {
 public:
  explicit DaemonListener(std::shared_ptr<QVProtocol> daemon) : daemon_(std::move(daemon)) {}
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &,
                                         const std::shared_ptr<NSXPCConnection> &connection) override {
    connection->setExportedObject(QVProtocolInterface(), daemon_);
    const Lock lock(mutex_);
    connections_.push_back(connection);
    connection->resume();
    return true;
  }
  void endConnections() {
    std::vector<std::shared_ptr<NSXPCConnection>> ended;
    {
      const Lock lock(mutex_);
      ended.swap(connections_);
    }
    for (const auto &connection : ended) connection->invalidate();
  }

 private:
  const std::shared_ptr<QVProtocol> daemon_;
  Mutex mutex_;
  std::vector<std::shared_ptr<NSXPCConnection>> connections_ GUARDED_BY(mutex_);
};

// Hands a listener's connections to a source, and keeps them, so that a test can end the extension's side.
class KeepingDelegate final : public NSXPCListenerDelegate {
 public:
  explicit KeepingDelegate(std::shared_ptr<QVFileProviderServiceSource> source)
      : source_(std::move(source)) {}
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &listener,
                                         const std::shared_ptr<NSXPCConnection> &connection) override {
    const bool accepted = source_->listenerShouldAcceptNewConnection(listener, connection);
    const Lock lock(mutex_);
    connection_ = connection;
    return accepted;
  }
  std::shared_ptr<NSXPCConnection> lastConnection() const {
    const Lock lock(mutex_);
    return connection_.lock();
  }

 private:
  const std::shared_ptr<QVFileProviderServiceSource> source_;
  mutable Mutex mutex_;
  std::weak_ptr<NSXPCConnection> connection_ GUARDED_BY(mutex_);
};

// A client, the service and the daemon, each at an end of a real connection.
class ConnectedSharing : public SharingTest {
 protected:
  ConnectedSharing() {
    NSError error;
    daemonListener = NSXPCListener::listenerWithSocketPath(DroxaProcessHome().daemonSocket(), &error);
    EXPECT_TRUE(daemonListener) << error.description();
    daemonListener->setDelegate(daemonDelegate);
    daemonListener->resume();
    QVDaemonConnection::setDefaultConnection(
        std::make_shared<QVDaemonConnectionOverXPC>(DroxaProcessHome().daemonSocket()));
    entitleThisProcess(kAllEntitlements);
  }
  ~ConnectedSharing() override {
    if (client_) client_->invalidate();
    for (const auto &listener : listeners_) listener->invalidate();
    daemonListener->invalidate();
    QVDaemonConnection::setDefaultConnection(nullptr);
    daemonDelegate->endConnections();
  }

  // Of a listener of its own, which ends with the first connection that it accepted.
  NSXPCListenerEndpoint endpoint() {
    NSError error;
    const auto listener = NSXPCListener::anonymousListener(&error);
    EXPECT_TRUE(listener) << error.description();
    listener->setDelegate(delegate);
    listener->resume();
    listeners_.push_back(listener);
    return listener->endpoint();
  }
  // The test's own connection to the service.
  const std::shared_ptr<NSXPCConnection> &client() {
    if (!client_) client_ = connect(endpoint());
    return client_;
  }

  const std::shared_ptr<DaemonListener> daemonDelegate = std::make_shared<DaemonListener>(fake.daemon);
  std::shared_ptr<NSXPCListener> daemonListener;
  const std::shared_ptr<QVFileProviderShareOperationServiceSource> source = makeSource();
  const std::shared_ptr<KeepingDelegate> delegate = std::make_shared<KeepingDelegate>(source);

 private:
  std::vector<std::shared_ptr<NSXPCListener>> listeners_;
  std::shared_ptr<NSXPCConnection> client_;
};

}  // namespace droxa
