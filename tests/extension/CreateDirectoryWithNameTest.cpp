#include "tests/extension/ActionFixture.h"

namespace droxa {
namespace {

class CreateDirectory : public ActionTest {
 protected:
  void create(const std::string &parent, const ItemAnswer &answer) {
    extension->createDirectoryWithName("new", parent, answer.completion());
  }
  static std::string creating(const std::string &parent) {
    return opened(1) + "creating directory new under " + parent;
  }
  std::string called() const { return "createSubFolder(" + at("f").path() + ", new)"; }
};

TEST_F(CreateDirectory, isDoneByTheFrameworkAndDescribedAnew) {
  daemon.addFolder("f/new");
  clear();
  operations.answer(at("f/new"));
  const ItemAnswer answer("create");
  create(folder, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectItem(answer, "f/new");
  EXPECT_EQ(operations.calls(), Lines{called()});
  EXPECT_EQ(asked().back(), lookedAt("f/new"));
  EXPECT_EQ(logged(), joined({{creating(folder)},
                              urlLines(2, folder, at("f")),
                              {gotNewURL(at("f/new"))},
                              itemLines(3, at("f/new"), daemon.item("f/new")),
                              {closed(1)}}));
}

TEST_F(CreateDirectory, returnsBeforeItIsDone) {
  daemon.addFolder("f/new");
  clear();
  operations.hold();
  operations.answer(at("f/new"));
  const ItemAnswer answer("create");
  create(folder, answer);
  EXPECT_FALSE(answer.called());
  EXPECT_EQ(logged(), joined({{creating(folder)}, urlLines(2, folder, at("f")), {closed(1)}}));
  operations.release();
  expectItem(answer, "f/new");
}

TEST_F(CreateDirectory, inAnUnknownFolderTouchesNothing) {
  const ItemAnswer answer("create");
  create(kUnknown, answer);
  EXPECT_EQ(answer.calls(), 1);
  expectError(answer, noSuchItem(kUnknown));
  EXPECT_EQ(operations.calls(), Lines{});
  EXPECT_EQ(logged(), joined({{creating(kUnknown)}, unknownLines(2, kUnknown), {closed(1)}}));
}

TEST_F(CreateDirectory, aURLWithAnErrorIsTheErrorAlone) {
  daemon.addFolder("f/new");
  clear();
  const NSError failure = fileError(NSFileWriteInvalidFileNameError);
  operations.answer(at("f/new"), failure);
  const ItemAnswer answer("create");
  create(folder, answer);
  expectError(answer, failure);
  EXPECT_EQ(logged(), joined({{creating(folder)},
                              urlLines(2, folder, at("f")),
                              {gotNewURL(at("f/new"), failure), closed(1)}}));
}

TEST_F(CreateDirectory, anErrorOfTheServiceIsNotTranslated) {
  const NSError failure(NSCocoaErrorDomain, 4354);
  operations.fail(failure);
  const ItemAnswer answer("create");
  create(folder, answer);
  expectError(answer, failure);
}

TEST_F(CreateDirectory, aNameThatIsTakenNamesTheItemInTheWay) {
  daemon.addFolder("f/new");
  operations.fail(collisionAt(at("f/new")));
  const ItemAnswer answer("create");
  create(folder, answer);
  EXPECT_TRUE(answer.value<1>().is(NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision));
}

TEST_F(CreateDirectory, aNewFolderThatCantBeDescribedIsTheLookupsError) {
  operations.answer(at("f/new"));
  const ItemAnswer answer("create");
  create(folder, answer);
  const auto [item, error] = answer.values();
  EXPECT_FALSE(item);
  EXPECT_TRUE(error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

}  // namespace
}  // namespace droxa
