#include <fcntl.h>
#include <thread>

#include "tests/platform/FileWorkerProcess.h"
#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

using FPDelete = OperationsOnFileSystems;
INSTANTIATE_TEST_SUITE_P(On, FPDelete, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPDelete, removesDocumentsLinksAndTrees) {
  write("a", "words");
  write("tree/deep/b", "words");
  fs::create_directory_symlink("tree", path("link"));
  EXPECT_FALSE(remove(url("link")));
  EXPECT_TRUE(exists("tree/deep/b"));
  EXPECT_FALSE(remove(url("a")));
  EXPECT_FALSE(remove(url("tree")));
  EXPECT_TRUE(names().empty());
}

TEST_P(FPDelete, tellsTheServiceFirst) {
  write("a", "words");
  EXPECT_FALSE(remove(url("a")));
  EXPECT_TRUE(remove(url("a")).is(NSCocoaErrorDomain, NSFileNoSuchFileError));
  EXPECT_EQ(items->deleted, std::vector<std::string>{path("a")});
}

TEST_P(FPDelete, actsOnTheURLLiterally) {
  write(".a.promise", "stands for a");
  EXPECT_TRUE(remove(url("a").URLWithPhysicalProperty()).is(NSCocoaErrorDomain, NSFileNoSuchFileError));
  EXPECT_FALSE(remove(url(".a.promise")));
  EXPECT_TRUE(names().empty());
}

TEST_P(FPDelete, whatIsMissingIsNoSuchFile) {
  for (const NSURL &missing : {url("missing"), url("no/where"), NSURL(), NSURL::fileURLWithPath("/")}) {
    EXPECT_TRUE(remove(missing).is(NSCocoaErrorDomain, NSFileNoSuchFileError));
  }
}

TEST_P(FPDelete, aTreeDeeperThanAPathMayBeGoes) {
  makeFolder("tree");
  std::string folder = path("tree");
  int current = open(folder.c_str(), O_RDONLY | O_DIRECTORY);
  for (int depth = 0; depth < 700; ++depth) {
    ASSERT_EQ(mkdirat(current, "nested", 0700), 0);
    const int next = openat(current, "nested", O_RDONLY | O_DIRECTORY);
    close(current);
    current = next;
  }
  close(current);
  EXPECT_FALSE(remove(url("tree")));
  EXPECT_TRUE(names().empty());
}

TEST_P(FPDelete, preparesInTheServicesFolder) {
  makeFolder("private");
  items->replacements = url("private");
  write("tree/a", "words");
  EXPECT_FALSE(remove(url("tree")));
  EXPECT_EQ(names(), std::vector<std::string>{"private"});
  EXPECT_TRUE(names("private").empty());
}

TEST_P(FPDelete, aFolderWithoutRightsInsideStillGoes) {
  if (geteuid() != 0) GTEST_SKIP() << "needs another user to try it as";
  constexpr uid_t kOther = 65'534;
  write("tree/closed/deep/a", "words");
  write("closed/a", "words");
  for (const char *name :
       {"", "tree", "tree/closed", "tree/closed/deep", "tree/closed/deep/a", "closed", "closed/a"}) {
    ASSERT_EQ(chown(path(name).c_str(), kOther, kOther), 0);
  }
  for (const char *name : {"tree/closed/deep", "tree/closed", "closed"}) {
    ASSERT_EQ(chmod(path(name).c_str(), name == std::string("tree/closed") ? 0 : 0500), 0);
  }
  ASSERT_EQ(chmod(coordination.path().c_str(), 0777), 0);
  ASSERT_EQ(chmod(root.c_str(), 0777), 0);
  FileWorkerProcess worker(
      {coordination.path() + "/locks", "delete-as", std::to_string(kOther), path("tree"), path("closed")});
  EXPECT_EQ(worker.waitForEnd(), 0);
  EXPECT_TRUE(names().empty());
}

TEST_P(FPDelete, onAFullDiskStillWorks) {
  const MountedFileSystem small("tmpfs", "size=64k,nr_inodes=6");
  if (!small.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  const std::string tree = small.path() + "/tree";
  fs::create_directory(tree);
  for (int i = 0; i < 10; ++i) std::ofstream(tree + "/" + std::to_string(i)) << "x";
  ASSERT_NE(mkdir((small.path() + "/other").c_str(), 0700), 0);
  EXPECT_FALSE(remove(NSURL::fileURLWithPath(tree)));
  EXPECT_TRUE(fs::is_empty(small.path()));
}

TEST_P(FPDelete, coordinatedHandsOverTheURLBeforeItReturns) {
  write("a", "words");
  int calls = 0;
  const auto caller = std::this_thread::get_id();
  operations->coordinatedDeleteWithHandler(url("a"), [&](const NSURL &newURL, const NSError &error) {
    ++calls;
    EXPECT_EQ(newURL, url("a"));
    EXPECT_FALSE(error);
    EXPECT_EQ(std::this_thread::get_id(), caller);
    NSError refused;
    EXPECT_FALSE(NSFileCoordinator(coordination.path() + "/locks", std::chrono::milliseconds(5))
                     .coordinateAccess({NSFileAccessIntent::readingIntent(url("a"))}, nullptr, &refused));
  });
  EXPECT_EQ(calls, 1);
  EXPECT_TRUE(exists("a"));
  EXPECT_TRUE(items->deleted.empty());
}

TEST_P(FPDelete, coordinatedOfWhatIsMissingIsNoSuchFile) {
  int calls = 0;
  for (const NSURL &missing : {url("missing"), NSURL()}) {
    operations->coordinatedDeleteWithHandler(missing, [&](const NSURL &newURL, const NSError &error) {
      ++calls;
      EXPECT_FALSE(newURL);
      EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileNoSuchFileError));
    });
  }
  EXPECT_EQ(calls, 2);
}

TEST_P(FPDelete, whatNobodyHoldsIsRemovedByTheCleaner) {
  const std::string name = ".droxa-replacement-6B29FC40-CA47-1067-B31D-00DD010662D";
  write(name + "A/item/a", "left by a dead process");
  write(name + "B", "a document, which no operation made");
  write(".droxa-replacement-notes/a", "somebody's own");
  EXPECT_EQ(FPRemoveAbandonedReplacements(url("")), 1U);
  EXPECT_EQ(names(), (std::vector<std::string>{name + "B", ".droxa-replacement-notes"}));
  EXPECT_EQ(FPRemoveAbandonedReplacements(url("missing")), 0U);
}

}  // namespace
}  // namespace droxa
