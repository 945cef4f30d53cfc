#include <atomic>
#include <gtest/gtest-spi.h>
#include <gtest/gtest.h>

#include "tests/support/Eventually.h"
#include "tests/support/Observers.h"
#include "tests/support/RecordingHostLink.h"

namespace droxa {
namespace {

const NSError kError("SomeDomain", 1);

TEST(RecordingObserver, tellsTheStoryInOrder) {
  RecordingChangeObserver observer;
  observer.didUpdateItems({});
  observer.didDeleteItemsWithIdentifiers({"d1", "d2"});
  EXPECT_FALSE(observer.answered());
  observer.finishEnumeratingChangesUpToSyncAnchor(NSData::dataWithString("anchor"), true);
  EXPECT_EQ(observer.story(),
            (std::vector<std::string>{"didUpdateItems(0)", "didDeleteItems(d1, d2)", "finished"}));
  EXPECT_EQ(observer.token(), NSData::dataWithString("anchor"));
  EXPECT_TRUE(observer.moreComing());
  EXPECT_FALSE(observer.error());
}

TEST(RecordingObserver, failsTheTestOnASecondAnswer) {
  RecordingEnumerationObserver observer;
  observer.finishEnumeratingWithError(kError);
  EXPECT_NONFATAL_FAILURE(observer.finishEnumeratingUpToPage(NSData()), "finished after the answer");
}

TEST(RecordingObserver, failsTheTestOnItemsAfterTheAnswer) {
  RecordingEnumerationObserver observer;
  observer.finishEnumeratingUpToPage(NSData());
  EXPECT_NONFATAL_FAILURE(observer.didEnumerateItems({}), "didEnumerateItems(0) after the answer");
}

TEST(RecordingObserver, failsTheTestOnAMissingAnswer) {
  EXPECT_NONFATAL_FAILURE(RecordingEnumerationObserver(), "released without an answer");
}

TEST(RecordingObserver, failsTheTestOnANilError) {
  RecordingChangeObserver observer;
  EXPECT_NONFATAL_FAILURE(observer.finishEnumeratingWithError(NSError()), "nil error");
}

TEST(RecordingObserver, failsTheTestOnAnAnswerThatWasNotToCome) {
  RecordingEnumerationObserver observer;
  observer.expectNoAnswer();
  EXPECT_NONFATAL_FAILURE(observer.finishEnumeratingUpToPage(NSData()), "nothing was to come");
}

TEST(RecordingHostLink, completesEachSignalOnceWithWhatItWasTold) {
  const auto host = RecordingHostLink::install();
  host->answerWith(kError);
  host->holdCompletions();
  std::atomic<int> completions{0};
  NSFileProviderManager::defaultManager().signalEnumeratorForContainerItemIdentifier(
      "i1", [&](const NSError &error) { completions += error == kError ? 1 : 100; });
  EXPECT_TRUE(host->waitForSignals(1));
  EXPECT_EQ(host->signals(), std::vector<std::string>{"i1"});
  EXPECT_EQ(completions, 0);
  host->releaseCompletions();
  EXPECT_TRUE(eventually([&] { return completions == 1; }));
}

}  // namespace
}  // namespace droxa
