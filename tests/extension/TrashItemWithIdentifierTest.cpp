#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class TrashItem : public ActionTest {
 protected:
  TrashItem() {
    trashed = NSURL::fileURLWithPath(DroxaProcessHome().replica() + "/" + QVUbiquitousTrashContainerID + "/" +
                                     QVDocumentsFolderName(QVUbiquitousTrashContainerID) + "/a.txt");
    daemon.addDocument(trashed.path());
    clear();
  }
  void trash(const std::string &identifier, const ItemAnswer &answer) {
    extension->trashItemWithIdentifier(identifier, answer.completion());
    EXPECT_EQ(answer.calls(), 1) << "before the call returns";
  }
  Lines begun() const {
    return joined({{opened(1) + "trashing item " + document}, urlLines(2, document, at("a.txt"))});
  }
  std::string trashing(const NSURL &url) const {
    return "debug: [DEBUG] trashing " + fp_obfuscatedPath(url.path());
  }
  NSURL trashed;
};

TEST_F(TrashItem, isDoneByTheLibraryUnderCoordination) {
  operations.answer(at("a.txt"));
  actions.trashed() = trashed;
  const ItemAnswer answer("trash");
  trash(document, answer);
  const auto [item, error] = answer.values();
  EXPECT_EQ(error, NSError());
  ASSERT_TRUE(item);
  EXPECT_EQ(item->fields(), daemon.item(trashed.path())->fields());
  EXPECT_TRUE(item->fields().isTrashed);
  EXPECT_EQ(operations.calls(), Lines{"coordinatedDelete(" + at("a.txt").path() + ")"});
  EXPECT_TRUE(operations.urls()[0].hasPhysicalProperty());
  EXPECT_EQ(actions.calls(), Lines{"trash(" + at("a.txt").path() + ")"});
  EXPECT_EQ(logged(), joined({begun(), {trashing(at("a.txt"))}, itemLines(3, trashed, item), {closed(1)}}));
}

TEST_F(TrashItem, actsOnTheURLThatTheCoordinationGives) {
  operations.answer(at("elsewhere.txt"));
  actions.trashed() = trashed;
  const ItemAnswer answer("trash");
  trash(document, answer);
  EXPECT_EQ(actions.calls(), Lines{"trash(" + at("elsewhere.txt").path() + ")"});
}

TEST_F(TrashItem, ofAnUnknownItemTouchesNothing) {
  const ItemAnswer answer("trash");
  trash(kUnknown, answer);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(logged(),
            joined({{opened(1) + "trashing item " + kUnknown}, unknownLines(2, kUnknown), {closed(1)}}));
}

TEST_F(TrashItem, ofAnAliasTrashesTheAlias) {
  const std::string alias = daemon.addAlias("alias").asString();
  std::filesystem::create_directories(daemon.url("").path());
  std::ofstream(at("target").path()) << "contents";
  std::filesystem::create_symlink("target", at("alias").path());
  operations.fail(fileError(NSFileWriteNoPermissionError));
  const ItemAnswer answer("trash");
  trash(alias, answer);
  EXPECT_EQ(operations.calls(), Lines{"coordinatedDelete(" + at("alias").path() + ")"});
}

TEST_F(TrashItem, aCoordinationThatFailsIsToldAsItStands) {
  const NSError failure(NSCocoaErrorDomain, 4355);
  operations.fail(failure);
  const ItemAnswer answer("trash");
  trash(document, answer);
  expectError(answer, failure);
  EXPECT_EQ(actions.calls(), Lines{});
  EXPECT_EQ(
      logged(),
      joined({begun(),
              {"debug: [DEBUG] failed to coordinate the deletion: " + failure.description(), closed(1)}}));
}

TEST_F(TrashItem, aFailureOfTheLibraryIsToldAsItStands) {
  const NSError failure(QVTessalyErrorDomain, 14);
  operations.answer(at("a.txt"));
  actions.trashError() = failure;
  const ItemAnswer answer("trash");
  trash(document, answer);
  expectError(answer, failure);
  EXPECT_EQ(daemon.log().count("getQueryItemForURL"), 0U);
  EXPECT_EQ(logged(), joined({begun(), {trashing(at("a.txt")), closed(1)}}));
}

TEST_F(TrashItem, aURLWithAnErrorIsTheErrorAlone) {
  const NSError failure(QVTessalyErrorDomain, QVErrorDatabase);
  operations.answer(at("a.txt"));
  actions.trashed() = trashed;
  actions.trashError() = failure;
  const ItemAnswer answer("trash");
  trash(document, answer);
  expectError(answer, failure);
  EXPECT_EQ(daemon.log().count("getQueryItemForURL"), 0U);
}

TEST_F(TrashItem, anItemThatIsNotFoundAfterwardsIsTheLookupsError) {
  operations.answer(at("a.txt"));
  actions.trashed() = trashed.URLByDeletingLastPathComponent().URLByAppendingPathComponent("missing");
  const ItemAnswer answer("trash");
  trash(document, answer);
  EXPECT_FALSE(answer.value<0>());
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

TEST_F(TrashItem, withoutCoordinationIsTheLibrarysAnswerAtOnce) {
  const NSError failure(QVTessalyErrorDomain, 14);
  for (const auto &[result, error] : {std::pair{trashed, NSError()}, {NSURL(), failure}}) {
    clear();
    actions.trashed() = result;
    actions.trashError() = error;
    const Once<NSURL, NSError> answer("trash");
    extension->_trashItemAtURLWithoutCoordination(at("a.txt"), answer.completion());
    EXPECT_EQ(answer.calls(), 1);
    EXPECT_EQ(answer.values(), (std::tuple{result, error}));
    EXPECT_EQ(logged(), Lines{"debug: [DEBUG] trashing " + at("a.txt").description()});
  }
  EXPECT_EQ(operations.calls(), Lines{});
}

}  // namespace
}  // namespace droxa
