#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

const NSURL kSource = NSURL::fileURLWithPath("/home/vera/new.txt");

class ImportDocument : public ActionTest {
 protected:
  void import(const std::string &parent, const ItemAnswer &answer) {
    extension->importDocumentAtURL(kSource, parent, answer.completion());
  }
  std::string importing(int section, const NSURL &parent) const {
    return opened(section) + "importing document at " + kSource.description() + " to " + parent.description();
  }
  std::string called() const { return "importUnderFolder(" + kSource.path() + ", " + at("f").path() + ")"; }
};

TEST_F(ImportDocument, isDoneByTheFrameworkAndDescribedAnew) {
  daemon.addDocument("f/new.txt", 5);
  clear();
  operations.answer(at("f/new.txt"));
  const ItemAnswer answer("import");
  import(folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectItem(answer, "f/new.txt");
  EXPECT_EQ(operations.calls(), Lines{called()});
  EXPECT_EQ(asked().back(), lookedAt("f/new.txt"));
  EXPECT_EQ(logged(), joined({urlLines(1, folder, at("f")),
                              {importing(2, at("f")), gotNewURL(at("f/new.txt"))},
                              itemLines(3, at("f/new.txt"), daemon.item("f/new.txt")),
                              {closed(2)}}));
}

TEST_F(ImportDocument, returnsBeforeItIsDone) {
  daemon.addDocument("f/new.txt", 5);
  clear();
  operations.hold();
  operations.answer(at("f/new.txt"));
  const ItemAnswer answer("import");
  import(folder, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged(), joined({urlLines(1, folder, at("f")), {importing(2, at("f")), closed(2)}}));
  operations.release();
  expectItem(answer, "f/new.txt");
}

TEST_F(ImportDocument, intoAnUnknownFolderTouchesNothing) {
  const ItemAnswer answer("import");
  import(kUnknown, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(logged(), joined({unknownLines(1, kUnknown), {importing(2, NSURL()), closed(2)}}));
}

TEST_F(ImportDocument, intoTheRootGoesToItsDocumentsFolder) {
  daemon.addDocument("new.txt");
  operations.answer(at("new.txt"));
  const ItemAnswer answer("import");
  import(NSFileProviderRootContainerItemIdentifier, answer);
  expectItem(answer, "new.txt");
  EXPECT_EQ(operations.calls(),
            Lines{"importUnderFolder(" + kSource.path() + ", " + daemon.url("").path() + ")"});
}

TEST_F(ImportDocument, aFailureOfTheFilesIsTold) {
  const NSError failure = fileError(NSFileWriteOutOfSpaceError);
  operations.fail(failure);
  const ItemAnswer answer("import");
  import(folder, answer);
  expectError(answer, failure);
  EXPECT_EQ(logged(), joined({urlLines(1, folder, at("f")),
                              {importing(2, at("f")), gotNewURL(NSURL(), failure), closed(2)}}));
  EXPECT_EQ(daemon.log().count("getQueryItemForURL"), 0U);
}

// The error goes through the file system's translation alone: 4355 stays what it is.
TEST_F(ImportDocument, anErrorOfTheServiceIsNotTranslated) {
  const NSError failure(NSCocoaErrorDomain, 4355);
  operations.fail(failure);
  const ItemAnswer answer("import");
  import(folder, answer);
  expectError(answer, failure);
}

TEST_F(ImportDocument, aNameThatIsTakenNamesTheItemInTheWay) {
  daemon.addDocument("f/new.txt");
  operations.fail(collisionAt(at("f/new.txt")));
  const ItemAnswer answer("import");
  import(folder, answer);
  const auto [item, error] = answer.values();
  EXPECT_FALSE(item);
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision));
  EXPECT_TRUE(error.userInfo().contains(NSFileProviderErrorCollidingItemKey));
}

TEST_F(ImportDocument, aNewItemThatCantBeDescribedIsNeitherItemNorError) {
  operations.answer(at("f/new.txt"));
  const ItemAnswer answer("import");
  import(folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, NSError());
  const Lines lines = logged();
  ASSERT_GE(lines.size(), 2U);
  EXPECT_TRUE(lines[lines.size() - 2].starts_with(
      "debug: [DEBUG] couldn't find item after importing it: Error Domain=NSFileProviderErrorDomain "
      "Code=-1005"))
      << lines[lines.size() - 2];
}

TEST_F(ImportDocument, aURLWithAnErrorIsTheErrorAlone) {
  daemon.addDocument("f/new.txt");
  const NSError failure = fileError(NSFileWriteUnknownError);
  operations.answer(at("f/new.txt"), failure);
  const ItemAnswer answer("import");
  import(folder, answer);
  expectError(answer, failure);
}

}  // namespace
}  // namespace droxa
