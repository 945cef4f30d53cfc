#pragma once

#include <atomic>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <vector>

#include "platform/xpc/NSXPCListener.h"
#include "sharing/QVFileProviderShareOperationServiceSource.h"
#include "tessaly/QVCClientPrivilegesDescriptor.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"
#include "tests/sharing/Entitled.h"
#include "tests/support/Eventually.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/LogLines.h"
#include "tests/support/RecordingOperation.h"
#include "tests/support/ScratchHome.h"
#include "tests/support/ShareCalls.h"

namespace droxa {

inline const std::vector<std::string> kAllEntitlements = {
    QVSharingProxyEntitlement, QVSharingPrivateInterfaceEntitlement, QVFolderSharingProxyEntitlement};

// A reply that is given once, on any thread.
struct Reply {
  std::atomic<int> calls{0};
  Mutex mutex;
  FakeSharing::Answers values GUARDED_BY(mutex);
  NSError error GUARDED_BY(mutex);

  ShareCall::Replied block() {
    return [this](const FakeSharing::Answers &given, const NSError &problem) {
      {
        const Lock lock(mutex);
        values = given;
        error = problem;
      }
      ++calls;
    };
  }
  bool came() {
    return eventually([this] { return calls > 0; });
  }
  FakeSharing::Answers answers() {
    const Lock lock(mutex);
    return values;
  }
  NSError problem() {
    const Lock lock(mutex);
    return error;
  }
};

// The calls that a client's process makes are under the privileges that the test grants it; the daemon is a
// fake one.
class SharingTest : public testing::Test {
 protected:
  void entitleThisProcess(const std::vector<std::string> &entitlements) const {
    entitled.grant(EntitledScope::ownProgram(), entitlements);
  }
  static std::shared_ptr<QVFileProviderShareOperationServiceSource> makeSource() {
    return std::make_shared<QVFileProviderShareOperationServiceSource>(nullptr, "d7",
                                                                       std::make_shared<NSOperationQueue>());
  }
  static std::shared_ptr<NSXPCConnection> connect(const NSXPCListenerEndpoint &endpoint) {
    NSError error;
    auto connection = NSXPCConnection::connectionWithListenerEndpoint(endpoint, &error);
    EXPECT_TRUE(connection) << error.description();
    connection->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
    connection->resume();
    return connection;
  }
  static std::shared_ptr<QVShareOperationProtocol> proxyOf(
      const std::shared_ptr<NSXPCConnection> &connection,
      NSXPCErrorHandler handler = [](const NSError &) {}) {
    return connection->remoteObjectProxyWithErrorHandler<QVShareOperationProtocol>(std::move(handler));
  }
  // Makes the call and waits for its reply, which may be the connection's failure.
  static NSError finish(QVShareOperationProtocol &remote, const char *name) {
    const auto reply = std::make_shared<Reply>();
    shareCall(name).make(remote, nullptr,
                         [reply](const auto &values, const auto &error) { reply->block()(values, error); });
    EXPECT_TRUE(reply->came()) << name;
    return reply->problem();
  }
  std::size_t logged(const std::string &line) const {
    std::size_t count = 0;
    for (const std::string &one : logLines(capture))
      if (one == line) ++count;
    return count;
  }

  const ScratchHome home;
  FakeDaemonScope fake;
  FakeDaemon &daemon = *fake.daemon;
  const EntitledScope entitled;
  OSLogCapture capture;
};

}  // namespace droxa
