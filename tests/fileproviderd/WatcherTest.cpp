#include <gtest/gtest.h>

#include "fileproviderd/FollowedContainers.h"
#include "fileproviderd/Watcher.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

std::vector<FPDChange> removals(std::size_t count) {
  std::vector<FPDChange> changes(count);
  for (FPDChange &change : changes) change.kind = FPDChange::Kind::removed;
  return changes;
}

TEST(Watcher, theNextBatchWaitsForTheReply) {
  auto observer = std::make_shared<RecordingObserver>();
  observer->answersItself = true;
  auto watcher = std::make_shared<Watcher>("i1", observer);
  watcher->deliver(removals(1));
  watcher->deliver(removals(2));
  EXPECT_EQ(observer->changes.size(), 1U);
  observer->replies.take()();
  EXPECT_EQ(observer->changes.size(), 3U);
  watcher->stop();  // the kept reply holds the watcher
}

TEST(Watcher, oneThatDoesntKeepUpIsToldThatItMissedSomething) {
  auto observer = std::make_shared<RecordingObserver>();
  observer->answersItself = true;
  auto watcher = std::make_shared<Watcher>("i1", observer);
  watcher->deliver(removals(1));
  watcher->deliver(removals(Watcher::kMostPending));
  watcher->deliver(removals(1));
  EXPECT_EQ(observer->next(), "removed ");
  observer->replies.take()();
  EXPECT_EQ(observer->next(), "relisted");
  watcher->stop();
}

TEST(Watcher, nothingIsSentAfterItWasStopped) {
  auto observer = std::make_shared<RecordingObserver>();
  auto watcher = std::make_shared<Watcher>("i1", observer);
  watcher->stop();
  watcher->deliver(removals(1));
  EXPECT_EQ(observer->changes.size(), 0U);
  EXPECT_TRUE(watcher->isStopped());
}

TEST(WatchHandle, stopsOnceAlsoWhenItIsReleased) {
  int stops = 0;
  {
    WatchHandle handle([&] { ++stops; });
    handle.stop();
  }
  EXPECT_EQ(stops, 1);
}

class FollowedContainersTest : public ::testing::Test {
 protected:
  std::shared_ptr<FPDWatch> watch(const std::string &identifier, const NSFileProviderItems &items) {
    Arrivals<std::shared_ptr<FPDWatch>> watches;
    followed->watch(identifier, observer,
                    [&](const std::shared_ptr<FPDWatch> &made, const NSError &) { watches.put(made); });
    enumerator = extension->enumerators.take();
    if (enumerator) enumerator->answerFirstListing(items);
    return watches.take();
  }

  std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  std::shared_ptr<RecordingObserver> observer = std::make_shared<RecordingObserver>();
  std::shared_ptr<ScriptedEnumerator> enumerator;
  std::shared_ptr<FollowedContainers> followed = std::make_shared<FollowedContainers>(
      std::make_shared<ExtensionCalls>(std::make_shared<ScriptedConnecting>(extension)));
};

TEST_F(FollowedContainersTest, aSignalReachesTheContainerThatItNames) {
  const auto handle = watch("i1", {});
  ASSERT_TRUE(handle);
  followed->signal("i2");
  followed->signal("i1");
  enumerator->answerChanges("A", {document(1, "a")}, {}, "B");
  EXPECT_EQ(observer->next(), "added a");
  EXPECT_EQ(followed->followedCount(), 1U);
  EXPECT_EQ(followed->watcherCount(), 1U);
  EXPECT_EQ(followed->cachedItemCount(), 1U);
}

TEST_F(FollowedContainersTest, aContainerWithoutWatchersStaysForTheNextOne) {
  watch("i1", {})->stop();
  EXPECT_EQ(followed->watcherCount(), 0U);
  EXPECT_EQ(followed->followedCount(), 1U);
  Arrivals<std::shared_ptr<FPDWatch>> watches;
  followed->watch("i1", observer, [&](const auto &made, const NSError &) { watches.put(made); });
  const auto handle = watches.take();
  EXPECT_TRUE(handle);
  EXPECT_EQ(extension->opened.size(), 1U);
}

TEST_F(FollowedContainersTest, onlySoManyContainersAreKeptWithoutWatchers) {
  for (int number = 0; number < 12; ++number) watch("i" + std::to_string(number), {})->stop();
  EXPECT_EQ(followed->followedCount(), FollowedContainers::kMostUnwatched);
}

TEST_F(FollowedContainersTest, theExtensionsEndForgetsWhatNobodyWatches) {
  watch("i1", {})->stop();
  followed->extensionEnded();
  EXPECT_EQ(followed->followedCount(), 0U);
}

TEST_F(FollowedContainersTest, aFailedWatchLeavesNoWatcher) {
  extension->failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
  Arrivals<std::string> results;
  followed->watch("i1", observer,
                  [&](const auto &, const NSError &error) { results.put(std::to_string(error.code())); });
  EXPECT_EQ(results.take(), "-1005");
  EXPECT_EQ(followed->watcherCount(), 0U);
}

}  // namespace
}  // namespace droxa::testing
