#include <atomic>
#include <cerrno>
#include <gtest/gtest.h>
#include <sys/socket.h>

#include "extension/HostConnection.h"
#include "extension/HostedExtension.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

// The host's exported object: keeps the signals and answers with what the test put there.
class RecordingHost final : public NSFileProviderHostProtocol {
 public:
  void signalEnumerator(const std::string &containerIdentifier,
                        NSFileProviderErrorCompletion completion) override {
    signalled = containerIdentifier;
    completion(answer);
  }
  std::string signalled;
  NSError answer;
};

class HostConnectionTest : public testing::Test {
 protected:
  HostConnectionTest() {
    int sockets[2];
    EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets), 0);
    connection = std::make_shared<HostConnection>(sockets[0], std::make_shared<HostedExtension>(principal),
                                                  [ended = ended] { ++*ended; });
    hostEnd = NSXPCConnection::connectionWithDescriptor(sockets[1]);
    hostEnd->setExportedObject<NSFileProviderHostProtocol>(NSFileProviderHostInterface(), host);
    hostEnd->setRemoteObjectInterface(NSFileProviderExtensionInterface());
    connection->resume();
    hostEnd->resume();
  }
  ~HostConnectionTest() override { hostEnd->invalidate(); }

  std::shared_ptr<NSFileProviderExtensionProtocol> extension() {
    return hostEnd->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
        [](const NSError &error) { ADD_FAILURE() << error.description(); });
  }
  NSError signalRoot() {
    const Once<NSError> completion("signal");
    connection->signalEnumeratorForContainerItemIdentifier(NSFileProviderRootContainerItemIdentifier,
                                                           completion.completion());
    return completion.value<0>();
  }

  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  const std::shared_ptr<RecordingHost> host = std::make_shared<RecordingHost>();
  const std::shared_ptr<std::atomic<int>> ended = std::make_shared<std::atomic<int>>(0);
  std::shared_ptr<HostConnection> connection;
  std::shared_ptr<NSXPCConnection> hostEnd;
};

TEST_F(HostConnectionTest, requestsReachThePrincipal) {
  principal->item = plainItem("d1");
  const Once<std::shared_ptr<const NSFileProviderItem>, NSError> item("item");
  extension()->itemForIdentifier("d1", item.completion());
  ASSERT_TRUE(item.value<0>());
  EXPECT_EQ(item.value<0>()->itemIdentifier(), "d1");
}

TEST_F(HostConnectionTest, anEnumeratorLivesUntilTheHostReleasesIt) {
  const auto inner = std::make_shared<ScriptedEnumerator>();
  inner->listing = [](auto observer, const NSData &) {
    observer->didEnumerateItems({plainItem("d1")});
    observer->finishEnumeratingUpToPage({});
  };
  principal->enumerator = inner;
  {
    const Once<std::shared_ptr<NSFileProviderRemoteEnumerator>, NSError> enumerator("enumerator");
    extension()->enumeratorForContainer("i1", enumerator.completion());
    const auto remote = enumerator.value<0>();
    ASSERT_TRUE(remote);
    const Once<NSFileProviderItems, NSData, NSError> page("page");
    remote->enumerateItems({}, page.completion());
    EXPECT_EQ(identifiersOf(page.value<0>()), std::vector<std::string>{"d1"});
    EXPECT_EQ(inner->invalidations, 0);
  }
  EXPECT_TRUE(eventually([&] { return inner->invalidations == 1; }));
}

TEST_F(HostConnectionTest, signalsReachTheHost) {
  EXPECT_FALSE(signalRoot());
  EXPECT_EQ(host->signalled, NSFileProviderRootContainerItemIdentifier);
}

TEST_F(HostConnectionTest, aSignalIsAnsweredWithTheHostsError) {
  host->answer = NSError(NSPOSIXErrorDomain, EBUSY);
  EXPECT_EQ(signalRoot(), host->answer);
}

TEST_F(HostConnectionTest, theEndOfTheHostIsToldOnce) {
  EXPECT_FALSE(signalRoot());
  hostEnd->invalidate();
  EXPECT_TRUE(eventually([&] { return *ended == 1; }));
  EXPECT_EQ(signalRoot().domain(), NSCocoaErrorDomain) << "a signal to nobody is answered with an error";
  connection.reset();
  EXPECT_EQ(*ended, 1);
}

TEST_F(HostConnectionTest, theEndOfTheHostInvalidatesItsEnumerators) {
  const auto inner = std::make_shared<ScriptedEnumerator>();
  principal->enumerator = inner;
  const Once<std::shared_ptr<NSFileProviderRemoteEnumerator>, NSError> enumerator("enumerator");
  extension()->enumeratorForContainer("i1", enumerator.completion());
  ASSERT_TRUE(enumerator.value<0>());
  hostEnd->invalidate();
  EXPECT_TRUE(eventually([&] { return inner->invalidations == 1; }));
}

}  // namespace
}  // namespace droxa
