#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

using FPRename = OperationsOnFileSystems;
INSTANTIATE_TEST_SUITE_P(On, FPRename, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPRename, keepsIdentityAttributesAndDates) {
  write("a.txt", "words");
  const timespec times[2] = {{1'000'000'000, 5}, {1'100'000'000, 7}};
  ASSERT_EQ(utimensat(AT_FDCWD, path("a.txt").c_str(), times, 0), 0);
  ASSERT_EQ(setxattr(path("a.txt").c_str(), "user.droxa.document", "1 p", 3, 0), 0);
  const ino_t before = inode("a.txt");
  const Answer answer = rename(url("a.txt"), "b.txt");
  EXPECT_FALSE(answer.error) << answer.error.description();
  EXPECT_EQ(answer.url, url("b.txt"));
  EXPECT_EQ(names(), std::vector<std::string>{"b.txt"});
  EXPECT_EQ(inode("b.txt"), before);
  struct stat status {};
  ASSERT_EQ(stat(path("b.txt").c_str(), &status), 0);
  EXPECT_EQ(status.st_mtim.tv_sec, 1'100'000'000);
  EXPECT_EQ(status.st_mtim.tv_nsec, 7);
  char value[8] = {};
  EXPECT_EQ(getxattr(path("b.txt").c_str(), "user.droxa.document", value, sizeof(value)), 3);
}

TEST_P(FPRename, takesNamesByTheirBytes) {
  write("a", "words");
  std::string current = "a";
  for (const std::string &name :
       {std::string(255, 'x'), std::string("🚀"), std::string("e\xcc\x81"), std::string("é"),
        std::string("ends in dots.."), std::string("ends in blanks  "), std::string("two\nlines"),
        std::string("\xff\xfe"), std::string("...")}) {
    const Answer answer = rename(url(current), name);
    EXPECT_FALSE(answer.error) << answer.error.description();
    EXPECT_EQ(names(), std::vector<std::string>{name});
    current = name;
  }
}

TEST_P(FPRename, refusesWhatIsNoName) {
  write("a", "words");
  for (const std::string &name : {std::string(), std::string("."), std::string(".."), std::string("b/c"),
                                  std::string("b\0c", 3), std::string(256, 'x')}) {
    const Answer answer = rename(url("a"), name);
    EXPECT_TRUE(answer.is(NSFileWriteInvalidFileNameError)) << answer.error.description();
    expectDescribes(answer.error, "\"" + name.substr(0, name.find('\0')));
  }
  EXPECT_EQ(names(), std::vector<std::string>{"a"});
}

TEST_P(FPRename, toItsOwnNameIsDone) {
  write("a", "words");
  EXPECT_EQ(rename(url("a"), "a").url, url("a"));
}

TEST_P(FPRename, toOtherCaseIsDone) {
  write("a.txt", "words");
  EXPECT_EQ(rename(url("a.txt"), "A.TXT").url, url("A.TXT"));
  EXPECT_EQ(names(), std::vector<std::string>{"A.TXT"});
}

TEST_P(FPRename, neverReplaces) {
  write("a", "1");
  write("b", "2");
  makeFolder("empty");
  fs::create_symlink("nowhere", path("link"));
  for (const std::string taken : {"b", "empty", "link"}) expectCollision(rename(url("a"), taken), url(taken));
  expectCollision(rename(url("empty"), "b"), url("b"));
  EXPECT_EQ(read("a") + read("b"), "12");
}

TEST_P(FPRename, doesntTakeAHardLinkForItself) {
  write("a", "1");
  fs::create_hard_link(path("a"), path("b"));
  expectCollision(rename(url("a"), "b"), url("b"));
  EXPECT_EQ(names().size(), 2U);
}

TEST_P(FPRename, whatIsMissingIsNoSuchFile) {
  for (const NSURL &missing :
       {url("missing"), url("no/where"), NSURL(), NSURL::URLWithString("https://a/b")}) {
    const Answer answer = rename(missing, "b");
    EXPECT_TRUE(answer.is(NSFileNoSuchFileError)) << answer.error.description();
  }
}

TEST_P(FPRename, movesALinkItselfAndAFolderWithAllBelow) {
  fs::create_symlink("nowhere", path("link"));
  write("folder/deep/a", "1");
  EXPECT_FALSE(rename(url("link"), "other").error);
  EXPECT_FALSE(rename(url("folder"), "moved.d").error);
  EXPECT_EQ(fs::read_symlink(path("other")), "nowhere");
  EXPECT_EQ(read("moved.d/deep/a"), "1");
}

TEST_P(FPRename, ofThePhysicalURLMovesThePromise) {
  write(".a.promise", "stands for a");
  const Answer answer = rename(url("a").URLWithPhysicalProperty(), "b");
  EXPECT_EQ(answer.url, url("b")) << answer.error.description();
  EXPECT_EQ(names(), std::vector<std::string>{".b.promise"});
}

TEST_P(FPRename, ofThePhysicalURLMovesWhatIsHere) {
  write("a", "words");
  EXPECT_EQ(rename(url("a").URLWithPhysicalProperty(), "b").url, url("b"));
  EXPECT_EQ(names(), std::vector<std::string>{"b"});
}

TEST_P(FPRename, aNameThatAPromiseHasIsTaken) {
  write("a", "words");
  write(".b.promise", "stands for b");
  expectCollision(rename(url("a"), "b"), url("b"));
  expectCollision(rename(url("b").URLWithPhysicalProperty(), "a"), url("a"));
  EXPECT_EQ(names(), (std::vector<std::string>{".b.promise", "a"}));
}

TEST_P(FPRename, waitsForWhoeverWritesToEitherName) {
  write("a", "words");
  NSError error;
  auto access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url("b"))}, nullptr, &error);
  std::promise<NSURL> answer;
  operations->renameWithNewName(url("a"), "b",
                                [&](const NSURL &newURL, const NSError &) { answer.set_value(newURL); });
  auto future = answer.get_future();
  EXPECT_EQ(future.wait_for(std::chrono::milliseconds(50)), std::future_status::timeout);
  EXPECT_TRUE(exists("a"));
  access.reset();
  EXPECT_EQ(future.get(), url("b"));
}

TEST_P(FPRename, cancelledWhileItWaitsDoesNothing) {
  write("a", "words");
  NSError error;
  const auto access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url("b"))}, nullptr, &error);
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = await([&](FPURLCompletion done) {
    const NSCurrentProgress current(progress);
    operations->renameWithNewName(url("a"), "b", std::move(done));
    progress->cancel();
  });
  EXPECT_TRUE(answer.is(NSUserCancelledError)) << answer.error.description();
  EXPECT_EQ(names(), std::vector<std::string>{"a"});
}

TEST_P(FPRename, onAReadOnlyFileSystemIsRefused) {
  if (geteuid() != 0) GTEST_SKIP() << "needs the right to mount";
  const MountedFileSystem readOnly("tmpfs", "size=1m");
  if (!readOnly.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  std::ofstream(readOnly.path() + "/a") << "1";
  ASSERT_EQ(mount("none", readOnly.path().c_str(), "tmpfs", MS_REMOUNT | MS_RDONLY, "size=1m"), 0);
  const Answer answer = rename(NSURL::fileURLWithPath(readOnly.path() + "/a"), "b");
  EXPECT_TRUE(answer.is(NSFileWriteVolumeReadOnlyError)) << answer.error.description();
}

}  // namespace
}  // namespace droxa
