#include <gtest/gtest.h>

#include "sharing/QVFileProviderPlendaCollaborationProxy.h"
#include "tessaly/QVAccount.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/sharing/SharingFixture.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
using Text = std::optional<std::string>;

constexpr char kToken[] = "startOperation_toCopyParticipantTokenAtURL";
constexpr char kOptions[] = "getShareOptionsOfItemIdentifier";
constexpr char kRefresh[] = "refreshSharingStateForItemIdentifier";
const NSError kLost(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
const NSError kFailure("Domain", 3);

// The service of one document, called in process.
class CollaborationProxy : public SharingTest {
 protected:
  CollaborationProxy() { principal->urls["d1"] = url; }
  ~CollaborationProxy() override {
    queue->waitUntilAllOperationsAreFinished();
    QVAccount::forgetCachedAccount();
  }
  NSURL addDocument() {
    daemon.addDatalessDocument("a", 10);
    return daemon.url("a");
  }
  void answerOptions(bool isShared, bool byOthers, bool byItself) {
    FakeSharing::Answers answers;
    answers.isShared = isShared;
    answers.isSharedByOthers = byOthers;
    answers.isSharedByItself = byItself;
    answers.sharedFolderName = "Plans";
    daemon.sharing().setAnswers(answers);
  }

  const NSURL url = addDocument();
  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  const std::shared_ptr<NSOperationQueue> queue = std::make_shared<NSOperationQueue>();
  QVFileProviderPlendaCollaborationProxy proxy{principal, "d1", queue};
  QVFileProviderPlendaCollaborationProxy nowhere{principal, "d9", queue};
};

TEST_F(CollaborationProxy, theConstantsAreAnsweredAtOnceWithoutTheDaemon) {
  const Once<std::int64_t, std::int64_t, NSError> version("version");
  proxy.fetchVersionAndCapabilitiesWithCompletionHandler(version.completion());
  EXPECT_EQ(version.calls(), 1);
  EXPECT_EQ(version.values(), (std::tuple(std::int64_t{1}, std::int64_t{210}, NSError())));

  const Once<Text, NSError> identifier("identifier");
  proxy.fetchFileProviderIdentifierWithCompletionHandler(identifier.completion());
  EXPECT_EQ(identifier.calls(), 1);
  EXPECT_EQ(identifier.values(), (std::tuple(Text("com.quorva.Tessaly"), NSError())));

  const Once<NSURL, NSError> sharing("sharing URL");
  proxy.fetchURLForSharingFileWithCompletionHandler(sharing.completion());
  EXPECT_EQ(sharing.calls(), 1);
  EXPECT_EQ(sharing.values(), (std::tuple(NSURL(), NSError())));
  EXPECT_EQ(daemon.calls(), Lines());
}

TEST_F(CollaborationProxy, theTokensAreSwapped) {
  FakeSharing::Answers answers;
  answers.first = "X";
  answers.second = "Y";
  daemon.sharing().setAnswers(answers);
  const Once<Text, Text, Text, NSDate, NSError> tokens("tokens");
  const auto progress = proxy.fetchCollaborationTokenWithCompletionHandler(tokens.completion());
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->totalUnitCount(), 0);
  EXPECT_EQ(tokens.values(), (std::tuple(Text("com.quorva.Tessaly"), Text("Y"), Text("X"),
                                         NSDate::distantFuture(), NSError())));
  EXPECT_EQ(daemon.calls(), Lines{std::string(kToken) + "(" + url.description() + ")"});
}

TEST_F(CollaborationProxy, aFailedTokenRequestIsFourNilsAndTheError) {
  daemon.replies().failNext(kToken, kFailure);
  FakeSharing::Answers answers;
  answers.first = "X";
  daemon.sharing().setAnswers(answers);
  const Once<Text, Text, Text, NSDate, NSError> tokens("tokens");
  proxy.fetchCollaborationTokenWithCompletionHandler(tokens.completion());
  EXPECT_EQ(tokens.values(), (std::tuple(Text(), Text(), Text(), NSDate(), kFailure)));
}

TEST_F(CollaborationProxy, anItemThatIsNowhereIsTheDaemonsToRefuse) {
  daemon.replies().failNext(kToken, kFailure);
  const Once<Text, Text, Text, NSDate, NSError> tokens("tokens");
  nowhere.fetchCollaborationTokenWithCompletionHandler(tokens.completion());
  EXPECT_EQ(tokens.value<4>(), kFailure);
  const Once<NSError> revision("revision");
  nowhere.fetchLatestRevisionWithCompletionHandler(revision.completion());
  EXPECT_TRUE(revision.value<0>());
  EXPECT_EQ(daemon.calls()[0], std::string(kToken) + "((null))");
}

TEST_F(CollaborationProxy, nobodyNeedsToTakeTheTokens) {
  EXPECT_TRUE(proxy.fetchCollaborationTokenWithCompletionHandler(nullptr));
  EXPECT_TRUE(daemon.log().waitFor(kToken));
}

TEST_F(CollaborationProxy, aTokenRequestIsCancelledByItsProgress) {
  daemon.replies().hold(kToken);
  const Once<Text, Text, Text, NSDate, NSError> tokens("tokens");
  const auto progress = proxy.fetchCollaborationTokenWithCompletionHandler(tokens.completion());
  ASSERT_TRUE(daemon.log().waitFor(kToken));
  progress->cancel();
  EXPECT_TRUE(tokens.value<4>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon.replies().release(kToken);
}

TEST_F(CollaborationProxy, theLatestRevisionIsDownloadedWithTheCloudAskedFirst) {
  const Once<NSError> revision("revision");
  const auto progress = proxy.fetchLatestRevisionWithCompletionHandler(revision.completion());
  ASSERT_TRUE(progress);
  EXPECT_FALSE(revision.value<0>());
  EXPECT_EQ(daemon.calls()[0], "startDownloadAtURL(" + url.path() + ", options 9)");
  EXPECT_EQ(logged("debug: [DEBUG] fetchLatestRevisionWithCompletionHandler: d1, " + url.description()), 1U);
}

TEST_F(CollaborationProxy, theLatestRevisionIsCancelledByItsProgress) {
  daemon.replies().hold("download");
  const Once<NSError> revision("revision");
  const auto progress = proxy.fetchLatestRevisionWithCompletionHandler(revision.completion());
  ASSERT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
  progress->cancel();
  EXPECT_TRUE(revision.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(daemon.log().waitFor("transfer 1: cancel"));
}

TEST_F(CollaborationProxy, aRefreshIsTheDaemonsAndCantBeCancelled) {
  daemon.replies().hold(kRefresh);
  const Once<NSError> done("refresh");
  const auto progress = proxy.refreshSharingStateWithCompletionHandler(done.completion());
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->totalUnitCount(), 0);
  progress->cancel();
  EXPECT_EQ(done.calls(), 0);
  daemon.replies().release(kRefresh);
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(daemon.calls(), Lines{std::string(kRefresh) + "(d1)"});
  EXPECT_EQ(logged("debug: [DEBUG] finished refreshing state for item identifier: d1"), 1U);

  daemon.replies().failNext(kRefresh, kFailure);
  const Once<NSError> failed("failed refresh");
  proxy.refreshSharingStateWithCompletionHandler(failed.completion());
  EXPECT_EQ(failed.value<0>(), kFailure);
  EXPECT_EQ(logged("debug: [DEBUG] error refreshing state for item identifier d1: " + kFailure.description()),
            1U);
}

TEST_F(CollaborationProxy, sharedByAFolderMeansSharedAndNotByItself) {
  for (const bool isShared : {false, true}) {
    for (const bool byOthers : {false, true}) {
      for (const bool byItself : {false, true}) {
        answerOptions(isShared, byOthers, byItself);
        const Once<bool, NSError> state("state");
        EXPECT_FALSE(proxy.fetchFolderSharingStateWithCompletionHandler(state.completion()));
        EXPECT_EQ(state.values(), (std::tuple(isShared && !byItself, NSError())));
        const Once<bool, Text, NSError> folder("folder");
        EXPECT_FALSE(proxy.fetchSharedFolderInfoWithCompletionHandler(folder.completion()));
        EXPECT_EQ(folder.values(), (std::tuple(isShared && !byItself, Text("Plans"), NSError())));
      }
    }
  }
  EXPECT_EQ(daemon.log().count(std::string(kOptions) + "(d1)"), 16U);
}

TEST_F(CollaborationProxy, aLostDaemonAnswersItsQuestionsOnce) {
  fake.connection->setUnreachable(kLost);
  const Once<NSError> refresh("refresh");
  EXPECT_TRUE(proxy.refreshSharingStateWithCompletionHandler(refresh.completion()));
  EXPECT_EQ(refresh.value<0>(), kLost);
  const Once<bool, NSError> state("state");
  EXPECT_FALSE(proxy.fetchFolderSharingStateWithCompletionHandler(state.completion()));
  EXPECT_EQ(state.values(), (std::tuple(false, kLost)));
  const Once<bool, Text, NSError> folder("folder");
  EXPECT_FALSE(proxy.fetchSharedFolderInfoWithCompletionHandler(folder.completion()));
  EXPECT_EQ(folder.values(), (std::tuple(false, Text(), kLost)));
}

TEST_F(CollaborationProxy, theAccountIsWhoeverIsSignedIn) {
  EXPECT_FALSE(QVAccountStoreWrite(home.configuration(), QVAccount("vera", "account-1")));
  QVAccount::forgetCachedAccount();
  const Once<Text, NSError> account("account");
  proxy.fetchAccountIdentifierWithCompletionHandler(account.completion());
  EXPECT_EQ(account.calls(), 1);
  EXPECT_EQ(account.values(), (std::tuple(Text("account-1"), NSError())));
  EXPECT_EQ(logged("debug: [DEBUG] Current account id is: account-1"), 1U);
}

TEST_F(CollaborationProxy, withoutAnAccountThatIsSaidSo) {
  QVAccount::forgetCachedAccount();
  const Once<Text, NSError> nobody("nobody");
  proxy.fetchAccountIdentifierWithCompletionHandler(nobody.completion());
  EXPECT_EQ(nobody.values(), (std::tuple(Text(), qvc_errorLoggedOut())));
  EXPECT_EQ(logged("debug: [DEBUG] Current account id is: (null)"), 1U);

  EXPECT_FALSE(QVAccountStoreWrite(home.configuration(), QVAccount("vera", std::nullopt)));
  QVAccount::forgetCachedAccount();
  const Once<Text, NSError> unnamed("unnamed");
  proxy.fetchAccountIdentifierWithCompletionHandler(unnamed.completion());
  EXPECT_EQ(unnamed.value<1>(), qvc_errorLoggedOut());
}

}  // namespace
}  // namespace droxa
