#include "additions/NSError+QVFPAdditions.h"
#include "tessaly/QVContainer.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class UntrashItem : public ActionTest {
 protected:
  void untrash(const std::string &identifier, const std::optional<std::string> &parent,
               const ItemAnswer &answer) {
    extension->untrashItemWithIdentifier(identifier, parent, answer.completion());
  }
  std::string called(const NSURL &to) const {
    return "reparentUnderFolder(" + trashed.path() + ", " + to.path() + ", allowBouncing 1)";
  }
  Lines begun() const {
    return joined({{opened(1) + "untrashing item " + item},
                   urlLines(2, item, trashed),
                   {"debug: [DEBUG] untrashing from url: " + trashed.description()}});
  }
  static std::string to(const NSURL &url) { return "debug: [DEBUG] untrashing item to " + url.description(); }
  static std::string was(const NSURL &url) {
    return "debug: [DEBUG] item was untrashed to " + url.description();
  }
  static std::string putBack(const NSURL &url) {
    return "debug: [DEBUG] untrash with putback url: " + url.description();
  }
  const std::string kFallback = "debug: [DEBUG] couldn't use putback url, fallback to default container";

  const NSURL trash =
      NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/" + QVUbiquitousTrashContainerID + "/" +
                             QVDocumentsFolderName(QVUbiquitousTrashContainerID));
  const NSURL trashed = trash.URLByAppendingPathComponent("old.txt");
  const std::string item = daemon.addDocument(trashed.path()).asString();
  const bool cleared = (clear(), true);
};

TEST_F(UntrashItem, goesToTheFolderThatIsGiven) {
  daemon.addDocument("f/old.txt");
  clear();
  operations.answer(at("f/old.txt"));
  const ItemAnswer answer("untrash");
  untrash(item, folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectItem(answer, "f/old.txt");
  EXPECT_EQ(operations.calls(), Lines{called(at("f"))});
  EXPECT_TRUE(operations.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(logged(), joined({begun(),
                              urlLines(3, folder, at("f")),
                              {to(at("f")), was(at("f/old.txt"))},
                              itemLines(4, at("f/old.txt"), daemon.item("f/old.txt")),
                              {closed(1)}}));
}

TEST_F(UntrashItem, returnsBeforeItIsDone) {
  daemon.addDocument("f/old.txt");
  operations.hold();
  operations.answer(at("f/old.txt"));
  clear();
  const ItemAnswer answer("untrash");
  untrash(item, folder, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged().back(), closed(1));
  operations.release();
  expectItem(answer, "f/old.txt");
}

TEST_F(UntrashItem, withoutAFolderGoesToWhereItWas) {
  std::filesystem::create_directories(at("f").path());
  daemon.addDocument("f/old.txt");
  clear();
  actions.putBack() = at("f/old.txt");
  operations.answer(at("f/old.txt"));
  const ItemAnswer answer("untrash");
  untrash(item, std::nullopt, answer);
  expectItem(answer, "f/old.txt");
  EXPECT_EQ(actions.calls(), Lines{"putBack(" + trashed.path() + ")"});
  EXPECT_EQ(operations.calls(), Lines{called(at("f"))});
  EXPECT_EQ(logged(), joined({begun(),
                              {putBack(at("f/old.txt")), to(at("f")), was(at("f/old.txt"))},
                              itemLines(3, at("f/old.txt"), daemon.item("f/old.txt")),
                              {closed(1)}}));
}

TEST_F(UntrashItem, aFolderThatIsUnknownIsAsNone) {
  std::filesystem::create_directories(at("f").path());
  actions.putBack() = at("f/old.txt");
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("untrash");
  untrash(item, kUnknown, answer);
  EXPECT_EQ(operations.calls(), Lines{called(at("f"))});
}

TEST_F(UntrashItem, whoseFolderIsGoneGoesToItsContainersDocuments) {
  actions.putBack() = at("gone/old.txt");
  const NSURL documents = trash;
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("untrash");
  untrash(item, std::nullopt, answer);
  EXPECT_EQ(operations.calls(), Lines{called(documents)});
  const Lines lines = logged();
  const auto at = std::find(lines.begin(), lines.end(), kFallback);
  ASSERT_NE(at, lines.end());
  EXPECT_EQ(*(at - 1), putBack(actions.putBack()));
  EXPECT_EQ(*(at + 1), to(documents));
}

TEST_F(UntrashItem, withoutAPlaceToPutItBackGoesToItsContainersDocuments) {
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("untrash");
  untrash(item, std::nullopt, answer);
  EXPECT_EQ(operations.calls(), Lines{called(trash)});
  EXPECT_TRUE(capture.contains("[DEBUG] untrash with putback url: (null)"));
}

TEST_F(UntrashItem, withoutAnyPlaceNamesTheFolderThatWasGiven) {
  for (const std::optional<std::string> &parent : {std::optional(kUnknown), std::optional<std::string>()}) {
    clear();
    // The item's URL is known, the containers aren't.
    QVContainerCache::forget();
    daemon.replies().failNext("getContainers", NSError::errorWithPOSIXCode(5));
    daemon.replies().failNext("getContainers", NSError::errorWithPOSIXCode(5));
    const ItemAnswer answer("untrash");
    untrash(item, parent, answer);
    EXPECT_EQ(answer.calls(), 1);
    expectError(answer, noSuchItem(parent.value_or("")));
    EXPECT_EQ(logged().back(), closed(1));
    EXPECT_EQ(operations.calls(), Lines{});
  }
}

TEST_F(UntrashItem, ofAnUnknownItemTouchesNothing) {
  const ItemAnswer answer("untrash");
  untrash(kUnknown, folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(logged(),
            joined({{opened(1) + "untrashing item " + kUnknown}, unknownLines(2, kUnknown), {closed(1)}}));
}

TEST_F(UntrashItem, aFailureOfTheMoveIsToldTranslated) {
  const NSError failure(NSCocoaErrorDomain, 4354);
  operations.fail(failure);
  const ItemAnswer answer("untrash");
  untrash(item, folder, answer);
  expectError(answer, qv_fileProviderError(failure));
  EXPECT_EQ(logged(), joined({begun(),
                              urlLines(3, folder, at("f")),
                              {to(at("f")),
                               "error: [ERROR] error untrashing item to " + at("f").description() + ": " +
                                   failure.description(),
                               closed(1)}}));
}

// The name that bouncing chose is the framework's answer.
TEST_F(UntrashItem, toATakenNameIsTheItemUnderItsOtherName) {
  daemon.addDocument("f/old.txt");
  daemon.addDocument("f/old 2.txt");
  operations.answer(at("f/old 2.txt"));
  const ItemAnswer answer("untrash");
  untrash(item, folder, answer);
  expectItem(answer, "f/old 2.txt");
}

TEST_F(UntrashItem, anItemThatIsNotFoundAfterwardsIsTheLookupsError) {
  operations.answer(at("f/old.txt"));
  const ItemAnswer answer("untrash");
  untrash(item, folder, answer);
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

}  // namespace
}  // namespace droxa
