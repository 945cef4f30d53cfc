#include <gtest/gtest.h>

#include "enumeration/QVBaseWorkingSetEnumerator.h"
#include "tests/enumeration/EnumerationFixture.h"
#include "tests/enumeration/ScriptedDaemon.h"

namespace droxa {
namespace {

using Words = std::vector<std::string>;

constexpr char kChanges[] = "enumerateWorkingSetChangesFromChangeToken";

class WorkingSetEnumerator : public EnumerationTest {
 protected:
  // The outcome of a request whose reply carries `error`.
  NSError listingErrorFor(const NSError &error) {
    daemon.replies().failNext("currentNotifRankWithReply", error);
    const auto observer = listPage(*enumerator, NSData());
    EXPECT_EQ(observer->story(), Words{"failed"});
    return observer->error();
  }
  NSError changesErrorFor(const NSError &error) {
    daemon.replies().failNext(kChanges, error);
    const auto observer = changesSince(*enumerator, QVBaseWorkingSetEnumerator::initialSyncAnchor());
    EXPECT_EQ(observer->story(), Words{"failed"});
    return observer->error();
  }
  static Words changesCall(const NSData &token) {
    return {std::string(kChanges) + "(token " + (token ? token.description() : "nil") + ", limit 200)"};
  }

  const std::shared_ptr<QVBaseWorkingSetEnumerator> enumerator =
      std::make_shared<QVBaseWorkingSetEnumerator>();
  const NSData initial = QVBaseWorkingSetEnumerator::initialSyncAnchor();
  const NSError notAuthenticated = NSError(NSFileProviderErrorDomain, -1000);
};

TEST_F(WorkingSetEnumerator, beginsAtTheInitialAnchorAlways) {
  EXPECT_EQ(initial, NSData::dataWithString("initialSyncAnchor"));
  EXPECT_EQ(initial.length(), 17u);
  EXPECT_TRUE(enumerator->supportsChanges());
  EXPECT_EQ(currentAnchor(*enumerator), initial);
  changesSince(*enumerator, initial);
  EXPECT_EQ(currentAnchor(*enumerator), initial);
}

TEST_F(WorkingSetEnumerator, listsNothingAndSignalsTheWorkingSet) {
  bool answeredBeforeTheSignal = false;
  const auto observer = std::make_shared<RecordingEnumerationObserver>();
  host->whenSignalled([&](const std::string &) { answeredBeforeTheSignal = observer->answered(); });
  enumerator->enumerateItemsForObserver(observer, qv_pageTokenFromSortOrder(1, 400));
  EXPECT_EQ(observer->story(), Words{"finished"});
  EXPECT_EQ(observer->token(), NSData());
  EXPECT_EQ(host->signals(), Words{NSFileProviderWorkingSetContainerItemIdentifier});
  EXPECT_TRUE(answeredBeforeTheSignal);
  EXPECT_EQ(daemon.calls(), Words{"currentNotifRankWithReply()"});
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(WorkingSetEnumerator, ignoresASignalThatFails) {
  host->answerWith(NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid));
  host->holdCompletions();
  EXPECT_EQ(listPage(*enumerator, NSData())->error(), NSError());
  host->releaseCompletions();
  EXPECT_EQ(host->signalCount(), 1u);
  EXPECT_EQ(logLines(), Words{});
}

TEST_F(WorkingSetEnumerator, failsToListAsNotAuthenticatedWhenLoggedOut) {
  EXPECT_EQ(listingErrorFor(qvc_errorLoggedOut()), notAuthenticated);  // and nothing beneath
  EXPECT_EQ(host->signalCount(), 0u);
}

TEST_F(WorkingSetEnumerator, failsToListWithTheTranslationOfAnyOtherError) {
  const NSError error = qvc_errorNoSuchItem("d1");
  const NSError translated = listingErrorFor(error);
  EXPECT_TRUE(translated.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
  EXPECT_TRUE(translated.underlyingError().isSameObject(error));
  const NSError foreign("SomeDomain", 2);
  EXPECT_TRUE(listingErrorFor(foreign).isSameObject(foreign));
  EXPECT_EQ(host->signalCount(), 0u);
}

TEST_F(WorkingSetEnumerator, failsToListWithTheConnectionsErrorAsItIs) {
  const NSError error = qvc_errorLoggedOut();
  daemon.replies().failNextInTransport("currentNotifRankWithReply", error);
  const auto observer = listPage(*enumerator, NSData());
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().isSameObject(error));
  EXPECT_EQ(host->signalCount(), 0u);
}

TEST_F(WorkingSetEnumerator, asksFromNoTokenForTheInitialAnchor) {
  changesSince(*enumerator, initial);
  EXPECT_EQ(daemon.calls(), changesCall(NSData()));
}

TEST_F(WorkingSetEnumerator, sendsAnyOtherAnchorAsItIs) {
  const auto scripted = ScriptedDaemon::install();
  for (const char *text : {"initialSyncAncho", "initialSyncAnchor2", "", "x"}) {
    const NSData anchor = NSData::dataWithString(text);
    scripted->answerChangesWith({{}, {}, anchor, NSError()});
    changesSince(*enumerator, anchor);
    EXPECT_TRUE(scripted->lastToken()) << text;
    EXPECT_EQ(scripted->lastToken(), anchor) << text;
  }
}

TEST_F(WorkingSetEnumerator, reportsUpdatesThenDeletionsThenTheDaemonsToken) {
  const auto scripted = ScriptedDaemon::install();
  const auto item = live(1);
  const NSData token = NSData::dataWithString("the daemon's");
  scripted->answerChangesWith(
      {{item},
       {QVFileObjectID::documentID(9), QVFileObjectID::folderOrAliasID(3), QVFileObjectID::documentID(9)},
       token,
       NSError()});
  const auto observer = changesSince(*enumerator, initial);
  EXPECT_EQ(observer->story(), (Words{"didUpdateItems(1)", "didDeleteItems(d9, i3, d9)", "finished"}));
  EXPECT_EQ(observer->items(), NSFileProviderItems{item});
  EXPECT_EQ(observer->token(), token);
  EXPECT_TRUE(observer->moreComing());
}

TEST_F(WorkingSetEnumerator, reportsNoChangesInTheSameOrder) {
  const auto scripted = ScriptedDaemon::install();
  const NSData token = NSData::dataWithString("t");
  scripted->answerChangesWith({{}, {}, token, NSError()});
  const auto observer = changesSince(*enumerator, token);
  EXPECT_EQ(observer->story(), (Words{"didUpdateItems(0)", "didDeleteItems()", "finished"}));
  EXPECT_EQ(observer->token(), token);
  EXPECT_FALSE(observer->moreComing());
}

TEST_F(WorkingSetEnumerator, hasMoreComingUntilTheTokenStandsStill) {
  daemon.addDocument("Folder/a");
  NSData anchor = initial;
  std::size_t reported = 0;
  bool moreComing = true;
  for (int requests = 0; moreComing && requests < 10; ++requests) {
    const auto observer = changesSince(*enumerator, anchor);
    EXPECT_EQ(observer->moreComing(), observer->token() != anchor);
    moreComing = observer->moreComing();
    anchor = observer->token();
    reported += observer->items().size();
  }
  EXPECT_FALSE(moreComing);
  EXPECT_GE(reported, 2u);
}

TEST_F(WorkingSetEnumerator, hasMoreComingFromTheInitialAnchorEvenIfThereIsNothing) {
  const auto scripted = ScriptedDaemon::install();
  scripted->answerChangesWith({{}, {}, NSData::dataWithString("t"), NSError()});
  EXPECT_TRUE(changesSince(*enumerator, initial)->moreComing());
}

TEST_F(WorkingSetEnumerator, failsAChangeRequestAsNotAuthenticatedWhenLoggedOut) {
  EXPECT_EQ(changesErrorFor(NSError(QVTessalyErrorDomain, 2)), notAuthenticated);
}

TEST_F(WorkingSetEnumerator, failsAChangeRequestWithTheTranslationOfAnyOtherError) {
  const NSError foreign("SomeDomain", 2);
  EXPECT_TRUE(changesErrorFor(foreign).isSameObject(foreign));
  const NSError quota(NSCocoaErrorDomain, 4354);
  const NSError translated = changesErrorFor(quota);
  EXPECT_TRUE(translated.is(NSFileProviderErrorDomain, NSFileProviderErrorInsufficientQuota));
  EXPECT_TRUE(translated.underlyingError().isSameObject(quota));
}

TEST_F(WorkingSetEnumerator, failsAChangeRequestWithTheConnectionsErrorAsItIs) {
  const NSError error = qvc_errorLoggedOut();
  daemon.replies().failNextInTransport(kChanges, error);
  const auto observer = changesSince(*enumerator, initial);
  EXPECT_EQ(observer->story(), Words{"failed"});
  EXPECT_TRUE(observer->error().isSameObject(error));
}

TEST_F(WorkingSetEnumerator, answersRepliesThatComeAfterInvalidation) {
  daemon.replies().hold("currentNotifRankWithReply");
  daemon.replies().hold(kChanges);
  const auto listing = std::make_shared<RecordingEnumerationObserver>();
  const auto changes = std::make_shared<RecordingChangeObserver>();
  enumerator->enumerateItemsForObserver(listing, NSData());
  enumerator->enumerateChangesForObserver(changes, initial);
  enumerator->invalidate();
  daemon.replies().release("currentNotifRankWithReply");
  daemon.replies().release(kChanges);
  EXPECT_EQ(listing->error(), NSError());
  EXPECT_EQ(changes->error(), NSError());
}

}  // namespace
}  // namespace droxa
