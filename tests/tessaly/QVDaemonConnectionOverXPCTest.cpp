#include <cerrno>
#include <gtest/gtest.h>
#include <optional>
#include <thread>
#include <vector>

#include "platform/foundation/NSNotificationCenter.h"
#include "platform/xpc/NSXPCListener.h"
#include "tessaly/QVDaemonConnectionOverXPC.h"
#include "tessaly/QVDaemonNotifications.h"
#include "tessaly/QVNotifications.h"
#include "tessaly/xpc/QVProtocolInterface.h"
#include "tests/support/FakeDaemon.h"
#include "tests/support/Once.h"
#include "tests/support/RecordingReceivers.h"
#include "tests/support/ScratchHome.h"

namespace droxa {

namespace {

// The fake daemon behind a socket, as the daemon's process offers it.
class ListeningDaemon final : public NSXPCListenerDelegate {
 public:
  static std::shared_ptr<ListeningDaemon> listen(const std::shared_ptr<FakeDaemon> &daemon) {
    auto server = std::make_shared<ListeningDaemon>(daemon);
    NSError error;
    server->listener_ = NSXPCListener::listenerWithSocketPath(DroxaProcessHome().daemonSocket(), &error);
    EXPECT_TRUE(server->listener_) << error.description();
    server->listener_->setDelegate(server);
    server->listener_->resume();
    return server;
  }
  explicit ListeningDaemon(std::shared_ptr<FakeDaemon> daemon) : daemon_(std::move(daemon)) {}
  ~ListeningDaemon() override { stop(); }

  // As when the daemon's process ends.
  void stop() {
    if (listener_) listener_->invalidate();
    dropConnections();
  }
  void dropConnections() {
    std::vector<std::shared_ptr<NSXPCConnection>> dropped;
    {
      const Lock lock(mutex_);
      dropped.swap(connections_);
    }
    for (const auto &connection : dropped) connection->invalidate();
  }
  std::size_t accepted() const {
    const Lock lock(mutex_);
    return accepted_;
  }

  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &,
                                         const std::shared_ptr<NSXPCConnection> &connection) override {
    connection->setExportedObject<QVProtocol>(QVProtocolInterface(), daemon_);
    {
      const Lock lock(mutex_);
      connections_.push_back(connection);
      ++accepted_;
    }
    connection->resume();
    return true;
  }

 private:
  const std::shared_ptr<FakeDaemon> daemon_;
  std::shared_ptr<NSXPCListener> listener_;
  mutable Mutex mutex_;
  std::vector<std::shared_ptr<NSXPCConnection>> connections_ GUARDED_BY(mutex_);
  std::size_t accepted_ GUARDED_BY(mutex_) = 0;
};

class DaemonConnectionOverXPC : public testing::Test {
 protected:
  // The rank, asked asynchronously; nullopt when the error handler was called instead.
  std::optional<std::uint64_t> askRank(NSError *failure = nullptr) {
    Once<std::optional<std::uint64_t>, NSError> answer("rank or error");
    connection_
        ->remoteObjectProxyWithErrorHandler(
            [done = answer.completion()](const NSError &error) { done(std::nullopt, error); })
        ->currentNotifRankWithReply(
            [done = answer.completion()](std::uint64_t rank, const NSError &error) { done(rank, error); });
    if (failure) *failure = answer.value<1>();
    return answer.value<0>();
  }

  const ScratchHome home_;
  const std::shared_ptr<FakeDaemon> daemon_ = FakeDaemon::make();
  const std::shared_ptr<QVDaemonConnectionOverXPC> connection_ =
      std::make_shared<QVDaemonConnectionOverXPC>(DroxaProcessHome().daemonSocket());
};

}  // namespace

TEST_F(DaemonConnectionOverXPC, itConnectsAtTheFirstCallAndStaysConnected) {
  const auto server = ListeningDaemon::listen(daemon_);
  EXPECT_EQ(server->accepted(), 0U);
  EXPECT_EQ(askRank(), daemon_->rank());
  EXPECT_EQ(askRank(), daemon_->rank());
  EXPECT_EQ(server->accepted(), 1U);
}

TEST_F(DaemonConnectionOverXPC, theSyncProxyAnswersOnTheCallingThread) {
  const auto server = ListeningDaemon::listen(daemon_);
  const auto proxy = connection_->newSyncProxy();
  std::thread::id ranOn;
  (*proxy)->currentNotifRankWithReply([&](std::uint64_t rank, const NSError &error) {
    ranOn = std::this_thread::get_id();
    proxy->setObjResult(rank, error);
  });
  EXPECT_EQ(ranOn, std::this_thread::get_id());
  EXPECT_EQ(proxy->result<std::uint64_t>(), daemon_->rank());
}

TEST_F(DaemonConnectionOverXPC, withoutADaemonEachCallFailsOnThePool) {
  Once<NSError, std::thread::id> failed("error handler");
  connection_
      ->remoteObjectProxyWithErrorHandler(
          [done = failed.completion()](const NSError &error) { done(error, std::this_thread::get_id()); })
      ->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_TRUE(failed.value<0>().is(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  EXPECT_TRUE(failed.value<0>().underlyingError().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_NE(failed.value<1>(), std::this_thread::get_id());
}

TEST_F(DaemonConnectionOverXPC, withoutADaemonASyncCallStoresTheError) {
  const auto proxy = connection_->newSyncProxy();
  (*proxy)->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  EXPECT_TRUE(proxy->error().is(NSCocoaErrorDomain, NSXPCConnectionInvalid));
}

TEST_F(DaemonConnectionOverXPC, aDaemonThatComesLaterIsReached) {
  EXPECT_EQ(askRank(), std::nullopt);
  const auto server = ListeningDaemon::listen(daemon_);
  EXPECT_EQ(askRank(), daemon_->rank());
}

TEST_F(DaemonConnectionOverXPC, aCallUnderWayFailsWhenTheDaemonGoesAndTheNextReachesItsSuccessor) {
  auto server = ListeningDaemon::listen(daemon_);
  daemon_->replies().hold("getStatus");
  Once<NSError> failed("error handler");
  connection_->remoteObjectProxyWithErrorHandler(failed.completion())
      ->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  ASSERT_TRUE(daemon_->log().waitFor("getStatus()"));
  server->stop();
  EXPECT_TRUE(failed.value<0>().is(NSCocoaErrorDomain, NSXPCConnectionInterrupted))
      << failed.value<0>().description();
  server = ListeningDaemon::listen(daemon_);
  EXPECT_TRUE(eventually([&] { return askRank() == daemon_->rank(); }));
  daemon_->replies().release("getStatus");
}

TEST_F(DaemonConnectionOverXPC, aSyncCallUnderWayStoresTheErrorWhenTheDaemonGoes) {
  const auto server = ListeningDaemon::listen(daemon_);
  daemon_->replies().hold("getStatus");
  const auto proxy = connection_->newSyncProxy();
  std::thread ending([&] {
    EXPECT_TRUE(daemon_->log().waitFor("getStatus()"));
    server->dropConnections();
  });
  (*proxy)->getStatus([](const auto &, const NSError &) { ADD_FAILURE() << "the reply ran"; });
  ending.join();
  EXPECT_TRUE(proxy->error().is(NSCocoaErrorDomain, NSXPCConnectionInterrupted))
      << proxy->error().description();
  daemon_->replies().release("getStatus");
}

TEST_F(DaemonConnectionOverXPC, theLossIsToldOnce) {
  const auto server = ListeningDaemon::listen(daemon_);
  CallLog told;
  connection_->setInterruptionHandler([&told] { told.add("lost"); });
  ASSERT_TRUE(askRank());
  server->dropConnections();
  ASSERT_TRUE(told.waitFor("lost"));
  ASSERT_TRUE(askRank());
  EXPECT_EQ(told.calls().size(), 1U);
  server->dropConnections();
  EXPECT_TRUE(told.waitFor("lost", 2));
  connection_->setInterruptionHandler(nullptr);
}

TEST_F(DaemonConnectionOverXPC, aReceiverIsPushedWhatTheDaemonSees) {
  const auto server = ListeningDaemon::listen(daemon_);
  const auto receiver = std::make_shared<RecordingReceiver>();
  const auto refuse = [](const NSError &error) { ADD_FAILURE() << error.description(); };
  Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
      "sender");
  connection_->remoteObjectProxyWithErrorHandler(refuse)->getItemUpdateSenderWithReceiver(
      receiver, answer.completion());
  const auto sender = answer.value<0>();
  ASSERT_TRUE(sender);
  Once<NSError> gathered("watch");
  sender->remoteObjectProxyWithErrorHandler(refuse)->watchItemAtURL(daemon_->url(""), 19,
                                                                    gathered.completion());
  ASSERT_EQ(gathered.value<0>(), NSError());
  daemon_->addDocument("pushed");
  EXPECT_TRUE(receiver->waitForUpdateOfName("pushed"));
  sender->invalidate();
  EXPECT_TRUE(eventually([&] { return daemon_->liveSenders() == 0; }));
}

TEST_F(DaemonConnectionOverXPC, notificationsGoOnAfterTheDaemonWasStartedAnew) {
  auto server = ListeningDaemon::listen(daemon_);
  CallLog posts;
  for (const char *name : {QVAccountTokenDidChangeNotification, QVContainerListDidChangeNotification})
    NSNotificationCenter::defaultCenter().addObserver(
        &posts, [&posts, name] { posts.add(name); }, name);
  const auto notifications = std::make_shared<QVDaemonNotifications>();
  notifications->subscribeIfNeeded(connection_);
  ASSERT_TRUE(eventually([&] { return daemon_->subscribers() == 1; }));
  daemon_->notify(QVAccountTokenDidChangeNotification);
  ASSERT_TRUE(posts.waitFor(QVAccountTokenDidChangeNotification));
  ASSERT_TRUE(eventually([&] { return daemon_->notificationsReplied() == 1; }));
  daemon_->forgetSubscribers();
  server->stop();
  server = ListeningDaemon::listen(daemon_);
  EXPECT_TRUE(posts.waitFor(QVAccountTokenDidChangeNotification, 2));
  EXPECT_TRUE(posts.waitFor(QVContainerListDidChangeNotification, 1));
  EXPECT_EQ(daemon_->subscribers(), 1U);
  NSNotificationCenter::defaultCenter().removeObserver(&posts);
}

}  // namespace droxa
