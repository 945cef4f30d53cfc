#include <gtest/gtest.h>
#include <thread>

#include "tests/enumeration/EnumerationFixture.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

class BaseFileEnumeratorChanges : public EnumerationTest {
 protected:
  void expectExpired(const NSData &anchor) {
    const auto observer = changesSince(*enumerator, anchor);
    EXPECT_EQ(observer->story(), Words{"failed"});
    EXPECT_EQ(observer->error(), NSError(NSFileProviderErrorDomain, -1002));
    EXPECT_TRUE(observer->error().userInfo().empty());
  }
  // An anchor that a foreign, or a future, enumerator would have handed out.
  NSData anchorOfThisGeneration(std::int64_t rank) {
    return qv_changeTokenFromRank(rank, uuidOf(currentAnchor(*enumerator)));
  }

  const std::shared_ptr<OpenBaseEnumerator> enumerator = OpenBaseEnumerator::make(folder, folder.asString());
};

TEST_F(BaseFileEnumeratorChanges, areSupported) {
  EXPECT_TRUE(enumerator->supportsChanges());
}

TEST_F(BaseFileEnumeratorChanges, startAtRankZeroOfARandomGeneration) {
  const NSData anchor = currentAnchor(*enumerator);
  EXPECT_EQ(rankOf(anchor), 0);
  EXPECT_FALSE(uuidOf(anchor).isNull());
  const auto other = OpenBaseEnumerator::make(folder, folder.asString());
  EXPECT_NE(uuidOf(currentAnchor(*other)), uuidOf(anchor));
}

TEST_F(BaseFileEnumeratorChanges, giveTheCallersAnchorBackWhenNothingIsPending) {
  const NSData anchor = currentAnchor(*enumerator);
  const auto observer = changesSince(*enumerator, anchor);
  EXPECT_EQ(observer->story(), Words{"finished"});
  EXPECT_EQ(observer->token(), anchor);
  EXPECT_FALSE(observer->moreComing());
  EXPECT_EQ(changesSince(*enumerator, anchor)->token(), anchor);
}

TEST_F(BaseFileEnumeratorChanges, giveAnOversizedAnchorBackAsItIs) {
  const NSData anchor = currentAnchor(*enumerator);
  std::vector<std::uint8_t> bytes(anchor.bytes().begin(), anchor.bytes().end());
  bytes.push_back(1);
  const NSData longer = NSData::dataWithBytes(bytes);
  EXPECT_EQ(changesSince(*enumerator, longer)->token(), longer);
}

TEST_F(BaseFileEnumeratorChanges, comeInOneBatch) {
  const NSData anchor = currentAnchor(*enumerator);
  const auto first = live(1);
  const auto second = live(2);
  enumerator->addUpdate(first);
  enumerator->addUpdate(second);
  enumerator->addDeath("d3");
  enumerator->addDeath("d4");
  enumerator->addDeath("d3");
  const auto observer = changesSince(*enumerator, anchor);
  EXPECT_EQ(observer->story(), (Words{"didUpdateItems(2)", "didDeleteItems(d3, d4, d3)", "finished"}));
  EXPECT_EQ(observer->itemIdentifiers(), (Words{"d1", "d2"}));
  EXPECT_EQ(rankOf(observer->token()), 1);
  EXPECT_EQ(uuidOf(observer->token()), uuidOf(anchor));
  EXPECT_FALSE(observer->moreComing());
  EXPECT_EQ(enumerator->pendingCount(), 0u);
  EXPECT_EQ(changesSince(*enumerator, observer->token())->story(), Words{"finished"});
}

TEST_F(BaseFileEnumeratorChanges, goUpByOneRankABatch) {
  NSData anchor = currentAnchor(*enumerator);
  for (std::int64_t rank = 1; rank <= 4; ++rank) {
    enumerator->addUpdate(live(1));
    anchor = changesSince(*enumerator, anchor)->token();
    EXPECT_EQ(rankOf(anchor), rank);
  }
}

TEST_F(BaseFileEnumeratorChanges, reportNoUpdatesBeforeDeletionsOnly) {
  enumerator->addDeath("d3");
  EXPECT_EQ(changesSince(*enumerator, currentAnchor(*enumerator))->story(),
            (Words{"didUpdateItems(0)", "didDeleteItems(d3)", "finished"}));
}

TEST_F(BaseFileEnumeratorChanges, reportNoDeletionsAfterUpdatesOnly) {
  enumerator->addUpdate(live(3));
  EXPECT_EQ(changesSince(*enumerator, currentAnchor(*enumerator))->story(),
            (Words{"didUpdateItems(1)", "didDeleteItems()", "finished"}));
}

TEST_F(BaseFileEnumeratorChanges, putNoLimitOnABatch) {
  for (std::uint64_t number = 1; number <= 1000; ++number) enumerator->addUpdate(live(number));
  EXPECT_EQ(changesSince(*enumerator, currentAnchor(*enumerator))->items().size(), 1000u);
}

TEST_F(BaseFileEnumeratorChanges, refuseTheAnchorBeforeTheLastBatch) {
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->addUpdate(live(1));
  const NSData newer = changesSince(*enumerator, anchor)->token();
  expectExpired(anchor);
  expectExpired(newer);  // that refusal began a new generation
}

TEST_F(BaseFileEnumeratorChanges, refuseTheCurrentAnchorOnceABatchWasDelivered) {
  enumerator->addUpdate(live(1));
  const NSData newer = changesSince(*enumerator, currentAnchor(*enumerator))->token();
  const NSData current = currentAnchor(*enumerator);
  EXPECT_EQ(rankOf(current), 0);
  EXPECT_EQ(uuidOf(current), uuidOf(newer));
  expectExpired(current);
  EXPECT_NE(uuidOf(currentAnchor(*enumerator)), uuidOf(newer));
}

TEST_F(BaseFileEnumeratorChanges, refuseANewerRank) {
  expectExpired(anchorOfThisGeneration(1));
}

TEST_F(BaseFileEnumeratorChanges, refuseANegativeRank) {
  expectExpired(anchorOfThisGeneration(-1));
}

TEST_F(BaseFileEnumeratorChanges, refuseAForeignToken) {
  expectExpired(qv_changeTokenFromRank(0, UUID::generate()));
}

TEST_F(BaseFileEnumeratorChanges, refuseWhatIsNoToken) {
  expectExpired(NSData());
  expectExpired(NSData::dataWithString(""));
  expectExpired(NSData::dataWithString("initialSyncAnchor"));
  const NSData whole = currentAnchor(*enumerator);
  expectExpired(NSData::dataWithBytes(whole.bytes().first(12)));
}

TEST_F(BaseFileEnumeratorChanges, dropWhatIsPendingWhenAnAnchorIsRefused) {
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->addUpdate(live(1));
  enumerator->addDeath("d2");
  expectExpired(NSData());
  EXPECT_EQ(enumerator->pendingCount(), 0u);
  expectExpired(anchor);
  EXPECT_EQ(changesSince(*enumerator, currentAnchor(*enumerator))->story(), Words{"finished"});
}

TEST_F(BaseFileEnumeratorChanges, expireWithEveryAnchorOnInvalidation) {
  const NSData current = currentAnchor(*enumerator);
  enumerator->addUpdate(live(1));
  const NSData newer = changesSince(*enumerator, current)->token();
  enumerator->addDeath("d1");
  enumerator->invalidateChangeToken();
  EXPECT_EQ(enumerator->pendingCount(), 0u);
  const NSData fresh = currentAnchor(*enumerator);
  EXPECT_EQ(changesSince(*enumerator, fresh)->error(), NSError());
  expectExpired(newer);
  enumerator->invalidateChangeToken();
  expectExpired(fresh);
}

TEST_F(BaseFileEnumeratorChanges, logABatch) {
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->addUpdate(live(1));
  const std::string tag = hexTag(QVLogSectionCreate(false) + 2);
  changesSince(*enumerator, anchor);
  EXPECT_EQ(logLines(), (Words{"debug: [DEBUG] ┏" + tag + " listing changes for " + folder.asString(),
                               "debug: [DEBUG] requested rank: 0", "debug: [DEBUG] ┗" + tag + " "}));
}

TEST_F(BaseFileEnumeratorChanges, logThatNothingIsPending) {
  const NSData anchor = currentAnchor(*enumerator);
  const std::string tag = hexTag(QVLogSectionCreate(false) + 2);
  changesSince(*enumerator, anchor);
  EXPECT_EQ(logLines(), (Words{"debug: [DEBUG] ┏" + tag + " listing changes for " + folder.asString(),
                               "debug: [DEBUG] requested rank: 0", "debug: [DEBUG] no update to send back",
                               "debug: [DEBUG] ┗" + tag + " "}));
}

TEST_F(BaseFileEnumeratorChanges, logARefusal) {
  enumerator->addUpdate(live(1));
  changesSince(*enumerator, currentAnchor(*enumerator));
  log.clear();
  const std::string tag = hexTag(QVLogSectionCreate(false) + 2);
  changesSince(*enumerator, NSData::dataWithString("nonsense"));
  EXPECT_EQ(logLines(),
            (Words{"debug: [DEBUG] ┏" + tag + " listing changes for " + folder.asString(),
                   "debug: [DEBUG] requested rank: -1", "debug: [DEBUG] token expired (current rank 1)",
                   "debug: [DEBUG] invalidating change token", "debug: [DEBUG] ┗" + tag + " "}));
}

TEST_F(BaseFileEnumeratorChanges, logTheRootAsNull) {
  const auto root = OpenBaseEnumerator::make(std::nullopt, NSFileProviderRootContainerItemIdentifier);
  const std::string tag = hexTag(QVLogSectionCreate(false) + 2);
  changesSince(*root, NSData());
  EXPECT_TRUE(logged("debug: [DEBUG] ┏" + tag + " listing changes for (null)"));
}

TEST_F(BaseFileEnumeratorChanges, refuseBeforeTheNewGenerationBegins) {
  const UUID generation = uuidOf(currentAnchor(*enumerator));
  UUID during;
  const auto observer = std::make_shared<RecordingChangeObserver>();
  observer->whenCalled([&](const ObserverCall &) { during = uuidOf(currentAnchor(*enumerator)); });
  enumerator->enumerateChangesForObserver(observer, NSData());
  EXPECT_EQ(during, generation);
  EXPECT_NE(uuidOf(currentAnchor(*enumerator)), generation);
}

TEST_F(BaseFileEnumeratorChanges, deliverABatchOutsideTheLock) {
  enumerator->addUpdate(live(1));
  const auto observer = std::make_shared<RecordingChangeObserver>();
  observer->whenCalled([&](const ObserverCall &call) {
    std::thread other([&] { enumerator->addUpdate(live(2)); });  // would never end otherwise
    other.join();
    EXPECT_FALSE(call.error);
  });
  enumerator->enumerateChangesForObserver(observer, currentAnchor(*enumerator));
  EXPECT_EQ(observer->itemIdentifiers(), Words{"d1"});
  EXPECT_EQ(enumerator->pendingCount(), 1u);
}

TEST_F(BaseFileEnumeratorChanges, areAnsweredByAThreadThatHoldsTheLock) {
  RecursiveLock lock(enumerator->_lock);
  expectExpired(NSData());
  enumerator->invalidateChangeToken();
  EXPECT_EQ(changesSince(*enumerator, currentAnchor(*enumerator))->error(), NSError());
}

TEST_F(BaseFileEnumeratorChanges, haveACurrentAnchorThatDoesNotWaitForTheLock) {
  const NSData anchor = currentAnchor(*enumerator);
  RecursiveLock lock(enumerator->_lock);
  NSData read;
  std::thread other([&] { read = currentAnchor(*enumerator); });
  other.join();
  EXPECT_EQ(read, anchor);
}

TEST_F(BaseFileEnumeratorChanges, areAnsweredAfterInvalidation) {
  const NSData anchor = currentAnchor(*enumerator);
  enumerator->addUpdate(live(1));
  enumerator->invalidate();
  dispatch_sync(enumerator->_queue, [] {});
  EXPECT_EQ(changesSince(*enumerator, anchor)->story(),
            (Words{"didUpdateItems(1)", "didDeleteItems()", "finished"}));
}

}  // namespace
}  // namespace droxa
