#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

using FPReparent = OperationsOnFileSystems;
INSTANTIATE_TEST_SUITE_P(On, FPReparent, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPReparent, keepsTheNameOrTakesTheNewOne) {
  write("a.txt", "words");
  makeFolder("to");
  const ino_t before = inode("a.txt");
  EXPECT_EQ(move(url("a.txt"), url("to")).url, url("to/a.txt"));
  EXPECT_EQ(move(url("to/a.txt"), url(""), "b.txt").url, url("b.txt"));
  EXPECT_EQ(inode("b.txt"), before);
  EXPECT_TRUE(names("to").empty());
}

TEST_P(FPReparent, toWhereItIsIsDone) {
  write("to/a", "words");
  EXPECT_EQ(move(url("to/a"), url("to")).url, url("to/a"));
  EXPECT_EQ(bounce(url("to/a"), url("to")).url, url("to/a"));
}

TEST_P(FPReparent, neverReplaces) {
  write("a", "1");
  write("to/a", "2");
  expectCollision(move(url("a"), url("to")), url("to/a"));
  expectCollision(bounce(url("a"), url("to"), false), url("to/a"));
  EXPECT_EQ(read("a") + read("to/a"), "12");
}

TEST_P(FPReparent, bouncesToTheFirstFreeName) {
  makeFolder("to");
  for (const std::string expected : {"to/a.txt", "to/a 2.txt", "to/a 3.txt", "to/a 4.txt"}) {
    write("a.txt", expected);
    EXPECT_EQ(bounce(url("a.txt"), url("to")).url, url(expected));
    EXPECT_EQ(read(expected), expected);
  }
}

TEST_P(FPReparent, bouncesFoldersWholeAndGoesOnFromANumber) {
  write("to/pictures.d/x", "");
  write("pictures.d/x", "");
  EXPECT_EQ(bounce(url("pictures.d"), url("to")).url, url("to/pictures.d 2"));
  write("to/note 2.txt", "");
  write("note 2.txt", "");
  EXPECT_EQ(bounce(url("note 2.txt"), url("to")).url, url("to/note 3.txt"));
}

TEST_P(FPReparent, bouncesManyOfOneNameAtOnce) {
  constexpr int kMany = 20;
  makeFolder("to");
  std::vector<std::future<NSURL>> answers;
  for (int i = 0; i < kMany; ++i) {
    const std::string name = std::to_string(i) + "/a.txt";
    write(name, name);
    const auto answer = std::make_shared<std::promise<NSURL>>();
    answers.push_back(answer->get_future());
    operations->reparentUnderFolder_allowBouncing(
        url(name), url("to"), true,
        [answer](const NSURL &newURL, const NSError &) { answer->set_value(newURL); });
  }
  for (int i = 0; i < kMany; ++i) {
    const NSURL where = answers[static_cast<std::size_t>(i)].get();
    EXPECT_EQ(read("to/" + where.lastPathComponent()), std::to_string(i) + "/a.txt");
  }
  EXPECT_EQ(names("to").size(), std::size_t{kMany});
}

TEST_P(FPReparent, aFolderIntoItselfIsRefused) {
  makeFolder("a/b/c");
  fs::create_directory_symlink("a/b", path("link"));
  for (const std::string folder : {"a", "a/b/c", "link"}) {
    const Answer answer = move(url("a"), url(folder));
    EXPECT_TRUE(answer.is(NSFileWriteUnknownError)) << answer.error.description();
    expectDescribes(answer.error, "into itself");
  }
  EXPECT_TRUE(exists("a/b/c"));
}

TEST_P(FPReparent, whatIsMissingIsNoSuchFile) {
  write("a", "words");
  EXPECT_TRUE(move(url("missing"), url("")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(move(url("a"), url("missing")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(move(url("a"), url("a")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(move(NSURL(), url("")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(move(url("a"), NSURL()).is(NSFileNoSuchFileError));
  EXPECT_TRUE(move(url("a"), url(""), "b/c").is(NSFileWriteInvalidFileNameError));
  EXPECT_EQ(names(), std::vector<std::string>{"a"});
}

TEST_P(FPReparent, ofThePhysicalURLMovesThePromise) {
  write("from/.a.promise", "stands for a");
  makeFolder("to");
  EXPECT_EQ(move(url("from/a").URLWithPhysicalProperty(), url("to"), "b").url, url("to/b"));
  EXPECT_EQ(names("to"), std::vector<std::string>{".b.promise"});
  write("to/c", "");
  write("from/.c.promise", "stands for c");
  EXPECT_EQ(bounce(url("from/c").URLWithPhysicalProperty(), url("to")).url, url("to/c 2"));
  EXPECT_TRUE(exists("to/.c 2.promise"));
}

// From the disk to memory and back.
struct FPReparentAcross : OperationsFixture {
  FPReparentAcross() {
    struct stat here {};
    struct stat there {};
    areApart = stat(root.c_str(), &here) == 0 && stat(other.root().c_str(), &there) == 0 &&
               here.st_dev != there.st_dev;
  }
  void SetUp() override {
    if (!areApart) GTEST_SKIP() << "/dev/shm is no other file system than " << root;
  }
  struct Other {
    Other() {
      std::string name = "/dev/shm/droxa-XXXXXX";
      root_ = mkdtemp(name.data()) ? name : "";
    }
    ~Other() {
      std::error_code ignored;
      fs::remove_all(root_, ignored);
    }
    const std::string &root() const { return root_; }
    std::string root_;
  } other;
  NSURL there(const std::string &name = "") const {
    return NSURL::fileURLWithPath(other.root() + "/" + name);
  }
  bool areApart = false;
};

TEST_F(FPReparentAcross, takesTheWholeTreeAlong) {
  write("tree/a", "words");
  write("tree/deep/er/b", "more");
  fs::create_symlink("../a", path("tree/deep/link"));
  ASSERT_EQ(setxattr(path("tree/a").c_str(), "user.droxa.document", "1 p", 3, 0), 0);
  fs::permissions(path("tree/deep"), fs::perms(0550));
  fs::permissions(path("tree/a"), fs::perms(0640));
  const Answer answer = move(url("tree"), there());
  EXPECT_EQ(answer.url, there("tree")) << answer.error.description();
  EXPECT_TRUE(names().empty());
  EXPECT_EQ(fs::directory_iterator(other.root())->path().filename(), "tree");
  EXPECT_EQ(fs::read_symlink(other.root() + "/tree/deep/link"), "../a");
  EXPECT_EQ(fs::status(other.root() + "/tree/deep").permissions(), fs::perms(0550));
  EXPECT_EQ(fs::status(other.root() + "/tree/a").permissions(), fs::perms(0640));
  char value[8] = {};
  EXPECT_EQ(getxattr((other.root() + "/tree/a").c_str(), "user.droxa.document", value, sizeof(value)), 3);
  EXPECT_EQ(move(there("tree"), url("")).url, url("tree"));
  EXPECT_EQ(read("tree/deep/er/b"), "more");
  EXPECT_TRUE(fs::is_empty(other.root()));
}

TEST_F(FPReparentAcross, neverReplacesAndBounces) {
  write("a.txt", "1");
  std::ofstream(other.root() + "/a.txt") << "2";
  expectCollision(move(url("a.txt"), there()), there("a.txt"));
  EXPECT_EQ(names(), std::vector<std::string>{"a.txt"});
  EXPECT_EQ(bounce(url("a.txt"), there()).url, there("a 2.txt"));
  EXPECT_TRUE(names().empty());
}

TEST_F(FPReparentAcross, cancelledLeavesTheSourceAndNothingElse) {
  write("tree/a", "words");
  const auto progress = std::make_shared<NSProgress>();
  NSError error;
  auto access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url("tree"))}, nullptr, &error);
  const Answer answer = await([&](FPURLCompletion done) {
    const NSCurrentProgress current(progress);
    operations->reparentUnderFolder_withNewName(url("tree"), there(), std::nullopt, std::move(done));
    progress->cancel();
    access.reset();
  });
  EXPECT_TRUE(answer.is(NSUserCancelledError));
  EXPECT_EQ(read("tree/a"), "words");
  EXPECT_TRUE(fs::is_empty(other.root()));
}

TEST_F(FPReparentAcross, aFullDiskLeavesTheSourceAndNothingElse) {
  const MountedFileSystem small("tmpfs", "size=1m");
  if (!small.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  write("tree/a", std::string(4 << 20, 'x'));
  const Answer answer = move(url("tree"), NSURL::fileURLWithPath(small.path()));
  EXPECT_TRUE(answer.is(NSFileWriteOutOfSpaceError)) << answer.error.description();
  EXPECT_EQ(read("tree/a").size(), std::size_t{4} << 20U);
  EXPECT_TRUE(fs::is_empty(small.path()));
}

}  // namespace
}  // namespace droxa
