#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ProvidingFixture.h"

namespace droxa {
namespace {

class StartProviding : public ProvidingTest {
 protected:
  // Expects a start to be granted at once, with no word to the daemon; the lines that it logs.
  Lines granted(const NSURL &url, std::uint64_t options = 0) {
    const Once<NSError> done("completion");
    extension->startProvidingItemAtURL(url, options, done.completion());
    EXPECT_EQ(done.calls(), 1);
    EXPECT_EQ(done.value<0>(), NSError());
    EXPECT_EQ(asked(), Lines{});
    return logged();
  }
  // Expects a start to be a download of the URL.
  void expectDownload(const NSURL &url, std::uint64_t options = 0) {
    const Once<NSError> done("completion");
    start(url, done, options);
    EXPECT_EQ(daemon.log().count("startDownloadAtURL(" + url.path() + ", options 1)"), 1U);
    EXPECT_FALSE(done.called());
    daemon.replies().release("download");
    EXPECT_EQ(done.value<0>(), NSError());
  }
};

TEST_F(StartProviding, aURLOutsideTheSyncedLocationsIsGrantedWithoutALog) {
  for (const NSURL &url :
       {NSURL(), NSURL::fileURLWithPath("/etc/passwd"), NSURL::URLWithString("https://example.com/a")})
    EXPECT_EQ(granted(url, 0x20000), Lines{});
}

TEST_F(StartProviding, aFileThatIsHereIsGrantedAndItsSectionStaysOpen) {
  const NSURL url = onDisk("here");
  EXPECT_EQ(granted(url), (Lines{starting(url, 1), "debug: [DEBUG] url exists, granting the read"}));
}

TEST_F(StartProviding, aPackageThatIsHereIsGranted) {
  const NSURL url = folderOnDisk("notes.rtfd");
  EXPECT_EQ(granted(url, 1), (Lines{starting(url, 1, "0x1 (without changes)"),
                                    "debug: [DEBUG] url exists, granting the read"}));
}

TEST_F(StartProviding, aFolderThatIsNoPackageIsDownloaded) {
  daemon.addFolder("f");
  daemon.addDatalessDocument("f/b");
  clear();
  expectDownload(folderOnDisk("f"));
}

TEST_F(StartProviding, theOptionsMayForceADownloadOfWhatIsHere) {
  const NSURL url = onDisk("a");
  expectDownload(url, 0x20000);
  EXPECT_EQ(logged()[0], starting(url, 1, "0x20000 (forced download)"));
}

TEST_F(StartProviding, aURLThatIsNotReachableIsDownloaded) {
  const NSURL url = at("a");
  const Once<NSError> done("completion");
  start(url, done);
  daemon.finishDownload("a");
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(loggedUntil(closed(1)), (Lines{starting(url, 1), ended(1, NSError()), closed(1)}));
}

TEST_F(StartProviding, aPromiseURLIsDownloadedAfterAComplaint) {
  const NSURL url = onDisk(".gone.droxafault");
  daemon.addDatalessDocument(".gone.droxafault");
  clear();
  const Once<NSError> done("completion");
  start(url, done);
  daemon.replies().release("download");
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(loggedUntil(closed(1)),
            (Lines{starting(url, 1),
                   "error: [ERROR] Someone tries to coordinate at the side fault URL '" + url.description() +
                       "', odd, but allow it",
                   ended(1, NSError()), closed(1)}));
}

TEST_F(StartProviding, withoutOptionsTheyAreNone) {
  const Once<NSError> done("completion");
  extension->startProvidingItemAtURL(at("a"), done.completion());
  ASSERT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
  daemon.finishDownload("a");
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(logged()[0], starting(at("a"), 1));
}

TEST_F(StartProviding, aDownloadThatFailsIsTranslated) {
  struct Translation {
    NSError daemons;
    std::int64_t code;
  };
  for (const auto &[daemons, code] :
       {Translation{NSError(NSCocoaErrorDomain, 4354), NSFileProviderErrorInsufficientQuota},
        Translation{NSError(NSCocoaErrorDomain, 4355), NSFileProviderErrorServerUnreachable},
        Translation{qvc_errorLoggedOut(), NSFileProviderErrorNotAuthenticated},
        Translation{qvc_errorNoSuchItem("a"), NSFileProviderErrorNoSuchItem}}) {
    clear();
    const Once<NSError> done("completion");
    start(at("a"), done);
    daemon.failDownload("a", daemons);
    EXPECT_TRUE(done.value<0>().is(NSFileProviderErrorDomain, code)) << done.value<0>().description();
    EXPECT_EQ(done.value<0>().underlyingError(), daemons);
    EXPECT_EQ(loggedUntil(closed(1)), (Lines{starting(at("a"), 1), ended(1, daemons), closed(1)}));
  }
}

TEST_F(StartProviding, anErrorWithoutATranslationPassesThrough) {
  for (const NSError &error :
       {NSError::errorWithPOSIXCode(28), qvc_error(QVErrorChecksumMismatch, "other bytes came")}) {
    const Once<NSError> done("completion");
    start(at("a"), done);
    daemon.failDownload("a", error);
    EXPECT_EQ(done.value<0>(), error);
  }
}

TEST_F(StartProviding, aDaemonThatGoesEndsIt) {
  const NSError broken(NSCocoaErrorDomain, NSXPCConnectionInterrupted);
  const Once<NSError> done("completion");
  start(at("a"), done);
  fake.connection->breakOff(broken);
  EXPECT_EQ(done.value<0>(), broken);
  EXPECT_EQ(loggedUntil(closed(1)), (Lines{starting(at("a"), 1), ended(1, broken), closed(1)}));
}

TEST_F(StartProviding, aSecondStartForThePathIsAFaultAndBothRun) {
  const NSURL url = at("a");
  const Once<NSError> first("first");
  const Once<NSError> second("second");
  start(url, first);
  start(url, second);
  EXPECT_EQ(daemon.interests("a"), 2U);
  EXPECT_EQ(logged(), (Lines{starting(url, 1), starting(url, 2),
                             "fault: [CRIT] Assertion failed: _downloadOperationByPath[path] == nil"}));
  clear();
  daemon.finishDownload("a");
  EXPECT_EQ(first.value<0>(), NSError());
  EXPECT_EQ(second.value<0>(), NSError());
  EXPECT_TRUE(eventually([this] {
    return capture.contains("[CRIT] Assertion failed: self->_downloadOperationByPath[path]") &&
           logged().size() == 5;
  }));
}

TEST_F(StartProviding, thePathIsFreeAgainAfterTheEnd) {
  for (int time = 0; time < 2; ++time) {
    const Once<NSError> done("completion");
    start(at("a"), done);
    daemon.failDownload("a", NSError::errorWithPOSIXCode(5));
    done.wait();
  }
  EXPECT_EQ(faults(), Lines{});
}

TEST_F(StartProviding, theCompletionRunsBeforeTheSectionIsClosed) {
  Lines before;
  const Once<NSError> done("completion");
  extension->startProvidingItemAtURL(at("a"), [&](const NSError &error) {
    before = logged();
    done.completion()(error);
  });
  ASSERT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
  daemon.finishDownload("a");
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(before, (Lines{starting(at("a"), 1), ended(1, NSError())}));
}

TEST_F(StartProviding, aStartFromACompletionFindsThePathFree) {
  const Once<NSError> again("completion");
  extension->startProvidingItemAtURL(at("a"), [&](const NSError &) {
    extension->startProvidingItemAtURL(at("a"), 0x20000, again.completion());
  });
  ASSERT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
  daemon.finishDownload("a");
  EXPECT_EQ(again.value<0>(), NSError());
  EXPECT_EQ(faults(), Lines{});
}

}  // namespace
}  // namespace droxa
