// Clients of the services on items that send what they like: their connection ends, nothing that makes no
// sense reaches the service, and other clients don't notice.

#include <gtest/gtest.h>
#include <poll.h>
#include <sys/socket.h>
#include <unistd.h>
#include <vector>

#include "platform/oslog/os_log.h"
#include "tessaly/QVPlendaCollaboration.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"
#include "tests/support/ScriptedSharingService.h"
#include "tests/support/ShareCalls.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

using Bytes = std::vector<std::uint8_t>;
using Collaboration = QVFileProviderPlendaCollaboration;

// What a client writes that makes `calls` of the service and has had no answer yet.
template <class Calls>
Bytes record(const NSXPCInterface &interface, const Calls &calls) {
  int ends[2] = {-1, -1};
  EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
  const auto client = NSXPCConnection::connectionWithDescriptor(ends[0]);
  client->setRemoteObjectInterface(interface);
  client->resume();
  calls(*client);
  Bytes bytes;
  pollfd poller{ends[1], POLLIN, 0};
  while (poll(&poller, 1, bytes.empty() ? 20'000 : 300) == 1) {
    std::uint8_t buffer[4096];
    const ssize_t count = read(ends[1], buffer, sizeof buffer);
    if (count <= 0) break;
    bytes.insert(bytes.end(), buffer, buffer + count);
  }
  client->invalidate();
  close(ends[1]);
  return bytes;
}

Bytes sharingCalls() {
  return record(getSharingServiceInterface(), [](NSXPCConnection &client) {
    const auto remote = client.remoteObjectProxyWithErrorHandler<QVSharingService>([](const NSError &) {});
    remote->saveShare(wholeShare(), [](const auto &, const NSError &) {});
    remote->unshareWithCompletion([](const NSError &) {});
  });
}

Bytes collaborationCalls() {
  return record(QVPlendaCollaborationInterface(), [](NSXPCConnection &client) {
    const auto remote = client.remoteObjectProxyWithErrorHandler<Collaboration>([](const NSError &) {});
    remote->fetchLatestRevisionWithCompletionHandler([](const NSError &) {});
    remote->fetchCollaborationTokenWithCompletionHandler(nullptr);
  });
}

// Answers everything at once, with nothing.
class QuietCollaboration final : public Collaboration {
 public:
  void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) override {
    handler(0, 0, {});
  }
  Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) override {
    handler({}, {}, {}, {}, {});
    return std::make_shared<NSProgress>();
  }
  Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler({});
    return std::make_shared<NSProgress>();
  }
  Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    handler({});
    return nullptr;
  }
  void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler({}, {});
  }
  void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) override {
    handler({}, {});
  }
  Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) override {
    handler(false, {});
    return nullptr;
  }
  Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) override {
    handler(false, {}, {});
    return nullptr;
  }
  void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    handler({}, {});
  }
};

class HostileServiceClient : public testing::Test {
 protected:
  HostileServiceClient() { bystander_.serve<QVSharingService>(getSharingServiceInterface(), sharing_); }
  ~HostileServiceClient() override {
    const Once<std::optional<CKShare>, NSError> done("bystander");
    bystander_.client->remoteObjectProxyWithErrorHandler<QVSharingService>([](const NSError &) {})
        ->fetchShareWithCompletion(done.completion());
    EXPECT_TRUE(done.wait()) << "somebody else noticed";
  }

  // Sends the bytes and closes; the service's connection must end.
  template <class Protocol>
  void send(const NSXPCInterface &interface, const std::shared_ptr<Protocol> &object, const Bytes &bytes) {
    int ends[2] = {-1, -1};
    ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
    const auto connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
    connection->setExportedObject<Protocol>(interface, object);
    const auto ended = std::make_shared<std::atomic<bool>>(false);
    connection->setInvalidationHandler([ended] { *ended = true; });
    connection->resume();
    EXPECT_EQ(::send(ends[1], bytes.data(), bytes.size(), MSG_NOSIGNAL), static_cast<ssize_t>(bytes.size()));
    shutdown(ends[1], SHUT_WR);
    EXPECT_TRUE(eventually([&] {
      std::uint8_t buffer[4096];
      while (recv(ends[1], buffer, sizeof buffer, MSG_DONTWAIT) > 0) {
      }
      return ended->load();
    }));
    close(ends[1]);
  }
  // The calls with each of their bytes spoilt in turn (every `step`th), and cut off there.
  template <class Protocol>
  void spoil(const NSXPCInterface &interface, const std::shared_ptr<Protocol> &object, const Bytes &calls,
             std::size_t step) {
    ASSERT_GT(calls.size(), 100U);
    for (std::size_t at = 0; at < calls.size(); at += step) {
      Bytes spoilt = calls;
      spoilt[at] = static_cast<std::uint8_t>(~spoilt[at]);
      send(interface, object, spoilt);
      send(interface, object, Bytes(calls.begin(), calls.begin() + static_cast<std::ptrdiff_t>(at)));
    }
  }

  const std::shared_ptr<ScriptedSharingService> sharing_ = std::make_shared<ScriptedSharingService>();
  ConnectedPair bystander_;
  const OSLogCapture log_;
};

TEST_F(HostileServiceClient, spoiltCallsOfTheSharingServiceEndTheirConnectionAlone) {
  spoil<QVSharingService>(getSharingServiceInterface(), sharing_, sharingCalls(), 13);
}

TEST_F(HostileServiceClient, spoiltCallsOfTheCollaborationServiceEndTheirConnectionAlone) {
  spoil<Collaboration>(QVPlendaCollaborationInterface(), std::make_shared<QuietCollaboration>(),
                       collaborationCalls(), 7);
}

TEST_F(HostileServiceClient, garbageNeverReachesTheServices) {
  Bytes garbage(4096);
  for (std::size_t index = 0; index < garbage.size(); ++index)
    garbage[index] = static_cast<std::uint8_t>(index * 131 + 7);
  const auto asked = std::make_shared<ScriptedSharingService>();
  send<QVSharingService>(getSharingServiceInterface(), asked, garbage);
  EXPECT_TRUE(asked->log.calls().empty());
}

// Watches its progress and never takes what it is told.
TEST_F(HostileServiceClient, aClientThatDoesntTakeItsProgressHoldsUpNobody) {
  const auto service = std::make_shared<ScriptedSharingService>();
  service->progress = NSProgress::progressWithTotalUnitCount(1'000'000);
  int ends[2] = {-1, -1};
  ASSERT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
  const auto connection = NSXPCConnection::connectionWithDescriptor(ends[0]);
  connection->setExportedObject<QVSharingService>(getSharingServiceInterface(), service);
  connection->resume();
  const Bytes calls = sharingCalls();
  EXPECT_EQ(::send(ends[1], calls.data(), calls.size(), MSG_NOSIGNAL), static_cast<ssize_t>(calls.size()));
  ASSERT_TRUE(service->log.waitFor("unshare"));
  for (std::int64_t count = 1; count <= 1'000'000; ++count) service->progress->setCompletedUnitCount(count);
  // One change is on its way, however many there were.
  std::size_t written = 0;
  std::uint8_t buffer[4096];
  pollfd poller{ends[1], POLLIN, 0};
  while (poll(&poller, 1, 200) == 1) {
    const ssize_t count = recv(ends[1], buffer, sizeof buffer, MSG_DONTWAIT);
    if (count <= 0) break;
    written += static_cast<std::size_t>(count);
  }
  EXPECT_LT(written, 64U << 10);
  connection->invalidate();
  close(ends[1]);
}

}  // namespace
}  // namespace droxa
