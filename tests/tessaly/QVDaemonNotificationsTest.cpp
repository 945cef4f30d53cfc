#include <gtest/gtest.h>
#include <mutex>

#include "platform/foundation/NSNotificationCenter.h"
#include "tessaly/QVDaemonNotifications.h"
#include "tessaly/QVNotifications.h"
#include "tests/support/FakeDaemonConnection.h"

namespace droxa {

namespace {

const NSError kGone(NSCocoaErrorDomain, NSXPCConnectionInterrupted);

// Writes down what is posted.
class Posts {
 public:
  Posts() {
    for (const char *name : {QVAccountTokenDidChangeNotification, QVContainerListDidChangeNotification})
      NSNotificationCenter::defaultCenter().addObserver(
          this, [this, name] { posts_.add(name); }, name);
  }
  ~Posts() { NSNotificationCenter::defaultCenter().removeObserver(this); }
  CallLog &log() { return posts_; }

 private:
  CallLog posts_;
};

class DaemonNotifications : public testing::Test {
 protected:
  void subscribe() { notifications_->subscribeIfNeeded(scope_.connection); }
  const FakeDaemonScope scope_;
  FakeDaemon &daemon_ = *scope_.daemon;
  Posts posts_;
  const std::shared_ptr<QVDaemonNotifications> notifications_ = std::make_shared<QVDaemonNotifications>();
};

}  // namespace

TEST_F(DaemonNotifications, whatTheDaemonTellsIsPosted) {
  subscribe();
  EXPECT_TRUE(posts_.log().calls().empty());
  daemon_.notify(QVAccountTokenDidChangeNotification);
  daemon_.notify(QVContainerListDidChangeNotification);
  EXPECT_EQ(posts_.log().calls(), std::vector<std::string>({QVAccountTokenDidChangeNotification,
                                                            QVContainerListDidChangeNotification}));
}

TEST_F(DaemonNotifications, aDaemonThatWasGoneIsSubscribedToAgainAndBothArePosted) {
  subscribe();
  scope_.connection->loseDaemon(kGone);
  ASSERT_TRUE(daemon_.log().waitFor("subscribeToNotifications", 2));
  ASSERT_TRUE(posts_.log().waitFor(QVContainerListDidChangeNotification));
  EXPECT_EQ(posts_.log().calls(), std::vector<std::string>({QVAccountTokenDidChangeNotification,
                                                            QVContainerListDidChangeNotification}));
  EXPECT_EQ(daemon_.subscribers(), 1U);
}

TEST_F(DaemonNotifications, itTriesAgainUntilTheDaemonIsThere) {
  scope_.connection->setUnreachable(kGone);
  subscribe();
  ASSERT_TRUE(daemon_.log().waitFor("subscribeToNotifications failed in transport", 3));
  EXPECT_TRUE(posts_.log().calls().empty());
  scope_.connection->setUnreachable(NSError());
  ASSERT_TRUE(posts_.log().waitFor(QVContainerListDidChangeNotification));
  EXPECT_EQ(daemon_.subscribers(), 1U);
  daemon_.notify(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(posts_.log().count(QVAccountTokenDidChangeNotification), 2U);
}

TEST_F(DaemonNotifications, aRefusalIsTriedAgain) {
  daemon_.replies().failNext("subscribeToNotifications", qvc_error(QVErrorShuttingDown, "going down"));
  subscribe();
  ASSERT_TRUE(daemon_.log().waitFor("subscribeToNotifications()", 2));
  ASSERT_TRUE(posts_.log().waitFor(QVContainerListDidChangeNotification));
}

TEST_F(DaemonNotifications, oneLossIsOneNewSubscription) {
  daemon_.replies().hold("subscribeToNotifications");
  subscribe();
  scope_.connection->loseDaemon(kGone);  // both the call's error handler and the connection's handler
  daemon_.replies().release("subscribeToNotifications");
  ASSERT_TRUE(posts_.log().waitFor(QVContainerListDidChangeNotification));
  EXPECT_EQ(daemon_.log().count("subscribeToNotifications"), 2U);
  EXPECT_EQ(posts_.log().count(QVAccountTokenDidChangeNotification), 1U);
}

TEST_F(DaemonNotifications, whatAnOlderSubscriptionStillTellsIsIgnored) {
  subscribe();
  scope_.connection->breakOff(kGone);
  const FakeDaemonScope other;
  notifications_->subscribeIfNeeded(other.connection);
  daemon_.notify(QVAccountTokenDidChangeNotification);
  EXPECT_TRUE(posts_.log().calls().empty());
  other.daemon->notify(QVAccountTokenDidChangeNotification);
  EXPECT_EQ(posts_.log().calls().size(), 1U);
}

TEST_F(DaemonNotifications, subscribingTwiceToOneConnectionIsSubscribingOnce) {
  subscribe();
  subscribe();
  EXPECT_EQ(daemon_.log().count("subscribeToNotifications"), 1U);
}

}  // namespace droxa
