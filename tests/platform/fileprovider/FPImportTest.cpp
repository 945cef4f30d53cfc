#include <random>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>

#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

struct FPImport : OperationsOnFileSystems {
  FPImport() { makeFolder("to"); }
  void expectNothingCame() const { EXPECT_TRUE(names("to").empty()) << names("to").front(); }
  // Imports under a progress, on which `meanwhile` works until the answer comes.
  Answer importUnder(const std::shared_ptr<NSProgress> &progress, const NSURL &source, const NSURL &folder,
                     const std::function<void()> &meanwhile) {
    return await([&](FPURLCompletion done) {
      {
        const NSCurrentProgress current(progress);
        operations->importUnderFolder(source, folder, std::move(done));
      }
      meanwhile();
    });
  }
};
INSTANTIATE_TEST_SUITE_P(On, FPImport, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPImport, copiesADocumentWithWhatDescribesIt) {
  write("a.txt", "words");
  fs::permissions(path("a.txt"), fs::perms(0640));
  ASSERT_EQ(setxattr(path("a.txt").c_str(), "user.xdg.tags", "red", 3, 0), 0);
  ASSERT_EQ(setxattr(path("a.txt").c_str(), "user.droxa.document", "1 p", 3, 0), 0);
  const timespec times[2] = {{1'000'000'000, 5}, {1'100'000'000, 7}};
  ASSERT_EQ(utimensat(AT_FDCWD, path("a.txt").c_str(), times, 0), 0);
  const Answer answer = import(url("a.txt"), url("to"));
  EXPECT_EQ(answer.url, url("to/a.txt")) << answer.error.description();
  EXPECT_EQ(names("to"), std::vector<std::string>{"a.txt"});
  EXPECT_EQ(read("to/a.txt"), "words");
  EXPECT_NE(inode("to/a.txt"), inode("a.txt"));
  struct stat status {};
  ASSERT_EQ(stat(path("to/a.txt").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777U, 0640U);
  EXPECT_EQ(status.st_mtim.tv_sec, 1'100'000'000);
  EXPECT_EQ(status.st_mtim.tv_nsec, 7);
  char value[8] = {};
  EXPECT_EQ(getxattr(path("to/a.txt").c_str(), "user.xdg.tags", value, sizeof(value)), 3);
  EXPECT_EQ(getxattr(path("to/a.txt").c_str(), "user.droxa.document", value, sizeof(value)), -1);
}

TEST_P(FPImport, copiesATree) {
  write("tree/a", "1");
  write("tree/deep/er/b", std::string(3 << 20, 'b'));
  write("tree/deep/two\nlines \xff", "");
  makeFolder("tree/empty");
  fs::create_symlink("../nowhere", path("tree/deep/link"));
  fs::permissions(path("tree/deep"), fs::perms(0550));
  fs::permissions(path("tree"), fs::perms(0500));
  EXPECT_EQ(import(url("tree"), url("to")).url, url("to/tree"));
  EXPECT_EQ(read("to/tree/a"), "1");
  EXPECT_EQ(read("to/tree/deep/er/b"), std::string(3 << 20, 'b'));
  EXPECT_TRUE(exists("to/tree/deep/two\nlines \xff"));
  EXPECT_TRUE(fs::is_directory(path("to/tree/empty")));
  EXPECT_EQ(fs::read_symlink(path("to/tree/deep/link")), "../nowhere");
  EXPECT_EQ(fs::status(path("to/tree/deep")).permissions(), fs::perms(0550));
  EXPECT_EQ(fs::status(path("to/tree")).permissions(), fs::perms(0500));
  EXPECT_EQ(fs::last_write_time(path("to/tree/deep")), fs::last_write_time(path("tree/deep")));
}

TEST_P(FPImport, keepsHoles) {
  const int file = open(path("sparse").c_str(), O_RDWR | O_CREAT, 0600);
  ASSERT_EQ(ftruncate(file, 256 << 20), 0);
  ASSERT_EQ(pwrite(file, "middle", 6, 100 << 20), 6);
  close(file);
  const Answer answer = import(url("sparse"), url("to"));
  ASSERT_FALSE(answer.error) << answer.error.description();
  struct stat status {};
  ASSERT_EQ(stat(path("to/sparse").c_str(), &status), 0);
  EXPECT_EQ(status.st_size, 256 << 20);
  EXPECT_LT(status.st_blocks, 1024);
  std::ifstream copy(path("to/sparse"));
  copy.seekg(100 << 20);
  std::string middle(6, '\0');
  copy.read(middle.data(), 6);
  EXPECT_EQ(middle, "middle");
}

TEST_P(FPImport, copiesALinkAsALink) {
  fs::create_symlink("nowhere", path("link"));
  EXPECT_EQ(import(url("link"), url("to")).url, url("to/link"));
  EXPECT_EQ(fs::read_symlink(path("to/link")), "nowhere");
}

TEST_P(FPImport, comesFromAnotherFileSystem) {
  const TemporaryFolder other;
  other.write("tree/a", std::string(2 << 20, 'a'));
  EXPECT_EQ(import(NSURL::fileURLWithPath(other.path() + "/tree"), url("to")).url, url("to/tree"));
  EXPECT_EQ(read("to/tree/a").size(), std::size_t{2} << 20U);
}

TEST_P(FPImport, neverReplaces) {
  write("a", "1");
  write("to/a", "2");
  expectCollision(import(url("a"), url("to")), url("to/a"));
  expectCollision(import(url("a"), url("")), url("a"));
  EXPECT_EQ(read("to/a"), "2");
  write("b", "1");
  write("to/.b.promise", "stands for b");
  expectCollision(import(url("b"), url("to")), url("to/b"));
}

TEST_P(FPImport, whatIsMissingIsNoSuchFile) {
  write("a", "1");
  EXPECT_TRUE(import(url("missing"), url("to")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(import(NSURL(), url("to")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(import(url("a"), url("missing")).is(NSFileNoSuchFileError));
  EXPECT_TRUE(import(url("a"), NSURL()).is(NSFileNoSuchFileError));
  EXPECT_TRUE(import(url("to"), url("a")).is(NSFileNoSuchFileError));
  expectNothingCame();
}

TEST_P(FPImport, aFolderIntoItselfIsRefused) {
  makeFolder("to/deep");
  const Answer answer = import(url("to"), url("to/deep"));
  EXPECT_TRUE(answer.is(NSFileWriteUnknownError));
  expectDescribes(answer.error, "into itself");
  EXPECT_TRUE(names("to/deep").empty());
}

TEST_P(FPImport, whatIsNoDocumentIsRefusedByName) {
  ASSERT_EQ(mkfifo(path("pipe").c_str(), 0600), 0);
  write("tree/a", "1");
  const int socket = ::socket(AF_UNIX, SOCK_STREAM, 0);
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path("tree/socket").copy(address.sun_path, sizeof(address.sun_path) - 1);
  ASSERT_EQ(bind(socket, reinterpret_cast<const sockaddr *>(&address), sizeof(address)), 0);
  close(socket);
  expectDescribes(import(url("pipe"), url("to")).error, path("pipe"));
  expectDescribes(import(url("tree"), url("to")).error, path("tree/socket"));
  expectDescribes(import(NSURL::fileURLWithPath("/dev/null"), url("to")).error, "/dev/null");
  expectNothingCame();
}

TEST_P(FPImport, aDocumentWhoseContentsAreElsewhereIsRefused) {
  write("tree/far.dataless", "");
  expectDescribes(import(url("tree"), url("to")).error, "download it first");
  expectNothingCame();
}

TEST_P(FPImport, countsBytes) {
  write("tree/a", std::string(3 << 20, 'a'));
  write("tree/b", std::string(1000, 'b'));
  const auto progress = std::make_shared<NSProgress>();
  EXPECT_FALSE(importUnder(progress, url("tree"), url("to"), [] {}).error);
  EXPECT_EQ(progress->totalUnitCount(), (3 << 20) + 1000);
  EXPECT_EQ(progress->completedUnitCount(), (3 << 20) + 1000);
}

TEST_P(FPImport, cancelledInTheMiddleLeavesNothing) {
  write("large", std::string(256 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("large"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    progress->cancel();
  });
  EXPECT_TRUE(answer.is(NSUserCancelledError)) << answer.error.description();
  EXPECT_LT(progress->completedUnitCount(), 256 << 20);
  expectNothingCame();
}

TEST_P(FPImport, cancelledBeforeItBeginsLeavesNothing) {
  write("a", "words");
  const auto progress = std::make_shared<NSProgress>();
  progress->cancel();
  EXPECT_TRUE(importUnder(progress, url("a"), url("to"), [] {}).is(NSUserCancelledError));
  expectNothingCame();
}

TEST_P(FPImport, aSourceThatChangesMeanwhileIsNoTornCopy) {
  write("large", std::string(256 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("large"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    std::ofstream(path("large"), std::ios::in | std::ios::out) << "changed";
  });
  EXPECT_TRUE(answer.is(NSFileWriteUnknownError)) << answer.error.description();
  expectDescribes(answer.error, path("large"));
  expectNothingCame();
}

TEST_P(FPImport, aSourceThatShrinksMeanwhileIsNoTornCopy) {
  write("large", std::string(256 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("large"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    EXPECT_EQ(truncate(path("large").c_str(), 10), 0);
  });
  EXPECT_TRUE(answer.error) << "torn";
  expectNothingCame();
}

TEST_P(FPImport, aSourceThatVanishesMeanwhileIsAnError) {
  write("tree/1", std::string(256 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("tree"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    fs::remove_all(path("tree"));
  });
  EXPECT_TRUE(answer.error) << "torn";
  expectNothingCame();
}

TEST_P(FPImport, aFullDiskLeavesNothing) {
  const MountedFileSystem small("tmpfs", "size=2m");
  if (!small.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  write("tree/a", std::string(1 << 20, 'x'));
  write("tree/b", std::string(4 << 20, 'x'));
  const Answer answer = import(url("tree"), NSURL::fileURLWithPath(small.path()));
  EXPECT_TRUE(answer.is(NSFileWriteOutOfSpaceError)) << answer.error.description();
  EXPECT_TRUE(fs::is_empty(small.path()));
}

TEST_P(FPImport, aFileSystemWithoutAttributesTakesTheContents) {
  const MountedFileSystem plain("ramfs", "");
  if (!plain.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  if (setxattr(plain.path().c_str(), "user.a", "1", 1, 0) == 0) GTEST_SKIP() << "it has attributes here";
  write("a", "words");
  ASSERT_EQ(setxattr(path("a").c_str(), "user.xdg.tags", "red", 3, 0), 0);
  const NSURL folder = NSURL::fileURLWithPath(plain.path());
  EXPECT_EQ(import(url("a"), folder).url, folder.URLByAppendingPathComponent("a"));
  EXPECT_EQ(rename(folder.URLByAppendingPathComponent("a"), "b").url,
            folder.URLByAppendingPathComponent("b"));
  EXPECT_EQ(move(folder.URLByAppendingPathComponent("b"), url("to")).url, url("to/b"));
  EXPECT_EQ(read("to/b"), "words");
  EXPECT_TRUE(fs::is_empty(plain.path()));
}

TEST_P(FPImport, preparesInTheServicesFolder) {
  makeFolder("private");
  items->replacements = url("private");
  write("large", std::string(64 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("large"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    // Nobody removes what is under way, and nobody sees it where it will be until it is whole.
    EXPECT_EQ(FPRemoveAbandonedReplacements(url("private")), 0U);
    EXPECT_TRUE(!exists("to/large") || fs::file_size(path("to/large")) == std::uintmax_t{64} << 20U);
  });
  EXPECT_EQ(answer.url, url("to/large")) << answer.error.description();
  EXPECT_TRUE(names("private").empty());
}

TEST_P(FPImport, leavesNothingInAFolderThatMovesMeanwhile) {
  write("large", std::string(64 << 20, 'x'));
  const auto progress = std::make_shared<NSProgress>();
  const Answer answer = importUnder(progress, url("large"), url("to"), [&] {
    EXPECT_TRUE(eventually([&] { return progress->completedUnitCount() > 0; }));
    fs::rename(path("to"), path("moved"));
  });
  // It may have been in time.
  EXPECT_TRUE(answer.url || answer.is(NSFileNoSuchFileError)) << answer.error.description();
  EXPECT_EQ(names("moved").size(), answer.url ? 1U : 0U);
}

TEST_P(FPImport, waitsForWhoeverWritesToTheSource) {
  write("tree/a", "words");
  NSError error;
  auto access = NSFileCoordinator::defaultCoordinator()->coordinateAccess(
      {NSFileAccessIntent::writingIntent(url("tree"))}, nullptr, &error);
  std::promise<NSURL> answer;
  operations->importUnderFolder(url("tree/a"), url("to"),
                                [&](const NSURL &newURL, const NSError &) { answer.set_value(newURL); });
  auto future = answer.get_future();
  EXPECT_EQ(future.wait_for(std::chrono::milliseconds(50)), std::future_status::timeout);
  access.reset();
  EXPECT_EQ(future.get(), url("to/a"));
}

}  // namespace
}  // namespace droxa
