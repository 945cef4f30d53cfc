#include <cerrno>

#include "additions/NSError+QVFPAdditions.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVMoveCapability.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class ReparentItem : public ActionTest {
 protected:
  ReparentItem() { daemon.replies().hold("download"); }

  void reparent(const std::string &identifier, const std::string &parent, const ItemAnswer &answer,
                const std::optional<std::string> &newName = std::nullopt) {
    extension->reparentItemWithIdentifier(identifier, parent, newName, answer.completion());
  }
  // "a.txt" is dataless and its move needs its contents, from the test's own words on.
  void needContents() {
    daemon.remove("a.txt");
    dataless = daemon.addDatalessDocument("a.txt", 10).asString();
    daemon.setMoveCapability(QVMoveDatalessAcrossContainers);
    clear();
  }
  // Sets the move going, up to the daemon's wait.
  void startDownload(const ItemAnswer &answer) {
    reparent(dataless, folder, answer);
    ASSERT_TRUE(daemon.log().waitFor("transfer 1: waitWithReply"));
  }
  bool isForced() {
    capture.clear();
    extension->stopProvidingItemAtURL(at("a.txt"));
    return capture.contains("[WARNING] Can't cancel download of " + at("a.txt").path() +
                            " which is downloading for CZM");
  }
  std::string called(const std::string &newName = "nil") const {
    return "reparentUnderFolder(" + at("a.txt").path() + ", " + at("f").path() + ", withNewName " + newName +
           ")";
  }
  std::string askedCapability() const {
    return "getMoveCapability(" + at("a.txt").path() + ", " + at("f/a.txt").path() + ")";
  }
  Lines begun(const std::string &identifier) const {
    return joined({{opened(1) + "reparenting " + identifier + " under " + folder},
                   urlLines(2, identifier, at("a.txt")),
                   urlLines(3, folder, at("f")),
                   {"debug: [DEBUG] reparenting url " + at("a.txt").description() + " under " +
                    at("f").description()}});
  }
  std::string refused(const NSError &error) const {
    return "error: [ERROR] can't move " + at("a.txt").description() + " to " + at("f").description() + "; " +
           error.description();
  }
  static NSError invalidMove() {
    return NSError(
        NSCocoaErrorDomain, 512,
        NSUserInfo{{NSUnderlyingErrorKey,
                    NSError::errorWithPOSIXCode(13, "The move between those locations is invalid")}});
  }

  std::string dataless;
};

TEST_F(ReparentItem, isDoneByTheFrameworkAndDescribedAnew) {
  daemon.addDocument("f/a.txt");
  clear();
  operations.answer(at("f/a.txt"));
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectItem(answer, "f/a.txt");
  EXPECT_EQ(operations.calls(), Lines{called()});
  EXPECT_TRUE(operations.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(logged(), joined({begun(document),
                              {gotNewURL(at("f/a.txt"))},
                              itemLines(4, at("f/a.txt"), daemon.item("f/a.txt")),
                              {closed(1)}}));
  EXPECT_EQ(asked().back(), lookedAt("f/a.txt"));
  EXPECT_EQ(daemon.log().count("startDownloadAtURL"), 0U);
}

TEST_F(ReparentItem, returnsBeforeItIsDone) {
  daemon.addDocument("f/a.txt");
  clear();
  operations.hold();
  operations.answer(at("f/a.txt"));
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged(), joined({begun(document), {closed(1)}}));
  operations.release();
  expectItem(answer, "f/a.txt");
}

TEST_F(ReparentItem, withANewNameAsksAboutTheOldOneAtTheDestination) {
  daemon.addDocument("f/b.txt");
  clear();
  operations.answer(at("f/b.txt"));
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer, "b.txt");
  expectItem(answer, "f/b.txt");
  EXPECT_EQ(operations.calls(), Lines{called("b.txt")});
  EXPECT_EQ(daemon.log().count(askedCapability()), 1U);
}

TEST_F(ReparentItem, ofAnAliasMovesTheAlias) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("reparent");
  reparent(alias, folder, answer);
  EXPECT_EQ(operations.calls(), Lines{"reparentUnderFolder(" + at("alias").path() + ", " + at("f").path() +
                                      ", withNewName nil)"});
}

TEST_F(ReparentItem, ofAnUnknownItemTouchesNothing) {
  const ItemAnswer answer("reparent");
  reparent(kUnknown, folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(logged(), joined({{opened(1) + "reparenting " + kUnknown + " under " + folder},
                              unknownLines(2, kUnknown),
                              {closed(1)}}));
  EXPECT_EQ(operations.calls(), Lines{});
}

TEST_F(ReparentItem, toAnUnknownFolderNamesTheFolder) {
  const ItemAnswer answer("reparent");
  reparent(document, kUnknown, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(logged(), joined({{opened(1) + "reparenting " + document + " under " + kUnknown},
                              urlLines(2, document, at("a.txt")),
                              unknownLines(3, kUnknown),
                              {closed(1)}}));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(daemon.log().count("getMoveCapability"), 0U);
}

TEST_F(ReparentItem, isAllowedByEachBitThatAllowsAndByNoOther) {
  for (unsigned bit = 0; bit < 32; ++bit) {
    const std::uint64_t capability = std::uint64_t{1} << bit;
    if (capability & QVMoveNeedsContents) continue;
    daemon.setMoveCapability(capability);
    const bool isAllowed = (0x35fbU >> bit) & 1U;
    const NSError moved = fileError(NSFileWriteOutOfSpaceError);
    if (isAllowed) operations.fail(moved);
    const ItemAnswer answer("reparent");
    reparent(document, folder, answer);
    expectError(answer, isAllowed ? moved : invalidMove());
  }
}

TEST_F(ReparentItem, thatIsRefusedWithoutAnErrorGetsOne) {
  daemon.setMoveCapability(0xca04);
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, invalidMove());
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(logged(), joined({begun(document), {refused(invalidMove()), closed(1)}}));
}

TEST_F(ReparentItem, thatIsRefusedWithAnErrorTellsThatTranslated) {
  const NSError failure(QVTessalyErrorDomain, 14);
  daemon.replies().failNext("getMoveCapability", failure);
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  expectError(answer, qv_fileProviderError(failure));
  EXPECT_EQ(answer.value<1>().underlyingError(), failure);
  EXPECT_EQ(logged(), joined({begun(document), {refused(failure), closed(1)}}));
}

TEST_F(ReparentItem, aFailureOfTheMoveIsToldTranslated) {
  const NSError failure(NSCocoaErrorDomain, 4354);
  operations.fail(failure);
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  expectError(answer, qv_fileProviderError(failure));
  EXPECT_EQ(logged(), joined({begun(document), {gotNewURL(NSURL(), failure), closed(1)}}));
}

TEST_F(ReparentItem, aNameThatIsTakenNamesTheItemInTheWay) {
  daemon.addDocument("f/a.txt");
  operations.fail(collisionAt(at("f/a.txt")));
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision));
}

TEST_F(ReparentItem, anItemThatIsNotFoundAfterwardsIsTheLookupsError) {
  operations.answer(at("f/a.txt"));
  const ItemAnswer answer("reparent");
  reparent(document, folder, answer);
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

TEST_F(ReparentItem, ofWhatIsNotHereDownloadsItFirst) {
  needContents();
  operations.answer(at("f/b.txt"));
  daemon.addDocument("f/b.txt");
  clear();
  const ItemAnswer answer("reparent");
  startDownload(answer);
  EXPECT_EQ(logged(), joined({begun(dataless),
                              {"debug: [DEBUG] Taking coordinated read on source url " + at("a.txt").path() +
                                   " because it needs downloading",
                               closed(1)}}));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_FALSE(answer.called());

  capture.clear();
  daemon.finishDownload("a.txt");
  expectItem(answer, "f/b.txt");
  EXPECT_EQ(operations.calls(), Lines{called()});
  EXPECT_EQ(logLines(capture)[0],
            "debug: [DEBUG] Finished providing " + at("a.txt").description() + " with error (null)");
  EXPECT_EQ(logLines(capture)[1], gotNewURL(at("f/b.txt")));
}

TEST_F(ReparentItem, isForcedForAsLongAsItsDownloadTakes) {
  needContents();
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("reparent");
  startDownload(answer);
  EXPECT_TRUE(isForced());
  EXPECT_TRUE(daemon.isDownloading("a.txt"));
  daemon.finishDownload("a.txt");
  EXPECT_TRUE(answer.wait());
  EXPECT_TRUE(eventually([this] { return !isForced(); }));
}

TEST_F(ReparentItem, isNoLongerForcedWhenItsDownloadFails) {
  needContents();
  const ItemAnswer answer("reparent");
  startDownload(answer);
  EXPECT_TRUE(isForced());
  daemon.failDownload("a.txt", NSError(QVTessalyErrorDomain, 14));
  EXPECT_TRUE(answer.wait());
  EXPECT_TRUE(eventually([this] { return !isForced(); }));
}

TEST_F(ReparentItem, aDownloadThatFailsIsToldAsItStands) {
  needContents();
  const ItemAnswer answer("reparent");
  startDownload(answer);
  const NSError failure(QVTessalyErrorDomain, 14);
  daemon.failDownload("a.txt", failure);
  expectError(answer, failure);
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_TRUE(capture.contains("[DEBUG] Finished providing " + at("a.txt").description() + " with error " +
                               failure.description()));
}

TEST_F(ReparentItem, needsContentsForEachBitThatSaysSo) {
  for (unsigned bit = 0; bit < 16; ++bit) {
    const std::uint64_t capability = std::uint64_t{1} << bit;
    if (!((0x243aU >> bit) & 1U)) continue;
    daemon.setMoveCapability(capability);
    const NSError failure = NSError::errorWithPOSIXCode(EIO);
    daemon.replies().failNext("startDownloadAtURL", failure);
    const ItemAnswer answer("reparent");
    reparent(document, folder, answer);
    // Bits of the second mask all lie in the first.
    expectError(answer, failure);
  }
  EXPECT_EQ(operations.calls(), Lines{});
}

TEST_F(ReparentItem, theDownloadHasAQueueOfItsOwnWhichOutlivesTheCall) {
  needContents();
  const ItemAnswer answer("reparent");
  startDownload(answer);
  daemon.failDownload("a.txt", NSError::errorWithPOSIXCode(EIO));
  expectError(answer, NSError::errorWithPOSIXCode(EIO));
}

TEST_F(ReparentItem, aWatchedDownloadReportsAndIsCancelledWithItsProgress) {
  needContents();
  const auto progress = std::make_shared<NSProgress>();
  const ItemAnswer answer("reparent");
  {
    const NSCurrentProgress current(progress);
    startDownload(answer);
  }
  daemon.progressDownload("a.txt", 4);
  EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() == 4; }));
  EXPECT_EQ(progress->totalUnitCount(), 10);
  progress->cancel();
  EXPECT_TRUE(answer.value<1>().is(QVTessalyErrorDomain, QVErrorCancelled));
  EXPECT_TRUE(daemon.log().waitFor("transfer 1: cancel"));
  EXPECT_EQ(operations.calls(), Lines{});
}

TEST_F(ReparentItem, theMoveAfterADownloadHasTheProgressOfTheCall) {
  needContents();
  operations.fail(fileError(NSFileWriteUnknownError));
  const auto progress = std::make_shared<NSProgress>();
  const ItemAnswer answer("reparent");
  {
    const NSCurrentProgress current(progress);
    startDownload(answer);
  }
  daemon.finishDownload("a.txt");
  EXPECT_TRUE(answer.wait());
  EXPECT_EQ(operations.progress(), progress);
}

}  // namespace
}  // namespace droxa
