#include <algorithm>
#include <gtest/gtest.h>

#include "sharing/QVFileProviderServiceSource.h"
#include "tests/sharing/SharingFixture.h"

namespace droxa {
namespace {

constexpr char kInvalidated[] = "debug: [DEBUG] share service source connection invalidated";
constexpr char kInterrupted[] = "debug: [DEBUG] share service source connection interrupted";

class QVFileProviderServiceSourceTest : public SharingTest {
 protected:
  static NSXPCListenerEndpoint makeEndpoint(QVFileProviderServiceSource &source) {
    NSError untouched("Domain", 1);
    const auto endpoint = source.makeListenerEndpointAndReturnError(&untouched);
    EXPECT_TRUE(endpoint.has_value());
    EXPECT_TRUE(untouched.is("Domain", 1));
    return endpoint ? *endpoint : NSXPCListenerEndpoint(-1);
  }
  static bool canConnect(const NSXPCListenerEndpoint &endpoint) {
    NSError error;
    const auto connection = NSXPCConnection::connectionWithListenerEndpoint(endpoint, &error);
    if (!connection) return false;
    connection->setRemoteObjectInterface(QVCXPCSharingOperationInterface());
    connection->resume();
    std::atomic<int> outcome{0};
    proxyOf(connection, [&outcome](const NSError &) {
      outcome = 2;
    })->createSharingInfoForURL(NSURL(), [&outcome](const auto &, const auto &) { outcome = 1; });
    EXPECT_TRUE(eventually([&outcome] { return outcome != 0; }));
    connection->invalidate();
    return outcome == 1;
  }
};

TEST_F(QVFileProviderServiceSourceTest, itsServiceHasItsName) {
  EXPECT_EQ(makeSource()->serviceName(), "com.quorva.Tessaly.private.SharingOperation");
}

TEST_F(QVFileProviderServiceSourceTest, eachEndpointIsAListenerOfItsOwnUntilAClientConnects) {
  const auto source = makeSource();
  EXPECT_TRUE(source->listeners().empty());
  const NSXPCListenerEndpoint first = makeEndpoint(*source);
  const auto firstListener = source->listeners().at(0);
  const NSXPCListenerEndpoint second = makeEndpoint(*source);
  EXPECT_NE(first.descriptor(), second.descriptor());
  ASSERT_EQ(source->listeners().size(), 2U);

  const auto client = connect(first);
  finish(*proxyOf(client), "createSharingInfoForURL");
  ASSERT_EQ(source->listeners().size(), 1U);
  EXPECT_NE(source->listeners().at(0), firstListener);
  EXPECT_TRUE(canConnect(second));
  EXPECT_TRUE(source->listeners().empty());
  client->invalidate();
}

TEST_F(QVFileProviderServiceSourceTest,
       theEndOfAConnectionIsToldAsInterruptedThenInvalidatedAndEndsTheListener) {
  const auto source = makeSource();
  const NSXPCListenerEndpoint endpoint = makeEndpoint(*source);
  const std::weak_ptr<NSXPCListener> listener = source->listeners().at(0);
  const auto client = connect(endpoint);
  finish(*proxyOf(client), "createSharingInfoForURL");
  EXPECT_FALSE(listener.expired()) << "the connection keeps it";
  capture.clear();
  client->invalidate();
  ASSERT_TRUE(eventually([this] { return logged(kInvalidated) == 1; }));
  const auto lines = logLines(capture);
  const auto interrupted = std::find(lines.begin(), lines.end(), kInterrupted);
  ASSERT_NE(interrupted, lines.end());
  EXPECT_LT(interrupted - lines.begin(), std::find(lines.begin(), lines.end(), kInvalidated) - lines.begin());
  EXPECT_TRUE(eventually([&listener] { return listener.expired(); }));
  EXPECT_FALSE(canConnect(endpoint));
  EXPECT_EQ(logged(kInterrupted), 1U);
  EXPECT_EQ(logged(kInvalidated), 1U);
}

TEST_F(QVFileProviderServiceSourceTest, aListenerGoesOnForASecondClientWhileTheFirstIsThere) {
  const auto source = makeSource();
  const NSXPCListenerEndpoint endpoint = makeEndpoint(*source);
  const auto first = connect(endpoint);
  finish(*proxyOf(first), "createSharingInfoForURL");
  EXPECT_TRUE(canConnect(endpoint));
  first->invalidate();
}

TEST_F(QVFileProviderServiceSourceTest, connectionsOutliveTheirSource) {
  entitleThisProcess(kAllEntitlements);
  auto source = makeSource();
  const std::weak_ptr<QVFileProviderServiceSource> released = source;
  const NSXPCListenerEndpoint endpoint = makeEndpoint(*source);
  const NSXPCListenerEndpoint unused = makeEndpoint(*source);
  const auto client = connect(endpoint);
  EXPECT_FALSE(finish(*proxyOf(client), "createSharingInfoForURL"));
  source = nullptr;
  EXPECT_TRUE(eventually([&released] { return released.expired(); }));
  EXPECT_FALSE(finish(*proxyOf(client), "startOperation_toSaveSharingInfo"));
  EXPECT_FALSE(canConnect(unused)) << "a listener that nobody connected to goes with its source";
  client->invalidate();
}

TEST_F(QVFileProviderServiceSourceTest, eachConnectionHasItsOwnPrivilegesFromWhenItWasMade) {
  const auto source = makeSource();
  const NSXPCListenerEndpoint endpoint = makeEndpoint(*source);
  const auto before = connect(endpoint);
  EXPECT_EQ(finish(*proxyOf(before), "createSharingInfoForURL").code(), 26);
  entitleThisProcess({QVSharingProxyEntitlement});
  EXPECT_EQ(finish(*proxyOf(before), "createSharingInfoForURL").code(), 26);
  const auto after = connect(endpoint);
  EXPECT_FALSE(finish(*proxyOf(after), "createSharingInfoForURL"));
  EXPECT_EQ(finish(*proxyOf(after), "copyCurrentUserNameAndDisplayHandleWithReply").code(), 26);
  before->invalidate();
  after->invalidate();
}

}  // namespace
}  // namespace droxa
