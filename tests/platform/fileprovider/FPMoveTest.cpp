#include "platform/fileprovider/operations/FPMove.h"
#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

// Both forms of the step keep the same promises.
using Form = int (*)(int, const std::string &, int, const std::string &);
struct FPMove : OperationsFixture, testing::WithParamInterface<Form> {
  int step(const std::string &from, const std::string &to) const {
    return GetParam()(AT_FDCWD, path(from), AT_FDCWD, path(to));
  }
};
INSTANTIATE_TEST_SUITE_P(By, FPMove, testing::Values(&FPMoveAt, &FPMoveAtByReplacing),
                         [](const auto &form) { return form.index == 0 ? "theKernel" : "replacing"; });

TEST_P(FPMove, givesTheNewName) {
  write("a", "words");
  write("folder/b", "words");
  fs::create_symlink("nowhere", path("link"));
  const ino_t before = inode("a");
  EXPECT_EQ(step("a", "x"), 0);
  EXPECT_EQ(step("folder", "y"), 0);
  EXPECT_EQ(step("link", "z"), 0);
  EXPECT_EQ(names(), (std::vector<std::string>{"x", "y", "z"}));
  EXPECT_EQ(inode("x"), before);
}

TEST_P(FPMove, neverReplaces) {
  write("a", "1");
  write("b", "2");
  makeFolder("folder");
  makeFolder("empty");
  for (const std::string from : {"a", "folder"}) {
    for (const std::string to : {"b", "empty"}) EXPECT_EQ(step(from, to), EEXIST) << from << to;
  }
  EXPECT_EQ(read("b"), "2");
  EXPECT_EQ(names().size(), 4U);
}

TEST_P(FPMove, tellsWhatIsMissingAndWhatCantBe) {
  makeFolder("a/b");
  EXPECT_EQ(step("missing", "x"), ENOENT);
  EXPECT_EQ(step("a", "missing/x"), ENOENT);
  EXPECT_EQ(step("a", "a/b/a"), EINVAL);
}

}  // namespace
}  // namespace droxa
