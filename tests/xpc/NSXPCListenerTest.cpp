#include <algorithm>
#include <atomic>
#include <cerrno>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <mutex>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCListener.h"
#include "tests/platform/TemporaryFolder.h"
#include "tests/support/Once.h"
#include "tests/xpc/CallOutcomes.h"
#include "tests/xpc/Descriptors.h"
#include "tests/xpc/ScriptedHost.h"

namespace droxa {
namespace {

using Host = NSFileProviderHostProtocol;

// Serves a host to everybody, or refuses everybody.
class Acceptor final : public NSXPCListenerDelegate {
 public:
  explicit Acceptor(bool accepts = true) : accepts_(accepts) {}
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &,
                                         const std::shared_ptr<NSXPCConnection> &connection) override {
    lastPeer_ = connection->peer().processIdentifier;
    ++asked_;
    if (!accepts_) return false;
    connection->setExportedObject<Host>(NSFileProviderHostInterface(), ScriptedHost::answering());
    connection->resume();
    return true;
  }
  int asked() const { return asked_; }
  int lastPeer() const { return lastPeer_; }

 private:
  const bool accepts_;
  std::atomic<int> asked_ = 0;
  std::atomic<int> lastPeer_ = 0;
};

std::shared_ptr<NSXPCListener> resumed(std::shared_ptr<NSXPCListener> listener,
                                       const std::shared_ptr<Acceptor> &acceptor) {
  listener->setDelegate(acceptor);
  listener->resume();
  return listener;
}

std::shared_ptr<NSXPCConnection> hostConnection(std::shared_ptr<NSXPCConnection> connection) {
  connection->setRemoteObjectInterface(NSFileProviderHostInterface());
  connection->resume();
  return connection;
}

// Whether a call over the connection is answered; ends the connection.
bool answers(const std::shared_ptr<NSXPCConnection> &connection) {
  CallOutcomes outcomes;
  outcomes.call(connection, "");
  EXPECT_TRUE(outcomes.waitForAll());
  connection->invalidate();
  return outcomes.replies() == 1;
}

TEST(NSXPCListener, aPeerThatConnectsToThePathIsServed) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/socket";
  const auto acceptor = std::make_shared<Acceptor>();
  const auto listener = resumed(NSXPCListener::listenerWithSocketPath(path, nullptr), acceptor);
  struct stat status = {};
  ASSERT_EQ(stat(path.c_str(), &status), 0);
  EXPECT_TRUE(S_ISSOCK(status.st_mode));
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr))));
  EXPECT_EQ(acceptor->asked(), 1);
  EXPECT_EQ(acceptor->lastPeer(), getpid());
  EXPECT_TRUE(answers(
      hostConnection(NSXPCConnection::connectionWithListenerEndpoint(listener->endpoint(), nullptr))));
  listener->invalidate();
}

TEST(NSXPCListener, aSocketThatADeadProcessLeftIsReplaced) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/socket";
  const int left = socket(AF_UNIX, SOCK_STREAM, 0);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  ASSERT_EQ(bind(left, reinterpret_cast<const sockaddr *>(&address), sizeof address), 0);
  close(left);
  NSError error;
  const auto listener = NSXPCListener::listenerWithSocketPath(path, &error);
  ASSERT_NE(listener, nullptr) << error.description();
  const auto acceptor = std::make_shared<Acceptor>();
  resumed(listener, acceptor);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr))));
}

TEST(NSXPCListener, aSocketThatALivingListenerHasIsLeftAlone) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/socket";
  const auto acceptor = std::make_shared<Acceptor>();
  const auto listener = resumed(NSXPCListener::listenerWithSocketPath(path, nullptr), acceptor);
  NSError error;
  EXPECT_EQ(NSXPCListener::listenerWithSocketPath(path, &error), nullptr);
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EADDRINUSE)) << error.description();
  EXPECT_NE(error.localizedDescription().find(path), std::string::npos);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr))));
}

TEST(NSXPCListener, aFileThatIsNoSocketIsLeftAlone) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/file";
  close(open(path.c_str(), O_CREAT | O_WRONLY, 0600));
  NSError error;
  EXPECT_EQ(NSXPCListener::listenerWithSocketPath(path, &error), nullptr);
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, EADDRINUSE)) << error.description();
  EXPECT_EQ(access(path.c_str(), F_OK), 0);
}

TEST(NSXPCListener, aPathLongerThanTheKernelTakesIsBoundThroughItsFolder) {
  const TemporaryFolder folder;
  std::string deep = folder.path();
  for (int level = 0; level < 3; ++level) {
    deep += "/" + std::string(60, static_cast<char>('a' + level));
    ASSERT_EQ(mkdir(deep.c_str(), 0700), 0);
  }
  const std::string path = deep + "/socket";
  const auto acceptor = std::make_shared<Acceptor>();
  NSError error;
  const auto listener = NSXPCListener::listenerWithSocketPath(path, &error);
  ASSERT_NE(listener, nullptr) << error.description();
  resumed(listener, acceptor);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr))));
  EXPECT_EQ(NSXPCListener::listenerWithSocketPath(deep + "/" + std::string(108, 'n'), &error), nullptr);
  EXPECT_TRUE(error.is(NSPOSIXErrorDomain, ENAMETOOLONG)) << error.description();
}

TEST(NSXPCListener, anAnonymousListenerIsReachedThroughItsEndpointAlone) {
  const auto acceptor = std::make_shared<Acceptor>();
  NSError error;
  const auto listener = NSXPCListener::anonymousListener(&error);
  ASSERT_NE(listener, nullptr) << error.description();
  resumed(listener, acceptor);
  const NSXPCListenerEndpoint endpoint = listener->endpoint();
  const NSXPCListenerEndpoint passed(endpoint);
  EXPECT_NE(passed.descriptor(), endpoint.descriptor());
  EXPECT_NE(fcntl(passed.descriptor(), F_GETFD) & FD_CLOEXEC, 0);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithListenerEndpoint(passed, nullptr))));
  EXPECT_EQ(acceptor->lastPeer(), getpid());
  listener->invalidate();
  EXPECT_EQ(NSXPCConnection::connectionWithListenerEndpoint(passed, &error), nullptr);
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ECONNREFUSED)) << error.description();
}

TEST(NSXPCListener, aListeningSocketThatSomebodyElseMadeIsServed) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/activated";
  const int made = socket(AF_UNIX, SOCK_STREAM, 0);
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  ASSERT_EQ(bind(made, reinterpret_cast<const sockaddr *>(&address), sizeof address), 0);
  ASSERT_EQ(listen(made, 4), 0);
  const auto acceptor = std::make_shared<Acceptor>();
  const auto listener = resumed(NSXPCListener::listenerWithDescriptor(made), acceptor);
  EXPECT_TRUE(answers(hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr))));
  listener->invalidate();
  EXPECT_EQ(access(path.c_str(), F_OK), 0);  // it belongs to whoever made it
}

TEST(NSXPCListener, aRefusedPeerLosesItsConnection) {
  const auto acceptor = std::make_shared<Acceptor>(false);
  const auto listener = resumed(NSXPCListener::anonymousListener(nullptr), acceptor);
  EXPECT_FALSE(answers(
      hostConnection(NSXPCConnection::connectionWithListenerEndpoint(listener->endpoint(), nullptr))));
}

TEST(NSXPCListener, withoutADelegateEveryPeerIsRefused) {
  const auto listener = NSXPCListener::anonymousListener(nullptr);
  listener->resume();
  EXPECT_FALSE(answers(
      hostConnection(NSXPCConnection::connectionWithListenerEndpoint(listener->endpoint(), nullptr))));
}

TEST(NSXPCListener, anInvalidatedListenerRemovesItsSocketAndItsConnectionsLiveOn) {
  const TemporaryFolder folder;
  const std::string path = folder.path() + "/socket";
  const auto acceptor = std::make_shared<Acceptor>();
  const auto listener = resumed(NSXPCListener::listenerWithSocketPath(path, nullptr), acceptor);
  const auto connection = hostConnection(NSXPCConnection::connectionWithSocketPath(path, nullptr));
  EXPECT_TRUE(eventually([&] { return acceptor->asked() == 1; }));
  listener->invalidate();
  EXPECT_NE(access(path.c_str(), F_OK), 0);
  EXPECT_TRUE(answers(connection));
  const auto next = NSXPCListener::listenerWithSocketPath(path, nullptr);
  ASSERT_NE(next, nullptr);
  listener->invalidate();
  EXPECT_EQ(access(path.c_str(), F_OK), 0);  // the next listener's
}

TEST(NSXPCListener, aThousandClientsAreServedAtOnce) {
  rlimit limit = {};
  ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &limit), 0);
  limit.rlim_cur = limit.rlim_max;
  ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &limit), 0);
  // Each takes two sockets and two process descriptors here.
  const int clients = static_cast<int>(std::min<rlim_t>(1000, (limit.rlim_max - 100) / 4));
  const auto acceptor = std::make_shared<Acceptor>();
  const auto listener = resumed(NSXPCListener::anonymousListener(nullptr), acceptor);
  const std::size_t before = openDescriptors();
  std::vector<std::shared_ptr<NSXPCConnection>> connections;
  CallOutcomes outcomes;
  for (int client = 0; client < clients; ++client) {
    connections.push_back(
        hostConnection(NSXPCConnection::connectionWithListenerEndpoint(listener->endpoint(), nullptr)));
    outcomes.call(connections.back(), "");
  }
  EXPECT_TRUE(outcomes.waitForAll());
  EXPECT_EQ(outcomes.replies(), clients);
  for (const auto &connection : connections) connection->invalidate();
  connections.clear();
  EXPECT_TRUE(eventually([before] { return openDescriptors() <= before; }));
}

}  // namespace
}  // namespace droxa
