#include <gtest/gtest.h>
#include <thread>

#include "platform/foundation/NSNotificationCenter.h"
#include "platform/oslog/os_log.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVNotifications.h"
#include "tests/support/FakeDaemonConnection.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

class Container : public testing::Test {
 protected:
  const ScratchHome home_;
  FakeDaemonScope scope_;
  FakeDaemon &daemon_ = *scope_.daemon;
};

using ContainerCache = Container;

void postListChange() {
  NSNotificationCenter::defaultCenter().postNotificationName(QVContainerListDidChangeNotification);
}

}  // namespace

TEST_F(Container, theListIsTheDaemons) {
  const auto containers = QVContainer::allContainersByContainerID();
  ASSERT_EQ(containers.size(), 4U);
  const auto root = containers.at(QVUbiquitousDefaultContainerID);
  EXPECT_EQ(root->containerID(), QVUbiquitousDefaultContainerID);
  EXPECT_EQ(root->url().path(), home_.replica() + "/com.quorva.Tessaly.default");
  EXPECT_EQ(root->documentsURL().path(), home_.replica() + "/com.quorva.Tessaly.default/Documents");
  EXPECT_EQ(QVContainer::allContainers().size(), 4U);
}

TEST_F(Container, theListIsAskedForOnce) {
  QVContainer::allContainers();
  QVContainer::allContainersByContainerID();
  QVContainer::allContainers();
  EXPECT_EQ(daemon_.calls(), std::vector<std::string>({"getContainers()"}));
}

TEST_F(Container, afterAChangeOfTheListItIsAskedForAgain) {
  QVContainer::allContainers();
  daemon_.addContainer("org.example.New");
  EXPECT_EQ(QVContainer::allContainers().size(), 4U);
  postListChange();
  EXPECT_EQ(QVContainer::allContainersByContainerID().count("org.example.New"), 1U);
  EXPECT_EQ(daemon_.log().count("getContainers()"), 2U);
}

TEST_F(Container, anObserverOfTheChangeSeesTheNewList) {
  QVContainer::allContainers();
  std::size_t seen = 0;
  NSNotificationCenter::defaultCenter().addObserver(
      &seen, [&seen] { seen = QVContainer::allContainers().size(); }, QVContainerListDidChangeNotification);
  daemon_.addContainer("org.example.New");
  postListChange();
  NSNotificationCenter::defaultCenter().removeObserver(&seen);
  EXPECT_EQ(seen, 5U);
}

TEST_F(Container, withoutADaemonTheListIsWhatIsKnown) {
  const OSLogCapture capture;
  const NSError gone(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  scope_.connection->setUnreachable(gone);
  EXPECT_TRUE(QVContainer::allContainers().empty());
  EXPECT_TRUE(capture.contains("[ERROR] can't get the containers: " + gone.description()));
  scope_.connection->setUnreachable(NSError());
  EXPECT_EQ(QVContainer::allContainers().size(), 4U);
  scope_.connection->setUnreachable(gone);
  postListChange();
  EXPECT_EQ(QVContainer::allContainers().size(), 4U);
}

TEST_F(Container, aRefusalOfTheDaemonLeavesTheKnownListToo) {
  QVContainer::allContainers();
  postListChange();
  daemon_.replies().failNext("getContainers", qvc_error(QVErrorDatabase, "damaged"));
  EXPECT_EQ(QVContainer::allContainers().size(), 4U);
}

TEST_F(Container, aChangeWhileTheListIsFetchedIsNotMissed) {
  daemon_.replies().hold("getContainers");
  std::thread first([] { QVContainer::allContainers(); });
  ASSERT_TRUE(daemon_.log().waitFor("getContainers()"));
  ASSERT_TRUE(eventually([&] { return daemon_.replies().heldCount("getContainers") == 1; }));
  daemon_.addContainer("org.example.New");
  postListChange();
  daemon_.replies().release("getContainers");
  first.join();
  EXPECT_EQ(QVContainer::allContainersByContainerID().count("org.example.New"), 1U);
}

TEST_F(Container, manyThreadsMayAskWhileTheListChanges) {
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i)
    threads.emplace_back([] {
      for (int n = 0; n < 100; ++n) EXPECT_EQ(QVContainer::allContainers().size(), 4U);
    });
  for (int n = 0; n < 100; ++n) postListChange();
  for (std::thread &thread : threads) thread.join();
}

TEST_F(ContainerCache, aProviderIsNotManagedUnlessItsFileSaysSo) {
  EXPECT_FALSE(QVContainerCache::isManagedProvider());
  QVContainerCache::forget();
  home_.write("config/provider.json", R"({"managed": true})");
  EXPECT_TRUE(QVContainerCache::isManagedProvider());
}

TEST_F(ContainerCache, theFileIsReadOnce) {
  home_.write("config/provider.json", R"({"managed": true})");
  EXPECT_TRUE(QVContainerCache::isManagedProvider());
  home_.write("config/provider.json", R"({"managed": false})");
  EXPECT_TRUE(QVContainerCache::isManagedProvider());
}

TEST_F(ContainerCache, aBadFileIsReportedAndNotManaged) {
  const OSLogCapture capture;
  const std::string path = home_.write("config/provider.json", "managed");
  EXPECT_FALSE(QVContainerCache::isManagedProvider());
  EXPECT_TRUE(
      capture.contains("[WARNING] " + path + ": isn't a JSON object; the provider counts as not managed"));
}

TEST_F(ContainerCache, aBadValueIsReportedAndNotManaged) {
  const OSLogCapture capture;
  const std::string path = home_.write("config/provider.json", R"({"managed": "yes"})");
  EXPECT_FALSE(QVContainerCache::isManagedProvider());
  EXPECT_TRUE(capture.contains("[WARNING] " + path + ": managed must be true or false; false is used"));
}

}  // namespace droxa
