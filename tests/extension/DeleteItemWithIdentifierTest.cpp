#include "additions/NSError+QVFPAdditions.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class DeleteItem : public ActionTest {
 protected:
  void remove(const std::string &identifier, const Once<NSError> &answer) {
    extension->deleteItemWithIdentifier(identifier, answer.completion());
  }
  std::string deleting(const NSURL &url) const { return "delete(" + url.path() + ")"; }
  Lines begun() const {
    return joined({{opened(1) + "deleting item " + document}, urlLines(2, document, at("a.txt"))});
  }
  std::string retrying() const {
    return "debug: [DEBUG] couldn't delete " + at("a.txt").description() + ", retrying with physical url " +
           kPhysical.description();
  }
  const NSURL kPhysical = at(".a.txt.droxafault");
};

TEST_F(DeleteItem, isDoneByTheFramework) {
  operations.answer(NSURL());
  const Once<NSError> answer("delete");
  remove(document, answer);
  EXPECT_EQ(answer.calls(), 1);
  EXPECT_EQ(answer.value<0>(), NSError());
  EXPECT_EQ(operations.calls(), Lines{deleting(at("a.txt"))});
  EXPECT_TRUE(operations.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(logged(), joined({begun(), {closed(1)}}));
}

TEST_F(DeleteItem, returnsBeforeItIsDone) {
  operations.hold();
  operations.answer(NSURL());
  const Once<NSError> answer("delete");
  remove(document, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged(), joined({begun(), {closed(1)}}));
  operations.release();
  EXPECT_EQ(answer.value<0>(), NSError());
}

TEST_F(DeleteItem, ofAnUnknownItemTouchesNothing) {
  const Once<NSError> answer("delete");
  remove(kUnknown, answer);
  EXPECT_EQ(answer.calls(), 1);
  EXPECT_EQ(answer.value<0>(), noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(logged(),
            joined({{opened(1) + "deleting item " + kUnknown}, unknownLines(2, kUnknown), {closed(1)}}));
}

TEST_F(DeleteItem, ofWhatIsGoneIsTriedOnceMoreWithThePhysicalURL) {
  actions.physical() = kPhysical;
  operations.fail(NSError(NSCocoaErrorDomain, NSFileNoSuchFileError));
  operations.answer(NSURL());
  const Once<NSError> answer("delete");
  remove(document, answer);
  EXPECT_EQ(answer.calls(), 1);
  EXPECT_EQ(answer.value<0>(), NSError());
  EXPECT_EQ(operations.calls(), (Lines{deleting(at("a.txt")), deleting(kPhysical)}));
  EXPECT_EQ(actions.calls(), Lines{"physical(" + at("a.txt").path() + ")"});
  EXPECT_EQ(logged(), joined({begun(), {retrying(), closed(1)}}));
}

TEST_F(DeleteItem, ofWhatIsGoneTwiceIsNotTriedAThirdTime) {
  actions.physical() = kPhysical;
  const NSError gone(NSCocoaErrorDomain, NSFileNoSuchFileError);
  operations.fail(gone);
  operations.fail(gone);
  const Once<NSError> answer("delete");
  remove(document, answer);
  EXPECT_EQ(answer.value<0>(), gone);
  EXPECT_EQ(operations.calls(), (Lines{deleting(at("a.txt")), deleting(kPhysical)}));
}

TEST_F(DeleteItem, theSecondTrysErrorIsTranslated) {
  operations.fail(NSError(NSCocoaErrorDomain, NSFileNoSuchFileError));
  const NSError failure(NSCocoaErrorDomain, 4355);
  operations.fail(failure);
  const Once<NSError> answer("delete");
  remove(document, answer);
  EXPECT_EQ(answer.value<0>(), qv_fileProviderError(failure));
}

TEST_F(DeleteItem, anyOtherFailureIsToldTranslatedAndNotTriedAgain) {
  const NSError failures[] = {NSError(NSCocoaErrorDomain, 4355), fileError(NSFileWriteNoPermissionError),
                              NSError(NSCocoaErrorDomain, NSFileReadNoSuchFileError),
                              NSError(NSPOSIXErrorDomain, 4)};
  for (const NSError &failure : failures) {
    operations.fail(failure);
    const Once<NSError> answer("delete");
    remove(document, answer);
    EXPECT_EQ(answer.value<0>(), qv_fileProviderError(failure));
  }
  EXPECT_EQ(operations.calls().size(), std::size(failures));
  EXPECT_EQ(actions.calls(), Lines{});
}

TEST_F(DeleteItem, ofAnAliasDeletesTheAlias) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  operations.answer(NSURL());
  const Once<NSError> answer("delete");
  remove(alias, answer);
  EXPECT_EQ(operations.calls(), Lines{deleting(at("alias"))});
}

}  // namespace
}  // namespace droxa
