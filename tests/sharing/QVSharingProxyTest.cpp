#include <algorithm>
#include <gtest/gtest.h>

#include "platform/cloudkit/CKError.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSFileManager.h"
#include "sharing/QVSharingProxy.h"
#include "tessaly/QVShareTypes.h"
#include "tessaly/QVUbiquitousItems.h"
#include "tests/extension/ScriptedPrincipal.h"
#include "tests/sharing/SharingFixture.h"
#include "tests/support/Once.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;
using Share = std::optional<CKShare>;
using Item = std::shared_ptr<const NSFileProviderItem>;

constexpr char kCopy[] = "startOperation_toCopySharingInfoAtURL";
constexpr char kSave[] = "startOperation_toSaveSharingInfo";
constexpr char kUnshare[] = "startOperation_toUnshareShare";
constexpr char kCreate[] = "createSharingInfoForURL";

// The service of one document, or of the folder "i5", called in process.
class QVSharingProxyTest : public SharingTest {
 protected:
  QVSharingProxyTest() {
    QVInstallUbiquitousItemProvider();
    principal->urls = {{"d1", itemURL}, {"i5", itemURL}};
  }
  ~QVSharingProxyTest() override {
    queue->waitUntilAllOperationsAreFinished();
    NSFileManager::defaultManager()->setUbiquitousItemProvider(nullptr);
  }

  std::shared_ptr<QVSharingProxy> makeProxy(const std::string &identifier) {
    return std::make_shared<QVSharingProxy>(principal, identifier, NSURL::fileURLWithPath("/ignored"), queue);
  }
  static CKShare savedShare(const char *type = QVDocumentShareType) {
    CKShare share = wholeShare();
    share.recordChangeTag = "tag";
    share.fields[CKShareTypeKey] = std::string(type);
    return share;
  }
  // What the daemon has of the item: without a URL, as it answers when it hands none out.
  void answerShare(const Share &share, const NSURL &url = {}) {
    FakeSharing::Answers answers;
    answers.share = share;
    answers.url = url;
    daemon.sharing().setAnswers(answers);
  }
  void cache(const CKShare &share) {
    answerShare(share);
    const Once<Share, NSError> done("fetch");
    EXPECT_TRUE(proxy->fetchShareWithCompletion(done.completion()));
    EXPECT_EQ(done.value<0>(), Share(share));
    queue->waitUntilAllOperationsAreFinished();
    daemon.log().clear();
    capture.clear();
  }
  // The service's own lines, with the tags as "T" and the proxy as "P".
  Lines lines() const {
    Lines kept;
    for (std::string line : logLines(capture)) {
      for (const std::string mark : {"┏", "┗"}) {
        const auto at = line.find(mark);
        if (at == std::string::npos) continue;
        const auto begin = at + mark.size();
        const auto end = line.find(' ', begin);
        EXPECT_EQ(std::stoull(line.substr(begin, end - begin), nullptr, 16) % 2, 0U) << line;
        line.replace(begin, end - begin, "T");
      }
      const std::string name = proxy->description();
      const auto at = line.find(name);
      if (at != std::string::npos) line.replace(at, name.size(), "P");
      kept.push_back(line);
    }
    return kept;
  }
  static std::string opened(const std::string &method, const std::string &identifier = "d1") {
    return "info: [INFO] ┏T P -[QVSharingProxy " + method + "] " + identifier;
  }
  static constexpr char kEnded[] = "info: [INFO] ┗T ";
  static std::string replied(const std::string &values) { return "debug: [DEBUG] P: reply(" + values + ")"; }

  NSURL addDocument() {
    daemon.addDocument("a");
    return daemon.url("a");
  }

  const NSURL itemURL = addDocument();
  const std::shared_ptr<ScriptedPrincipal> principal = std::make_shared<ScriptedPrincipal>();
  const std::shared_ptr<NSOperationQueue> queue = std::make_shared<NSOperationQueue>();
  std::shared_ptr<QVSharingProxy> proxy = makeProxy("d1");
};

TEST_F(QVSharingProxyTest, sharingInfoIsWhatTheDriveShows) {
  for (const bool isShared : {false, true}) {
    daemon.setShared("a", isShared);
    capture.clear();
    const Once<bool, Item, NSError> info("info");
    proxy->fetchSharingInfo(info.completion());
    EXPECT_EQ(info.value<0>(), isShared);
    EXPECT_FALSE(info.value<1>());
    EXPECT_FALSE(info.value<2>());
    const std::string value = isShared ? "1" : "0";
    EXPECT_EQ(lines(), (Lines{opened("fetchSharingInfo:"), replied(value + ", (null), (null)"), kEnded}));
  }
}

TEST_F(QVSharingProxyTest, sharingInfoOfAnItemThatIsNowhereIsAnError) {
  proxy = makeProxy("d9");
  const Once<bool, Item, NSError> info("info");
  proxy->fetchSharingInfo(info.completion());
  EXPECT_FALSE(info.value<0>());
  const NSError missing = fileProviderErrorForNonExistentItemWithIdentifier("d9");
  EXPECT_EQ(info.value<2>(), missing);
  EXPECT_EQ(lines(), (Lines{opened("fetchSharingInfo:", "d9"), replied("0, (null), " + missing.description()),
                            kEnded}));
}

TEST_F(QVSharingProxyTest, sharingInfoThatCantBeReadIsTheErrorOfReadingIt) {
  const NSError failure("Domain", 3);
  daemon.setShared("a", true);
  daemon.replies().failNext("getQueryItemForURL", failure);
  const Once<bool, Item, NSError> info("info");
  proxy->fetchSharingInfo(info.completion());
  EXPECT_FALSE(info.value<0>());
  EXPECT_EQ(info.value<2>(), failure);
}

TEST_F(QVSharingProxyTest, preflightIsTheSameAnswerWithFourNils) {
  daemon.setShared("a", true);
  const Once<bool, Item, QVSharingStrings, QVSharingStrings, NSError> answer("preflight");
  EXPECT_FALSE(proxy->preflightCheckIfCurrentlyShareableWithCompletion(answer.completion()));
  EXPECT_TRUE(answer.value<0>());
  EXPECT_FALSE(answer.value<1>());
  EXPECT_FALSE(answer.value<2>());
  EXPECT_FALSE(answer.value<3>());
  EXPECT_FALSE(answer.value<4>());
  EXPECT_EQ(lines(), (Lines{opened("preflightCheckIfCurrentlyShareableWithCompletion:"),
                            replied("1, (null), (null), (null), (null)"), kEnded}));
}

TEST_F(QVSharingProxyTest, preflightFailsAsSharingInfoDoes) {
  const NSError failure("Domain", 3);
  daemon.replies().failNext("getQueryItemForURL", failure);
  const Once<bool, Item, QVSharingStrings, QVSharingStrings, NSError> unread("preflight");
  EXPECT_FALSE(proxy->preflightCheckIfCurrentlyShareableWithCompletion(unread.completion()));
  EXPECT_FALSE(unread.value<0>());
  EXPECT_EQ(unread.value<4>(), failure);
  const Once<bool, Item, QVSharingStrings, QVSharingStrings, NSError> missing("preflight");
  EXPECT_FALSE(makeProxy("d9")->preflightCheckIfCurrentlyShareableWithCompletion(missing.completion()));
  EXPECT_TRUE(missing.value<4>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

TEST_F(QVSharingProxyTest, preparingIsASectionAndNothingElse) {
  proxy->startPreparingForShareWhenForcing(true);
  EXPECT_EQ(lines(), (Lines{opened("startPreparingForShareWhenForcing:"), kEnded}));
  EXPECT_EQ(daemon.calls(), Lines());
}

TEST_F(QVSharingProxyTest, aShareIsFetchedOnceAndKept) {
  const CKShare share = savedShare();
  answerShare(share);
  daemon.replies().hold(kCopy);
  const Once<Share, NSError> first("first");
  const auto progress = proxy->fetchShareWithCompletion(first.completion());
  ASSERT_TRUE(progress);
  EXPECT_TRUE(progress->isCancellable());
  EXPECT_EQ(progress->totalUnitCount(), 1);
  ASSERT_TRUE(daemon.log().waitFor(kCopy));
  EXPECT_EQ(lines(), (Lines{opened("fetchShareWithCompletion:"), kEnded})) << "it ends when the call returns";
  daemon.replies().release(kCopy);
  EXPECT_EQ(first.value<0>(), Share(share));
  EXPECT_FALSE(first.value<1>());
  EXPECT_EQ(progress->totalUnitCount(), 1);
  EXPECT_EQ(progress->completedUnitCount(), 0) << "the completed count stays, deliberately";
  EXPECT_EQ(daemon.calls(), Lines{std::string(kCopy) + "(" + itemURL.description() + ")"});
  EXPECT_EQ(lines().back(), replied(share.description() + ", (null)"));

  capture.clear();
  const Once<Share, NSError> second("second");
  EXPECT_FALSE(proxy->fetchShareWithCompletion(second.completion()));
  EXPECT_EQ(second.calls(), 1) << "at once";
  EXPECT_EQ(second.value<0>(), Share(share));
  EXPECT_EQ(daemon.calls().size(), 1U);
  EXPECT_EQ(lines(),
            (Lines{opened("fetchShareWithCompletion:"), replied(share.description() + ", (null)"), kEnded}));
}

TEST_F(QVSharingProxyTest, aShareThatCameWithAURLIsNotKept) {
  answerShare(savedShare(), NSURL::fileURLWithPath("/b"));
  for (int round = 1; round <= 2; ++round) {
    const Once<Share, NSError> done("fetch");
    EXPECT_TRUE(proxy->fetchShareWithCompletion(done.completion()));
    EXPECT_EQ(done.value<0>(), Share(savedShare()));
    EXPECT_EQ(daemon.log().count(kCopy), static_cast<std::size_t>(round));
  }
}

// What says that there is no share, alone or beneath another error.
TEST_F(QVSharingProxyTest, withoutAShareANewOneIsMadeAndNotKept) {
  const NSError noShare = qvc_error(QVErrorNoShare, "none");
  const NSError unknown = CKErrorMake(CKErrorCode::unknownItem, "no record");
  const NSError wrapped("Domain", 1, {{NSUnderlyingErrorKey, unknown}});
  for (const NSError &error : {noShare, unknown, wrapped}) {
    SCOPED_TRACE(error.description());
    answerShare(wholeShare(), NSURL::fileURLWithPath("/b"));
    daemon.log().clear();
    daemon.replies().failNext(kCopy, error);
    const Once<Share, NSError> done("fetch");
    EXPECT_TRUE(proxy->fetchShareWithCompletion(done.completion()));
    EXPECT_EQ(done.value<0>(), Share(wholeShare()));
    EXPECT_FALSE(done.value<1>());
    const std::string url = "(" + itemURL.description() + ")";
    EXPECT_EQ(daemon.calls(), (Lines{kCopy + url, kCreate + url}));
  }
}

TEST_F(QVSharingProxyTest, aShareThatCantBeMadeIsTheErrorOfMakingIt) {
  const NSError failure("Domain", 3);
  daemon.replies().failNext(kCopy, qvc_error(QVErrorNoShare, "none"));
  daemon.replies().failNext(kCreate, failure);
  const Once<Share, NSError> done("fetch");
  EXPECT_TRUE(proxy->fetchShareWithCompletion(done.completion()));
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(done.value<1>(), failure);
}

TEST_F(QVSharingProxyTest, anyOtherErrorIsTheAnswerWithoutAShareAndIsKeptAllTheSame) {
  const NSError failure("Domain", 20);
  answerShare(savedShare());
  daemon.replies().failNext(kCopy, failure);
  const Once<Share, NSError> done("fetch");
  EXPECT_TRUE(proxy->fetchShareWithCompletion(done.completion()));
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(done.value<1>(), failure);
  // Whether a share is kept goes by the URL, not by the error.
  const Once<Share, NSError> again("again");
  EXPECT_FALSE(proxy->fetchShareWithCompletion(again.completion()));
  EXPECT_EQ(again.value<0>(), Share(savedShare()));
}

TEST_F(QVSharingProxyTest, cancellingTheProgressCancelsTheFetch) {
  daemon.replies().hold(kCopy);
  const Once<Share, NSError> done("fetch");
  const auto progress = proxy->fetchShareWithCompletion(done.completion());
  ASSERT_TRUE(daemon.log().waitFor(kCopy));
  const auto remote = std::make_shared<RecordingCancellable>();
  daemon.sharing().lastOperation()->setRemoteOperationProxy(remote, {});
  progress->cancel();
  EXPECT_TRUE(done.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(remote->log.waitFor("invalidate"));
  daemon.replies().release(kCopy);
}

TEST_F(QVSharingProxyTest, participantsAndPermissionAreTheShares) {
  CKShare share = savedShare();
  share.publicPermission = CKShareParticipantPermission::readWrite;
  answerShare(share);
  const Once<QVShareParticipants, std::int64_t, NSError> done("participants");
  EXPECT_TRUE(proxy->fetchParticipantListAndPublicPermission(done.completion()));
  EXPECT_EQ(done.value<0>(), QVShareParticipants(share.participants));
  EXPECT_EQ(done.value<1>(), 2);
  EXPECT_FALSE(done.value<2>());
  queue->waitUntilAllOperationsAreFinished();
  const std::string participants = LogDescription(QVShareParticipants(share.participants));
  const Lines all = lines();
  ASSERT_EQ(all.size(), 6U);
  EXPECT_EQ(all[0], opened("fetchParticipantListAndPublicPermission:"));
  EXPECT_EQ(all[1], opened("fetchShareWithCompletion:"));
  EXPECT_NE(std::find(all.begin(), all.end(), replied(participants + ", 2, (null)")), all.end());

  const Once<QVShareParticipants, std::int64_t, NSError> kept("kept");
  EXPECT_FALSE(proxy->fetchParticipantListAndPublicPermission(kept.completion())) << "the fetch's progress";
  EXPECT_EQ(kept.value<1>(), 2);
}

TEST_F(QVSharingProxyTest, participantsOfAFailedFetchAreNilAndZero) {
  const NSError failure("Domain", 3);
  daemon.replies().failNext(kCopy, failure);
  const Once<QVShareParticipants, std::int64_t, NSError> done("participants");
  proxy->fetchParticipantListAndPublicPermission(done.completion());
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(done.value<1>(), 0);
  EXPECT_EQ(done.value<2>(), failure);
}

TEST_F(QVSharingProxyTest, theShareURLIsAskedForWithTheDocumentsType) {
  const NSURL shareURL = NSURL::URLWithString("https://drive.example/abc");
  answerShare(savedShare(), shareURL);
  const Once<NSURL, NSError> done("URL");
  const auto progress = proxy->fetchShareURLWithCompletion(done.completion());
  ASSERT_TRUE(progress);
  EXPECT_TRUE(progress->isCancellable());
  EXPECT_EQ(progress->totalUnitCount(), 1);
  EXPECT_EQ(done.value<0>(), shareURL);
  EXPECT_FALSE(done.value<1>());
  EXPECT_EQ(progress->completedUnitCount(), 1);
  EXPECT_EQ(daemon.calls().back(), "startOperation_toCopyShareURLForShare(" + savedShare().description() +
                                       ", " + daemon.item("a")->fields().typeIdentifier + ")");
  EXPECT_EQ(lines().back(), replied(shareURL.description() + ", (null)"));
}

TEST_F(QVSharingProxyTest, withoutATypeThereIsNoURLAndNoOperation) {
  const NSError failure("Domain", 3);
  daemon.replies().failNext("getQueryItemForURL", failure);
  const Once<NSURL, NSError> done("URL");
  EXPECT_FALSE(proxy->fetchShareURLWithCompletion(done.completion()));
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(done.value<1>(), failure);
  EXPECT_EQ(daemon.log().count("startOperation"), 0U);

  const Once<NSURL, NSError> nowhere("URL");
  EXPECT_FALSE(makeProxy("d9")->fetchShareURLWithCompletion(nowhere.completion()));
  EXPECT_TRUE(nowhere.value<1>().is(QVTessalyErrorDomain, QVErrorInvalidArgument));
}

TEST_F(QVSharingProxyTest, savingKeepsFirstTheShareAndThenWhatTheCloudMadeOfIt) {
  const CKShare mine = savedShare();
  CKShare theirs = mine;
  theirs.recordChangeTag = "later";
  answerShare(theirs);
  daemon.replies().hold(kSave);
  const Once<Share, NSError> saved("save");
  const auto progress = proxy->saveShare(mine, saved.completion());
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->totalUnitCount(), 1);
  ASSERT_TRUE(daemon.log().waitFor(kSave));
  const Once<Share, NSError> meanwhile("meanwhile");
  EXPECT_FALSE(proxy->fetchShareWithCompletion(meanwhile.completion()));
  EXPECT_EQ(meanwhile.value<0>(), Share(mine));
  daemon.replies().release(kSave);
  EXPECT_EQ(saved.value<0>(), Share(theirs));
  EXPECT_EQ(progress->completedUnitCount(), 1);
  EXPECT_EQ(daemon.calls(), Lines{std::string(kSave) + "(" + mine.description() + ")"});
  const Once<Share, NSError> after("after");
  EXPECT_FALSE(proxy->fetchShareWithCompletion(after.completion()));
  EXPECT_EQ(after.value<0>(), Share(theirs));
}

TEST_F(QVSharingProxyTest, aFailedSaveForgetsTheShareAndIsToldOf) {
  const NSError conflict = CKErrorMake(CKErrorCode::serverRecordChanged, "changed");
  answerShare(std::nullopt);
  daemon.replies().failNext(kSave, conflict);
  const Once<Share, NSError> saved("save");
  proxy->saveShare(savedShare(), saved.completion());
  EXPECT_FALSE(saved.value<0>());
  EXPECT_EQ(saved.value<1>(), conflict);
  const Once<Share, NSError> after("after");
  EXPECT_TRUE(proxy->fetchShareWithCompletion(after.completion())) << "it is fetched anew";
  after.wait();
}

TEST_F(QVSharingProxyTest, aFoldersShareIsNotSavedAndLeavesWhatIsKept) {
  cache(savedShare());
  const Once<Share, NSError> done("save");
  EXPECT_FALSE(proxy->saveShare(savedShare(QVFolderShareType), done.completion()));
  EXPECT_FALSE(done.value<0>());
  EXPECT_TRUE(done.value<1>().is(NSPOSIXErrorDomain, 45));
  EXPECT_EQ(done.value<1>().localizedDescription(), "operation not supported");
  EXPECT_EQ(daemon.calls(), Lines());
  const Once<Share, NSError> kept("kept");
  EXPECT_FALSE(proxy->fetchShareWithCompletion(kept.completion()));
  EXPECT_EQ(kept.value<0>(), Share(savedShare()));
}

TEST_F(QVSharingProxyTest, aSaveIsCancelledByItsProgress) {
  daemon.replies().hold(kSave);
  const Once<Share, NSError> saved("save");
  const auto progress = proxy->saveShare(savedShare(), saved.completion());
  ASSERT_TRUE(daemon.log().waitFor(kSave));
  progress->cancel();
  EXPECT_TRUE(saved.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon.replies().release(kSave);
}

TEST_F(QVSharingProxyTest, unsharingAKeptShareIsUnderWayAtOnceAndForgetsIt) {
  cache(savedShare());
  daemon.replies().hold(kUnshare);
  const Once<NSError> done("unshare");
  const auto progress = proxy->unshareWithCompletion(done.completion());
  ASSERT_TRUE(progress);
  EXPECT_EQ(progress->totalUnitCount(), 2);
  EXPECT_EQ(progress->completedUnitCount(), 1) << "the fetch ended at once";
  ASSERT_TRUE(daemon.log().waitFor(kUnshare));
  daemon.replies().release(kUnshare);
  EXPECT_FALSE(done.value<0>());
  EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() == 2; }));
  EXPECT_EQ(daemon.calls(), Lines{std::string(kUnshare) + "(" + savedShare().description() + ", no)"});
  const Once<Share, NSError> again("again");
  EXPECT_TRUE(proxy->fetchShareWithCompletion(again.completion())) << "it isn't kept any more";
  again.wait();
}

TEST_F(QVSharingProxyTest, unsharingAKeptShareIsCancelledByItsProgress) {
  cache(savedShare());
  daemon.replies().hold(kUnshare);
  const Once<NSError> done("unshare");
  const auto progress = proxy->unshareWithCompletion(done.completion());
  ASSERT_TRUE(daemon.log().waitFor(kUnshare));
  progress->cancel();
  EXPECT_TRUE(done.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon.replies().release(kUnshare);
}

TEST_F(QVSharingProxyTest, unsharingFetchesTheShareFirstAndThatIsCancelledToo) {
  daemon.replies().hold(kCopy);
  const Once<NSError> done("unshare");
  const auto progress = proxy->unshareWithCompletion(done.completion());
  ASSERT_TRUE(daemon.log().waitFor(kCopy));
  EXPECT_EQ(progress->completedUnitCount(), 0);
  progress->cancel();
  EXPECT_TRUE(done.value<0>().is(QVTessalyErrorDomain, QVErrorCancelled));
  daemon.replies().release(kCopy);
  EXPECT_EQ(daemon.log().count(kUnshare), 0U);
}

TEST_F(QVSharingProxyTest, aShareThatIsNotKnownToTheServerIsUnsharedAlready) {
  CKShare unsaved = savedShare();
  unsaved.recordChangeTag = "";
  answerShare(unsaved);
  const Once<NSError> done("unshare");
  const auto progress = proxy->unshareWithCompletion(done.completion());
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(progress->completedUnitCount(), 0);
  EXPECT_EQ(progress->totalUnitCount(), 2);
  EXPECT_EQ(daemon.log().count(kUnshare), 0U);
}

TEST_F(QVSharingProxyTest, anErrorOfTheFetchIsTheUnsharings) {
  const NSError failure("Domain", 3);
  daemon.replies().failNext(kCopy, failure);
  const Once<NSError> done("unshare");
  proxy->unshareWithCompletion(done.completion());
  EXPECT_EQ(done.value<0>(), failure);
}

TEST_F(QVSharingProxyTest, aFoldersShareIsWithdrawnOnAFolderAlone) {
  answerShare(savedShare(QVFolderShareType));
  const Once<NSError> refused("refused");
  proxy->unshareWithCompletion(refused.completion());
  EXPECT_TRUE(refused.value<0>().is(NSPOSIXErrorDomain, 45));
  EXPECT_EQ(daemon.log().count(kUnshare), 0U);

  proxy = makeProxy("i5");
  const Once<NSError> done("unshare");
  proxy->unshareWithCompletion(done.completion());
  EXPECT_FALSE(done.value<0>());
  EXPECT_EQ(daemon.log().count(kUnshare), 1U);
}

TEST_F(QVSharingProxyTest, aDaemonThatGoesAnswersEachCallOnce) {
  const NSError lost(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  for (const char *call : {kCopy, kSave}) daemon.replies().hold(call);
  const Once<Share, NSError> fetch("fetch"), save("save");
  const Once<NSError> unshare("unshare");
  proxy->unshareWithCompletion(unshare.completion());
  proxy->fetchShareWithCompletion(fetch.completion());
  proxy->saveShare(savedShare(), save.completion());
  ASSERT_TRUE(daemon.log().waitFor(kCopy, 2));
  ASSERT_TRUE(daemon.log().waitFor(kSave));
  fake.connection->loseDaemon(lost);
  EXPECT_EQ(fetch.value<1>(), lost);
  EXPECT_EQ(save.value<1>(), lost);
  EXPECT_EQ(unshare.value<0>(), lost);
  daemon.replies().dropHeld();
}

TEST_F(QVSharingProxyTest, manyCallsAtOnceAreAnsweredOnceEach) {
  answerShare(savedShare());
  daemon.replies().answerOnAnotherThread(true);
  std::atomic<int> replies{0};
  constexpr int kRounds = 200;
  for (int round = 0; round < kRounds; ++round) {
    const auto progress =
        proxy->fetchShareWithCompletion([&replies](const Share &, const NSError &) { ++replies; });
    proxy->saveShare(savedShare(), [&replies](const Share &, const NSError &) { ++replies; });
    const auto unsharing = proxy->unshareWithCompletion([&replies](const NSError &) { ++replies; });
    if (round % 3 == 0 && progress) progress->cancel();
    if (round % 4 == 0) unsharing->cancel();
  }
  EXPECT_TRUE(eventually([&replies] { return replies == 3 * kRounds; })) << replies;
}

}  // namespace
}  // namespace droxa
