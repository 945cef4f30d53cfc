#include <gtest/gtest.h>
#include <thread>

#include "enumeration/QVFileEnumerator.h"
#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

class FileEnumeratorUpdates : public EnumerationTest {
 protected:
  void pushLive(std::uint64_t first, std::uint64_t count) {
    QVQueryItems items;
    for (std::uint64_t number = first; number < first + count; ++number) items.push_back(live(number));
    push(*enumerator, items);
  }
  void expectPending(std::size_t updates, const Words &deletions) {
    EXPECT_EQ(enumerator->pendingUpdates(), updates);
    EXPECT_EQ(enumerator->pendingDeletions(), deletions);
  }

  const std::shared_ptr<OpenFileEnumerator> enumerator = makeForFolder();
  const NSData anchor = currentAnchor(*enumerator);
};

TEST_F(FileEnumeratorUpdates, anUpdateIsDelivered) {
  const auto item = live(1);
  push(*enumerator, {item});
  const auto observer = changesSince(*enumerator, anchor);
  EXPECT_EQ(observer->story(), (Words{"didUpdateItems(1)", "didDeleteItems()", "finished"}));
  EXPECT_EQ(observer->items(), NSFileProviderItems{item});
}

TEST_F(FileEnumeratorUpdates, aLaterUpdateReplacesTheEarlier) {
  const auto newer = live(1, "newer");
  push(*enumerator, {live(1, "older"), live(2)});
  push(*enumerator, {newer});
  const auto observer = changesSince(*enumerator, anchor);
  EXPECT_EQ(observer->itemIdentifiers(), (Words{"d1", "d2"}));
  for (const auto &item : observer->items()) {
    EXPECT_TRUE(item->itemIdentifier() != "d1" || item == newer);
  }
}

TEST_F(FileEnumeratorUpdates, aDeathAfterAnUpdateLeavesOneDeletion) {
  push(*enumerator, {live(1), dead(1)});
  expectPending(0, {"d1"});
}

TEST_F(FileEnumeratorUpdates, aDeathInALaterPushLeavesOneDeletion) {
  push(*enumerator, {live(1)});
  push(*enumerator, {dead(1)});
  expectPending(0, {"d1"});
}

TEST_F(FileEnumeratorUpdates, anUpdateAfterADeathLeavesTheUpdate) {
  push(*enumerator, {dead(1), live(1)});
  expectPending(1, {});
}

TEST_F(FileEnumeratorUpdates, anUpdateTakesEveryDeletionOfItsItemBack) {
  push(*enumerator, {dead(1), dead(2), dead(1)});
  push(*enumerator, {dead(1)});
  expectPending(0, {"d1", "d2", "d1", "d1"});
  push(*enumerator, {live(1)});
  expectPending(1, {"d2"});
}

TEST_F(FileEnumeratorUpdates, twoDeathsOfAnItemAreTwoDeletions) {
  push(*enumerator, {dead(1), dead(1)});
  EXPECT_EQ(changesSince(*enumerator, anchor)->story(),
            (Words{"didUpdateItems(0)", "didDeleteItems(d1, d1)", "finished"}));
}

TEST_F(FileEnumeratorUpdates, aFolderAndADocumentOfOneNumberAreTwoItems) {
  NSFileProviderItemFields fields;
  fields.itemIdentifier = "i1";
  push(*enumerator,
       {live(1), std::make_shared<const QVQueryItem>(QVFileObjectID::folderOrAliasID(1), fields, true)});
  expectPending(1, {"i1"});
}

TEST_F(FileEnumeratorUpdates, signalTheFolderThenReply) {
  Words order;
  host->whenSignalled([&](const std::string &identifier) { order.push_back("signal " + identifier); });
  enumerator->receiveUpdates({live(1)}, {"ignored"}, {"ignored", "too"}, [&] { order.push_back("reply"); });
  EXPECT_EQ(order, (Words{"signal " + folder.asString(), "reply"}));
  EXPECT_EQ(logLines(), Words{"debug: [DEBUG] signal changes to fileproviderd"});
}

TEST_F(FileEnumeratorUpdates, signalAndReplyOutsideTheLock) {
  const auto fromAnotherThread = [&] { std::thread([&] { enumerator->pendingUpdates(); }).join(); };
  host->whenSignalled([&](const std::string &) { fromAnotherThread(); });
  bool replied = false;
  enumerator->receiveUpdates({live(1)}, {}, {}, [&] {
    fromAnotherThread();
    replied = true;
  });
  EXPECT_TRUE(replied);
}

TEST_F(FileEnumeratorUpdates, ofNothingSignalAndReplyToo) {
  push(*enumerator, {});
  expectPending(0, {});
  EXPECT_EQ(host->signals(), Words{folder.asString()});
}

TEST_F(FileEnumeratorUpdates, keepTheTokenUpTo5000Pending) {
  pushLive(1, 4999);
  push(*enumerator, {dead(5000)});
  expectPending(4999, {"d5000"});
  EXPECT_EQ(currentAnchor(*enumerator), anchor);
  const auto observer = changesSince(*enumerator, anchor);
  EXPECT_EQ(observer->items().size(), 4999u);
  EXPECT_EQ(observer->deletedIdentifiers(), Words{"d5000"});
}

TEST_F(FileEnumeratorUpdates, expireTheTokenWith5001PendingBeforeTheSignal) {
  pushLive(1, 4990);
  QVQueryItems deaths;
  for (std::uint64_t number = 5001; number <= 5010; ++number) deaths.push_back(dead(number));
  push(*enumerator, deaths);
  EXPECT_EQ(currentAnchor(*enumerator), anchor);

  log.clear();
  NSData duringSignal;
  host->whenSignalled([&](const std::string &) { duringSignal = currentAnchor(*enumerator); });
  push(*enumerator, {live(6000)});
  EXPECT_NE(duringSignal, anchor);
  expectPending(0, {});
  EXPECT_EQ(logLines(), (Words{"debug: [DEBUG] invalidating change token",
                               "debug: [DEBUG] signal changes to fileproviderd"}));
  EXPECT_TRUE(isExpired(changesSince(*enumerator, anchor)->error()));
}

TEST_F(FileEnumeratorUpdates, expireTheTokenWithOnePushThatIsTooLong) {
  pushLive(1, 6000);
  expectPending(0, {});
  EXPECT_TRUE(isExpired(changesSince(*enumerator, anchor)->error()));
}

TEST_F(FileEnumeratorUpdates, countAnItemOnceHoweverOftenItChanges) {
  for (int i = 0; i < 3; ++i) pushLive(1, 3000);
  expectPending(3000, {});
  EXPECT_EQ(currentAnchor(*enumerator), anchor);
}

TEST_F(FileEnumeratorUpdates, mayBeReceivedByAThreadThatHoldsTheLock) {
  RecursiveLock lock(enumerator->_lock);
  pushLive(1, 5001);
  EXPECT_EQ(enumerator->pendingUpdates(), 0u);
}

TEST_F(FileEnumeratorUpdates, duringAListingWaitForTheNextChangeRequest) {
  listPage(*enumerator, NSData());
  daemon.replies().hold("enumerateItemsInFolder");
  const auto listing = std::make_shared<RecordingEnumerationObserver>();
  listing->whenCalled([&](const ObserverCall &) { push(*enumerator, {live(2)}); });
  enumerator->enumerateItemsForObserver(listing, NSData());
  enumerator->drain();
  push(*enumerator, {live(1)});
  daemon.replies().release("enumerateItemsInFolder");
  EXPECT_EQ(listing->story(), (Words{"didEnumerateItems(0)", "finished"}));
  EXPECT_EQ(changesSince(*enumerator, anchor)->itemIdentifiers(), (Words{"d1", "d2"}));
}

TEST_F(FileEnumeratorUpdates, duringABatchWaitForTheNextOne) {
  push(*enumerator, {live(1)});
  const auto batch = std::make_shared<RecordingChangeObserver>();
  batch->whenCalled([&](const ObserverCall &) { push(*enumerator, {live(2), dead(3)}); });
  enumerator->enumerateChangesForObserver(batch, anchor);
  EXPECT_EQ(batch->story(), (Words{"didUpdateItems(1)", "didDeleteItems()", "finished"}));
  EXPECT_EQ(changesSince(*enumerator, batch->token())->story(),
            (Words{"didUpdateItems(1)", "didDeleteItems(d3, d3, d3)", "finished"}));
}

TEST_F(FileEnumeratorUpdates, comeThroughTheChannel) {
  daemon.replies().answerOnAnotherThread(true);
  listPage(*enumerator, NSData());
  const QVFileObjectID made = daemon.addDocument("Folder/new.txt");
  ASSERT_TRUE(host->waitForSignals(1));
  const auto batch = changesSince(*enumerator, anchor);
  EXPECT_EQ(batch->itemIdentifiers(), Words{made.asString()});
  daemon.remove("Folder/new.txt");
  ASSERT_TRUE(host->waitForSignals(2));
  EXPECT_EQ(changesSince(*enumerator, batch->token())->deletedIdentifiers(), Words{made.asString()});
  daemon.replies().answerOnAnotherThread(false);
}

TEST_F(FileEnumeratorUpdates, ofProgressAreIgnoredAndNeverRepliedTo) {
  listPage(*enumerator, NSData());
  enumerator->drain();
  log.clear();
  daemon.lastSender()->pushProgress({"half"});
  enumerator->drain();
  EXPECT_EQ(daemon.lastSender()->progressReplies(), 0u);
  expectPending(0, {});
  EXPECT_EQ(host->signalCount(), 0u);
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(FileEnumeratorUpdates, logASignalThatFailsAsTheRootsWhateverItsContainer) {
  const NSError error(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  host->answerWith(error);
  enumerator->_signalChange();
  const std::string line =
      "error: [ERROR] failed to signal enumerator for root container: " + error.description();
  EXPECT_TRUE(eventually([&] { return logged(line); }));
  EXPECT_EQ(host->signals(), Words{folder.asString()});  // once: nothing is retried
  EXPECT_EQ(logLines(), (Words{"debug: [DEBUG] signal changes to fileproviderd", line}));
}

TEST_F(FileEnumeratorUpdates, doNotWaitForTheSignalsCompletion) {
  host->holdCompletions();
  push(*enumerator, {live(1)});
  push(*enumerator, {live(2)});
  EXPECT_EQ(host->signalCount(), 2u);
}

}  // namespace
}  // namespace droxa
