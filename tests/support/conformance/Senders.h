#pragma once

#include "tests/support/conformance/DaemonConformanceFixture.h"

// What the daemon pushes of a watched item.

namespace droxa {

// 19: what the enumerators ask for.
inline constexpr std::uint64_t kConformanceWatch = QVWatchUpdates | QVWatchDeaths | QVWatchCoalesced;

// A receiver and its sender.
struct ConformanceWatch {
  std::shared_ptr<RecordingReceiver> receiver = std::make_shared<RecordingReceiver>();
  std::shared_ptr<QVItemNotificationSender> sender;

  explicit ConformanceWatch(const std::shared_ptr<QVProtocol> &daemon) {
    Once<std::shared_ptr<QVItemNotificationSender>, std::map<std::string, std::string>, NSError> answer(
        "sender");
    daemon->getItemUpdateSenderWithReceiver(receiver, answer.completion());
    EXPECT_EQ(answer.value<2>(), NSError());
    sender = answer.value<0>();
  }
  ConformanceWatch(const ConformanceWatch &) = delete;
  ConformanceWatch &operator=(const ConformanceWatch &) = delete;
  ~ConformanceWatch() {
    if (sender) sender->invalidate();
  }
  NSError watch(const NSURL &url, std::uint64_t options = kConformanceWatch) const {
    Once<NSError> gathered("watch of " + url.path());
    sender
        ->remoteObjectProxyWithErrorHandler(
            [](const NSError &error) { ADD_FAILURE() << error.description(); })
        ->watchItemAtURL(url, options, gathered.completion());
    return gathered.value<0>();
  }
};

TEST_P(DaemonConformance, aWatcherIsPushedNewChangedAndRenamedChildren) {
  folder("f");
  file("f/a");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  file("f/new");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("new"));
  world_->changeFile(at("f/a"), 99, 5'000);
  EXPECT_TRUE(
      watch.receiver->waitForItem([](const QVQueryItem &one) { return one.fields().documentSize == 99; }));
  rename("f/a", "f/b");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("b"));
}

// A client lists a folder between getting the sender and the watch's acknowledgement.
TEST_P(DaemonConformance, whatChangesBeforeTheWatchStandsIsPushedWithIt) {
  folder("f");
  folder("g");
  file("f/changed");
  file("f/dead");
  file("f/moved");
  file("f/moved and dead");
  file("f/untouched");
  settle();
  const QVFileObjectID dead = identifier("f/dead");
  const QVFileObjectID moved = identifier("f/moved");
  const QVFileObjectID movedAndDead = identifier("f/moved and dead");
  const std::string g = identifier("g").asString();
  const ConformanceWatch watch(daemon());
  file("f/new");
  world_->changeFile(at("f/changed"), 99, 5'000);
  remove("f/dead");
  rename("f/moved", "g/moved");
  rename("f/moved and dead", "g/moved and dead");
  file("g/elsewhere");
  settle();
  remove("g/moved and dead");
  settle();
  ASSERT_EQ(watch.watch(at("f")), NSError());
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("new"));
  EXPECT_TRUE(
      watch.receiver->waitForItem([](const QVQueryItem &one) { return one.fields().documentSize == 99; }));
  EXPECT_TRUE(watch.receiver->waitForDeath(dead));
  EXPECT_TRUE(watch.receiver->waitForItem([&](const QVQueryItem &one) {
    return one.fileObjectID() == moved && one.fields().parentItemIdentifier == g;
  }));
  EXPECT_TRUE(watch.receiver->waitForItem([&](const QVQueryItem &one) {
    return one.fileObjectID() == movedAndDead && (one.isDead() || one.fields().parentItemIdentifier == g);
  }));
  file("f/last");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("last"));
  EXPECT_FALSE(hasName(watch.receiver->items(), "untouched"));
  EXPECT_FALSE(hasName(watch.receiver->items(), "elsewhere"));
}

TEST_P(DaemonConformance, whatChangesInTheRootBeforeTheWatchStandsIsPushedWithIt) {
  file("dead");
  settle();
  const QVFileObjectID dead = identifier("dead");
  const ConformanceWatch watch(daemon());
  file("new");
  remove("dead");
  settle();
  ASSERT_EQ(watch.watch(at("")), NSError());
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("new"));
  EXPECT_TRUE(watch.receiver->waitForDeath(dead));
}

TEST_P(DaemonConformance, whatChangedBeforeTheSenderWasMadeIsNotPushed) {
  folder("f");
  file("f/before");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  file("f/after");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("after"));
  EXPECT_FALSE(hasName(watch.receiver->items(), "before"));
}

TEST_P(DaemonConformance, aWatcherIsPushedTheDeathsOfChildren) {
  folder("f");
  file("f/a");
  settle();
  const QVFileObjectID a = identifier("f/a");
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  remove("f/a");
  EXPECT_TRUE(watch.receiver->waitForDeath(a));
}

TEST_P(DaemonConformance, aChildThatMovesIsPushedToBothFolders) {
  folder("f");
  folder("g");
  file("f/a");
  settle();
  const QVFileObjectID a = identifier("f/a");
  const std::string g = identifier("g").asString();
  const ConformanceWatch from(daemon());
  const ConformanceWatch to(daemon());
  ASSERT_EQ(from.watch(at("f")), NSError());
  ASSERT_EQ(to.watch(at("g")), NSError());
  rename("f/a", "g/a");
  const auto isInG = [&](const QVQueryItem &one) {
    return one.fileObjectID() == a && !one.isDead() && one.fields().parentItemIdentifier == g;
  };
  EXPECT_TRUE(to.receiver->waitForItem(isInG));
  EXPECT_TRUE(from.receiver->waitForItem(isInG));
}

TEST_P(DaemonConformance, aWatchOfTheRootSeesItsEntries) {
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("")), NSError());
  file("a");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("a"));
}

TEST_P(DaemonConformance, onlyASubtreeWatchSeesGrandchildren) {
  folder("f");
  folder("f/g");
  settle();
  const ConformanceWatch flat(daemon());
  const ConformanceWatch deep(daemon());
  ASSERT_EQ(flat.watch(at("f")), NSError());
  ASSERT_EQ(deep.watch(at("f"), kConformanceWatch | QVWatchSubtree), NSError());
  file("f/g/grandchild");
  EXPECT_TRUE(deep.receiver->waitForUpdateOfName("grandchild"));
  file("f/child");
  EXPECT_TRUE(flat.receiver->waitForUpdateOfName("child"));
  EXPECT_FALSE(hasName(flat.receiver->items(), "grandchild"));
}

TEST_P(DaemonConformance, changesElsewhereAreNotPushed) {
  folder("f");
  folder("g");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  file("g/elsewhere");
  settle();
  file("f/here");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("here"));
  EXPECT_FALSE(hasName(watch.receiver->items(), "elsewhere"));
}

TEST_P(DaemonConformance, deathsAreNotPushedToWhoDidNotAsk) {
  folder("f");
  file("f/a");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f"), QVWatchUpdates), NSError());
  remove("f/a");
  settle();
  file("f/b");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("b"));
  for (const Item &one : watch.receiver->items()) EXPECT_FALSE(one->isDead());
}

TEST_P(DaemonConformance, aWatchOfAMissingItemIsNoSuchItem) {
  settle();
  const ConformanceWatch watch(daemon());
  EXPECT_EQ(tessalyCode(watch.watch(at("missing"))), QVErrorNoSuchItem);
  EXPECT_EQ(tessalyCode(watch.watch(NSURL::fileURLWithPath("/"))), QVErrorNoSuchItem);
}

TEST_P(DaemonConformance, aSecondWatchReplacesTheFirst) {
  folder("f");
  folder("g");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  ASSERT_EQ(watch.watch(at("g")), NSError());
  file("f/first");
  settle();
  file("g/second");
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("second"));
  EXPECT_FALSE(hasName(watch.receiver->items(), "first"));
}

TEST_P(DaemonConformance, theWatchedItemsDeathIsTheLastPush) {
  folder("f");
  settle();
  const QVFileObjectID f = identifier("f");
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  remove("f");
  ASSERT_TRUE(watch.receiver->waitForDeath(f));
  settle();
  const std::size_t pushed = watch.receiver->items().size();
  folder("f");
  file("f/later");
  settle();
  const ConformanceWatch witness(daemon());
  ASSERT_EQ(witness.watch(at("f")), NSError());
  file("f/latest");
  EXPECT_TRUE(witness.receiver->waitForUpdateOfName("latest"));
  EXPECT_EQ(watch.receiver->items().size(), pushed);
}

TEST_P(DaemonConformance, nothingIsPushedAfterInvalidation) {
  folder("f");
  settle();
  const ConformanceWatch ended(daemon());
  const ConformanceWatch witness(daemon());
  ASSERT_EQ(ended.watch(at("f")), NSError());
  ASSERT_EQ(witness.watch(at("f")), NSError());
  ended.sender->invalidate();
  // The watch's reply tells that the invalidation before it has been seen.
  Once<NSError> seen("watch after the invalidation");
  ended.sender->watchItemAtURL(at("f"), kConformanceWatch, seen.completion());
  seen.values();
  file("f/late");
  EXPECT_TRUE(witness.receiver->waitForUpdateOfName("late"));
  EXPECT_TRUE(ended.receiver->items().empty());
}

TEST_P(DaemonConformance, theNextPushWaitsForTheReply) {
  folder("f");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  watch.receiver->holdReplies();
  file("f/first");
  ASSERT_TRUE(watch.receiver->waitForUpdateOfName("first"));
  const std::size_t batches = watch.receiver->batches();
  const ConformanceWatch witness(daemon());
  ASSERT_EQ(witness.watch(at("f")), NSError());
  file("f/second");
  ASSERT_TRUE(witness.receiver->waitForUpdateOfName("second"));
  settle();
  EXPECT_EQ(watch.receiver->batches(), batches);
  EXPECT_FALSE(hasName(watch.receiver->items(), "second"));
  watch.receiver->releaseReplies();
  EXPECT_TRUE(watch.receiver->waitForUpdateOfName("second"));
}

TEST_P(DaemonConformance, aBoostEndsWithTheSender) {
  settle();
  Once<> ended("end of the boost");
  {
    const ConformanceWatch watch(daemon());
    watch.sender->boostPriority(ended.completion());
    ASSERT_EQ(watch.watch(at("")), NSError());
    EXPECT_FALSE(ended.called());
  }
  EXPECT_TRUE(ended.wait());
}

TEST_P(DaemonConformance, manyChangesAllArrive) {
  folder("f");
  settle();
  const ConformanceWatch watch(daemon());
  ASSERT_EQ(watch.watch(at("f")), NSError());
  for (int i = 0; i < 300; ++i) file("f/" + std::to_string(i));
  for (int i = 0; i < 300; ++i) EXPECT_TRUE(watch.receiver->waitForUpdateOfName(std::to_string(i))) << i;
}

}  // namespace droxa
