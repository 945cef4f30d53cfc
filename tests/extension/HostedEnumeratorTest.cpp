#include <gtest/gtest.h>

#include "extension/HostedEnumerator.h"
#include "tests/extension/ScriptedEnumerator.h"
#include "tests/support/LogLines.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
using Page = Once<NSFileProviderItems, NSData, NSError>;
using Changes = Once<NSFileProviderItems, Lines, NSData, bool, NSError>;
using Anchor = Once<NSData>;

const NSError kFailure(NSPOSIXErrorDomain, 5);
const NSData kToken = NSData::dataWithString("token");

class Hosted : public testing::Test {
 protected:
  void expectDropped(const NSError &error, const std::string &what) {
    EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)) << error.description();
    EXPECT_EQ(error.localizedDescription(), "the enumerator dropped " + what + " without an answer");
  }

  const std::shared_ptr<ScriptedEnumerator> inner = std::make_shared<ScriptedEnumerator>();
  std::shared_ptr<HostedEnumerator> hosted = std::make_shared<HostedEnumerator>(inner);
  const OSLogCapture capture;
};

TEST_F(Hosted, aListingIsAnsweredWithAllThatWasTold) {
  NSData asked;
  inner->listing = [&](auto observer, const NSData &page) {
    asked = page;
    observer->didEnumerateItems({plainItem("d1"), plainItem("d2")});
    observer->didEnumerateItems({});
    observer->didEnumerateItems({plainItem("i3")});
    observer->finishEnumeratingUpToPage(kToken);
  };
  const Page page("page");
  hosted->enumerateItems(NSFileProviderInitialPageSortedByDate(), page.completion());
  EXPECT_EQ(asked, NSFileProviderInitialPageSortedByDate());
  EXPECT_EQ(identifiersOf(page.value<0>()), (Lines{"d1", "d2", "i3"}));
  EXPECT_EQ(page.value<1>(), kToken);
  EXPECT_FALSE(page.value<2>());
  EXPECT_EQ(logLines(capture), Lines{});
}

TEST_F(Hosted, aListingThatFailsIsAnsweredWithTheErrorAlone) {
  inner->listing = [](auto observer, const NSData &) {
    observer->didEnumerateItems({plainItem("d1")});
    observer->finishEnumeratingWithError(kFailure);
  };
  const Page page("page");
  hosted->enumerateItems({}, page.completion());
  EXPECT_TRUE(page.value<0>().empty());
  EXPECT_FALSE(page.value<1>());
  EXPECT_TRUE(page.value<2>().isSameObject(kFailure));
}

TEST_F(Hosted, aListingMayBeAnsweredLater) {
  std::shared_ptr<NSFileProviderEnumerationObserver> kept;
  inner->listing = [&](auto observer, const NSData &) { kept = std::move(observer); };
  const Page page("page");
  hosted->enumerateItems({}, page.completion());
  hosted.reset();
  EXPECT_FALSE(page.called());
  kept->finishEnumeratingUpToPage({});
  EXPECT_EQ(page.calls(), 1);
}

TEST_F(Hosted, aListingThatIsDroppedIsAnsweredWithAnError) {
  inner->listing = [](auto observer, const NSData &) { observer->didEnumerateItems({plainItem("d1")}); };
  const Page page("page");
  hosted->enumerateItems({}, page.completion());
  EXPECT_TRUE(page.value<0>().empty());
  expectDropped(page.value<2>(), "a listing");
  EXPECT_EQ(logLines(capture), Lines{"fault: [CRIT] Assertion failed: answered (enumeration observer)"});
}

TEST_F(Hosted, ofAListingsAnswersTheFirstCounts) {
  inner->listing = [](auto observer, const NSData &) {
    observer->finishEnumeratingUpToPage(kToken);
    observer->didEnumerateItems({plainItem("d1")});
    observer->finishEnumeratingUpToPage({});
    observer->finishEnumeratingWithError(kFailure);
  };
  const Page page("page");
  hosted->enumerateItems({}, page.completion());
  EXPECT_EQ(page.value<1>(), kToken);
  EXPECT_FALSE(page.value<2>());
  EXPECT_EQ(logLines(capture),
            (Lines{"fault: [CRIT] Assertion failed: !answered (didEnumerateItems)",
                   "fault: [CRIT] Assertion failed: !answered (finishEnumeratingUpToPage)",
                   "fault: [CRIT] Assertion failed: !answered (finishEnumeratingWithError)"}));
}

TEST_F(Hosted, changesAreAnsweredWithAllThatWasTold) {
  NSData asked;
  inner->changes = [&](auto observer, const NSData &anchor) {
    asked = anchor;
    observer->didUpdateItems({plainItem("d1")});
    observer->didDeleteItemsWithIdentifiers({"d2", "d3"});
    observer->didUpdateItems({plainItem("d4")});
    observer->didDeleteItemsWithIdentifiers({"d5"});
    observer->finishEnumeratingChangesUpToSyncAnchor(kToken, true);
  };
  const Changes changes("changes");
  hosted->enumerateChanges(NSData::dataWithString("anchor"), changes.completion());
  EXPECT_EQ(asked, NSData::dataWithString("anchor"));
  EXPECT_EQ(identifiersOf(changes.value<0>()), (Lines{"d1", "d4"}));
  EXPECT_EQ(changes.value<1>(), (Lines{"d2", "d3", "d5"}));
  EXPECT_EQ(changes.value<2>(), kToken);
  EXPECT_TRUE(changes.value<3>());
  EXPECT_FALSE(changes.value<4>());
}

TEST_F(Hosted, changesThatFailAreAnsweredWithTheErrorAlone) {
  inner->changes = [](auto observer, const NSData &) {
    observer->didUpdateItems({plainItem("d1")});
    observer->didDeleteItemsWithIdentifiers({"d2"});
    observer->finishEnumeratingWithError(kFailure);
  };
  const Changes changes("changes");
  hosted->enumerateChanges({}, changes.completion());
  EXPECT_TRUE(changes.value<0>().empty());
  EXPECT_TRUE(changes.value<1>().empty());
  EXPECT_FALSE(changes.value<2>());
  EXPECT_FALSE(changes.value<3>());
  EXPECT_TRUE(changes.value<4>().isSameObject(kFailure));
}

TEST_F(Hosted, changesThatAreDroppedAreAnsweredWithAnError) {
  inner->changes = [](auto, const NSData &) {};
  const Changes changes("changes");
  hosted->enumerateChanges({}, changes.completion());
  expectDropped(changes.value<4>(), "a request for changes");
  EXPECT_EQ(logLines(capture), Lines{"fault: [CRIT] Assertion failed: answered (change observer)"});
}

TEST_F(Hosted, ofTheChangesAnswersTheFirstCounts) {
  inner->changes = [](auto observer, const NSData &) {
    observer->finishEnumeratingWithError(kFailure);
    observer->didUpdateItems({});
    observer->didDeleteItemsWithIdentifiers({});
    observer->finishEnumeratingChangesUpToSyncAnchor({}, false);
    observer->finishEnumeratingWithError(kFailure);
  };
  const Changes changes("changes");
  hosted->enumerateChanges({}, changes.completion());
  EXPECT_TRUE(changes.value<4>().isSameObject(kFailure));
  EXPECT_EQ(logLines(capture),
            (Lines{"fault: [CRIT] Assertion failed: !answered (didUpdateItems)",
                   "fault: [CRIT] Assertion failed: !answered (didDeleteItemsWithIdentifiers)",
                   "fault: [CRIT] Assertion failed: !answered (finishEnumeratingChangesUpToSyncAnchor)",
                   "fault: [CRIT] Assertion failed: !answered (finishEnumeratingWithError)"}));
}

TEST_F(Hosted, theSyncAnchorIsPassedOn) {
  inner->syncAnchor = [](auto completion) { completion(kToken); };
  const Anchor anchor("anchor");
  hosted->currentSyncAnchor(anchor.completion());
  EXPECT_EQ(anchor.value<0>(), kToken);
  EXPECT_EQ(logLines(capture), Lines{});
}

TEST_F(Hosted, aSyncAnchorThatIsDroppedIsNone) {
  inner->syncAnchor = [](auto) {};
  const Anchor anchor("anchor");
  hosted->currentSyncAnchor(anchor.completion());
  EXPECT_FALSE(anchor.value<0>());
  EXPECT_EQ(logLines(capture), Lines{"fault: [CRIT] Assertion failed: answered (sync anchor)"});
}

TEST_F(Hosted, ofTwoSyncAnchorsTheFirstCounts) {
  inner->syncAnchor = [](auto completion) {
    completion(kToken);
    completion({});
  };
  const Anchor anchor("anchor");
  hosted->currentSyncAnchor(anchor.completion());
  EXPECT_EQ(anchor.value<0>(), kToken);
  EXPECT_EQ(logLines(capture), Lines{"fault: [CRIT] Assertion failed: !answered (sync anchor)"});
}

TEST_F(Hosted, isInvalidatedOnceHoweverItEnds) {
  hosted->invalidate();
  EXPECT_EQ(inner->invalidations, 1);
  hosted->invalidate();
  hosted.reset();
  EXPECT_EQ(inner->invalidations, 1);
}

TEST_F(Hosted, aReleaseInvalidates) {
  hosted.reset();
  EXPECT_EQ(inner->invalidations, 1);
}

}  // namespace
}  // namespace droxa
