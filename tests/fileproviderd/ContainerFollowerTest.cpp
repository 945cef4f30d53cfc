#include <gtest/gtest.h>

#include "fileproviderd/ContainerFollower.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

using namespace std::chrono_literals;

const NSError kExpired(NSFileProviderErrorDomain, NSFileProviderErrorSyncAnchorExpired);
const NSError kSignedOut(NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated);

class ContainerFollowerTest : public ::testing::Test {
 protected:
  ~ContainerFollowerTest() override {
    if (follower) follower->close();
  }

  void follow(std::uint64_t room = 100, FollowerTiming timing = {1ms, 10ms}) {
    budget = std::make_shared<ItemBudget>(room);
    follower = ContainerFollower::create(
        "i1", std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension)), budget,
        timing);
  }
  void watch() {
    follower->addWatcher(std::make_shared<Watcher>("i1", observer),
                         [this](const NSError &error) { ready.put(error ? error.description() : "ready"); });
  }
  std::shared_ptr<ScriptedEnumerator> nextEnumerator() {
    auto enumerator = extension->enumerators.take();
    EXPECT_TRUE(enumerator);
    return enumerator ? enumerator : std::make_shared<ScriptedEnumerator>();
  }
  // Followed and idle, with these items known.
  std::shared_ptr<ScriptedEnumerator> followItems(const NSFileProviderItems &items,
                                                  std::uint64_t room = 100) {
    follow(room);
    watch();
    auto enumerator = nextEnumerator();
    enumerator->answerFirstListing(items);
    EXPECT_EQ(ready.take(), "ready");
    return enumerator;
  }
  void waitForQueue() {
    dispatch_sync(follower->queue(), [] {});
  }

  std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  std::shared_ptr<RecordingObserver> observer = std::make_shared<RecordingObserver>();
  std::shared_ptr<ItemBudget> budget;
  std::shared_ptr<ContainerFollower> follower;
  Arrivals<std::string> ready;
};

TEST_F(ContainerFollowerTest, theAnchorIsTakenBeforeTheFirstPage) {
  followItems({document(1, "a")});
  EXPECT_EQ(budget->used(), 1U);
  EXPECT_EQ(observer->changes.size(), 0U);
}

TEST_F(ContainerFollowerTest, aSignalIsFollowedFromTheLastAnchor) {
  auto enumerator = followItems({document(1, "a")});
  follower->signal();
  enumerator->answerChanges("A", {document(2, "b"), document(1, "a", 2)}, {}, "B");
  EXPECT_EQ(observer->next(), "added b");
  EXPECT_EQ(observer->next(), "changed a");
  follower->signal();
  enumerator->answerChanges("B", {document(2, "c", 3)}, {"d1"}, "C");
  EXPECT_EQ(observer->next(), "removed a");
  EXPECT_EQ(observer->next(), "renamed b -> c");
}

TEST_F(ContainerFollowerTest, moreComingIsDrained) {
  auto enumerator = followItems({});
  follower->signal();
  enumerator->answerChanges("A", {document(1, "a")}, {}, "B", true);
  enumerator->answerChanges("B", {document(2, "b")}, {}, "C", true);
  enumerator->answerChanges("C", {}, {}, "C");
  EXPECT_EQ(observer->next(), "added a");
  EXPECT_EQ(observer->next(), "added b");
}

TEST_F(ContainerFollowerTest, moreComingWithoutAStepAheadEnds) {
  auto enumerator = followItems({});
  follower->signal();
  enumerator->answerChanges("A", {}, {}, "A", true);
  waitForQueue();
  EXPECT_EQ(enumerator->calls.size(), 0U);
}

TEST_F(ContainerFollowerTest, aSignalDuringAChangeRequestMakesOneMoreRound) {
  auto enumerator = followItems({});
  follower->signal();
  const EnumeratorCall first = enumerator->expect("changes A");
  follower->signal();
  follower->signal();
  waitForQueue();
  first.changes({document(1, "a")}, {}, NSData::dataWithString("B"), false, NSError());
  enumerator->answerChanges("B", {document(2, "b")}, {}, "C");
  EXPECT_EQ(observer->next(), "added a");
  EXPECT_EQ(observer->next(), "added b");
  waitForQueue();
  EXPECT_EQ(enumerator->calls.size(), 0U);
}

TEST_F(ContainerFollowerTest, aSignalDuringTheListingIsFollowedBetweenItsPages) {
  follow();
  watch();
  auto enumerator = nextEnumerator();
  enumerator->answerAnchor("A");
  const EnumeratorCall page = enumerator->expect("items first");
  follower->signal();
  waitForQueue();
  page.page({document(1, "a")}, NSData::dataWithString("next"), NSError());
  EXPECT_EQ(ready.take(), "ready");
  enumerator->answerChanges("A", {document(1, "a2", 5)}, {"d9"}, "B");
  EXPECT_EQ(observer->next(), "removed ");
  EXPECT_EQ(observer->next(), "renamed a -> a2");
  // The second page still has an older state of it, which doesn't count.
  enumerator->answerPage("next", {document(1, "a"), document(2, "b")});
  enumerator->answerChanges("B", {}, {}, "B");
  follower->signal();
  enumerator->answerChanges("B", {document(1, "a3", 6)}, {}, "C");
  EXPECT_EQ(observer->next(), "renamed a2 -> a3");
}

TEST_F(ContainerFollowerTest, anExpiredAnchorRelistsAndTellsTheDifference) {
  auto enumerator = followItems({document(1, "a"), document(2, "b"), document(3, "c")});
  follower->signal();
  enumerator->failChanges("A", kExpired);
  enumerator->answerAnchor("A2");
  enumerator->answerPage("first", {document(1, "a")}, "next");
  enumerator->answerPage("next", {document(2, "renamed", 5), document(4, "d")});
  enumerator->answerChanges("A2", {}, {}, "A2");
  std::vector<std::string> told{observer->next(), observer->next(), observer->next()};
  std::sort(told.begin() + 1, told.end());
  EXPECT_EQ(told, (std::vector<std::string>{"removed c", "added d", "renamed b -> renamed"}));
  EXPECT_EQ(budget->used(), 3U);
}

TEST_F(ContainerFollowerTest, aChangeDuringASecondListingIsToldOnce) {
  auto enumerator = followItems({document(1, "a")});
  follower->signal();
  enumerator->failChanges("A", kExpired);
  enumerator->answerAnchor("A2");
  const EnumeratorCall page = enumerator->expect("items first");
  follower->signal();
  waitForQueue();
  page.page({document(1, "a")}, NSData::dataWithString("next"), NSError());
  enumerator->answerChanges("A2", {document(2, "b")}, {}, "B");
  enumerator->answerPage("next", {document(2, "b")});
  enumerator->answerChanges("B", {}, {}, "B");
  EXPECT_EQ(observer->next(), "added b");
  waitForQueue();
  EXPECT_EQ(observer->changes.size(), 0U);
}

TEST_F(ContainerFollowerTest, theExtensionsEndInTheMiddleOfAListingStartsItAnew) {
  follow();
  watch();
  auto first = nextEnumerator();
  first->answerAnchor("A");
  first->answerPage("first", {document(1, "a")}, "next");
  EXPECT_EQ(ready.take(), "ready");
  first->failPage("next", connectionInterrupted());
  auto second = nextEnumerator();
  second->answerFirstListing({document(1, "a"), document(2, "b")});
  follower->signal();
  second->answerChanges("A", {document(3, "c")}, {}, "B");
  EXPECT_EQ(observer->next(), "relisted");  // there was no whole listing to compare with
  EXPECT_EQ(observer->next(), "added c");
}

TEST_F(ContainerFollowerTest, aNewExtensionIsAskedForTheDifference) {
  followItems({document(1, "a")});
  follower->extensionEnded();
  auto second = nextEnumerator();
  second->answerFirstListing({document(1, "a"), document(2, "b")});
  EXPECT_EQ(observer->next(), "added b");
}

TEST_F(ContainerFollowerTest, aContainerLargerThanTheRoomIsToldAsRelisted) {
  auto enumerator = followItems({document(1, "a"), document(2, "b"), document(3, "c")}, 2);
  EXPECT_EQ(budget->used(), 0U);
  follower->signal();
  enumerator->answerChanges("A", {document(7, "new")}, {"d1"}, "B");
  EXPECT_EQ(observer->next(), "removed ");
  EXPECT_EQ(observer->next(), "changed new");
  follower->signal();
  enumerator->failChanges("B", kExpired);
  enumerator->answerAnchor("A2");
  enumerator->answerPage("first", {document(1, "a"), document(2, "b"), document(3, "c")}, "next");
  enumerator->answerChanges("A2", {}, {}, "A2");
  EXPECT_EQ(observer->next(), "relisted");
}

TEST_F(ContainerFollowerTest, anUnlistableContainerAnswersTheWatcherWithTheError) {
  extension->failure = kSignedOut;
  follow();
  watch();
  EXPECT_EQ(ready.take(), kSignedOut.description());
}

TEST_F(ContainerFollowerTest, aFailedRelistingIsToldOnceAndTriedAgain) {
  auto enumerator = followItems({document(1, "a")});
  extension->openFailures.assign(3, kSignedOut);
  follower->signal();
  enumerator->failChanges("A", kSignedOut);
  EXPECT_EQ(observer->next(), "relisted");
  auto second = nextEnumerator();  // after three refusals
  second->answerFirstListing({document(2, "b")});
  EXPECT_EQ(observer->next(), "removed a");
  EXPECT_EQ(observer->next(), "added b");
}

TEST_F(ContainerFollowerTest, aSignalCutsTheWaitForTheNextAttemptShort) {
  follow(100, {1h, 1h});
  watch();
  auto enumerator = nextEnumerator();
  enumerator->answerFirstListing({});
  EXPECT_EQ(ready.take(), "ready");
  follower->signal();
  enumerator->failChanges("A", kSignedOut);
  EXPECT_EQ(observer->next(), "relisted");
  follower->signal();
  nextEnumerator()->answerFirstListing({document(1, "a")});
  EXPECT_EQ(observer->next(), "added a");
}

TEST_F(ContainerFollowerTest, anchorsThatKeepExpiringDontMakeItGoRoundForEver) {
  follow(100, {1h, 1h});
  watch();
  auto enumerator = nextEnumerator();
  enumerator->answerAnchor("A");
  enumerator->answerPage("first", {}, "next");
  EXPECT_EQ(ready.take(), "ready");
  enumerator->answerPage("next", {});
  for (int round = 0; round < 3; ++round) {
    enumerator->failChanges("A", kExpired);
    enumerator->answerAnchor("A");
    enumerator->answerPage("first", {});
  }
  enumerator->failChanges("A", kExpired);
  EXPECT_EQ(observer->next(), "relisted");
}

TEST_F(ContainerFollowerTest, withoutChangeTrackingASignalRelists) {
  follow();
  watch();
  auto enumerator = nextEnumerator();
  enumerator->answerAnchor("");
  enumerator->answerPage("first", {document(1, "a")});
  EXPECT_EQ(ready.take(), "ready");
  follower->signal();
  enumerator->answerAnchor("");
  enumerator->answerPage("first", {document(2, "b")});
  EXPECT_EQ(observer->next(), "removed a");
  EXPECT_EQ(observer->next(), "added b");
}

TEST_F(ContainerFollowerTest, anItemThatMovedToAnotherFolderIsRemoved) {
  auto enumerator = followItems({document(1, "a")});
  follower->signal();
  enumerator->answerChanges("A", {document(1, "a", 2, "i7")}, {}, "B");
  EXPECT_EQ(observer->next(), "removed a");
}

TEST_F(ContainerFollowerTest, aRemovedWatcherIsToldNothing) {
  follow();
  auto watcher = std::make_shared<Watcher>("i1", observer);
  follower->addWatcher(watcher, [this](const NSError &) { ready.put("ready"); });
  auto enumerator = nextEnumerator();
  enumerator->answerFirstListing({});
  EXPECT_EQ(ready.take(), "ready");
  follower->removeWatcher(watcher);
  follower->signal();
  enumerator->answerChanges("A", {document(1, "a")}, {}, "B");
  waitForQueue();
  EXPECT_EQ(observer->changes.size(), 0U);
}

TEST_F(ContainerFollowerTest, closingGivesBackItsRoom) {
  followItems({document(1, "a"), document(2, "b")});
  EXPECT_EQ(budget->used(), 2U);
  follower->close();
  waitForQueue();
  EXPECT_EQ(budget->used(), 0U);
}

}  // namespace
}  // namespace droxa::testing
