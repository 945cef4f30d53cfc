#include "additions/NSError+QVFPAdditions.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class RenameItem : public ActionTest {
 protected:
  void rename(const std::string &identifier, const ItemAnswer &answer) {
    extension->renameItemWithIdentifier(identifier, "b.txt", answer.completion());
  }
  static std::string renaming(const std::string &identifier) {
    return opened(1) + "renaming " + identifier + " to b.txt";
  }
  static std::string sourceURL(const NSURL &url) { return "debug: [DEBUG] source URL: " + url.description(); }
  Lines until(const NSURL &newURL, const NSError &error) const {
    return joined({{renaming(document)},
                   urlLines(2, document, at("a.txt")),
                   {sourceURL(at("a.txt")), gotNewURL(newURL, error)}});
  }
};

TEST_F(RenameItem, isDoneByTheFrameworkAndDescribedAnew) {
  daemon.addDocument("b.txt");
  clear();
  operations.answer(at("b.txt"));
  const ItemAnswer answer("rename");
  rename(document, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectItem(answer, "b.txt");
  EXPECT_EQ(operations.calls(), Lines{"renameWithNewName(" + at("a.txt").path() + ", b.txt)"});
  EXPECT_TRUE(operations.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(asked().back(), lookedAt("b.txt"));
  EXPECT_EQ(logged(),
            joined({until(at("b.txt"), {}), itemLines(3, at("b.txt"), daemon.item("b.txt")), {closed(1)}}));
}

TEST_F(RenameItem, returnsBeforeItIsDone) {
  daemon.addDocument("b.txt");
  clear();
  operations.hold();
  operations.answer(at("b.txt"));
  const ItemAnswer answer("rename");
  rename(document, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged().back(), closed(1));
  operations.release();
  expectItem(answer, "b.txt");
}

TEST_F(RenameItem, ofAnAliasRenamesItsTarget) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  operations.fail(fileError(NSFileWriteUnknownError));
  const ItemAnswer answer("rename");
  rename(alias, answer);
  EXPECT_EQ(operations.calls(), Lines{"renameWithNewName(" + at("target").path() + ", b.txt)"});
}

TEST_F(RenameItem, ofAnUnknownItemTouchesNothing) {
  const ItemAnswer answer("rename");
  rename(kUnknown, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(logged(),
            joined({{renaming(kUnknown)}, unknownLines(2, kUnknown), {sourceURL(NSURL()), closed(1)}}));
}

TEST_F(RenameItem, aFailureOfTheFilesIsTold) {
  const NSError failure = fileError(NSFileWriteInvalidFileNameError);
  operations.fail(failure);
  const ItemAnswer answer("rename");
  rename(document, answer);
  expectError(answer, failure);
  EXPECT_EQ(logged(), joined({until(NSURL(), failure), {closed(1)}}));
}

TEST_F(RenameItem, anErrorOfTheServiceIsTranslated) {
  const NSError failure(NSCocoaErrorDomain, 4355);
  operations.fail(failure);
  const ItemAnswer answer("rename");
  rename(document, answer);
  expectError(answer, qv_fileProviderError(failure));
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable));
}

TEST_F(RenameItem, aNameThatIsTakenNamesTheItemInTheWay) {
  daemon.addDocument("b.txt");
  operations.fail(collisionAt(at("b.txt")));
  const ItemAnswer answer("rename");
  rename(document, answer);
  const NSError error = answer.value<1>();
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision));
  EXPECT_TRUE(error.userInfo().contains(NSFileProviderErrorCollidingItemKey));
}

TEST_F(RenameItem, anItemThatIsNotFoundAfterwardsIsTheLookupsError) {
  operations.answer(at("b.txt"));
  const ItemAnswer answer("rename");
  rename(document, answer);
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

}  // namespace
}  // namespace droxa
