#include <random>
#include <thread>

#include "tests/platform/FileWorkerProcess.h"
#include "tests/platform/fileprovider/OperationsFixture.h"

namespace droxa {
namespace {

// Processes that work without end are killed at random moments.
struct FPKill : OperationsOnFileSystems {
  static constexpr int kKills = 10;
  static constexpr int kDocuments = 60;
  static constexpr std::size_t kLarge = std::size_t{24} << 20U;

  void makeTree(const std::string &name) const {
    for (int i = 0; i < kDocuments; ++i) {
      write(name + "/" + std::to_string(i % 5) + "/" + std::to_string(i), std::to_string(i));
    }
    write(name + "/large", std::string(kLarge, 'x'));
  }
  bool isWholeTree(const std::string &folder) const {
    int documents = 0;
    for (const auto &entry : fs::recursive_directory_iterator(folder)) {
      if (!entry.is_directory()) ++documents;
    }
    return documents == kDocuments + 1 && fs::file_size(folder + "/large") == kLarge;
  }
  // Runs the command, and kills it after a random time from its beginning on.
  void kill(std::vector<std::string> command, int longest) {
    command.insert(command.begin(), coordination.path() + "/locks");
    FileWorkerProcess worker(std::move(command));
    ASSERT_EQ(worker.nextLine(), ".");
    // It says nothing more unless it ends by itself, which it mustn't.
    EXPECT_TRUE(worker.isQuietFor(std::chrono::milliseconds(random() % static_cast<unsigned>(longest))));
    worker.kill();
  }
  // What others see in the folder.
  std::vector<std::string> shown(const std::string &folder) const {
    auto found = names(folder);
    std::erase_if(found, [](const std::string &name) { return name.starts_with(".droxa-replacement-"); });
    return found;
  }
  void expectCleanAfterTheCleaner(const std::string &folder) {
    abandoned += FPRemoveAbandonedReplacements(url(folder));
    EXPECT_EQ(names(folder), shown(folder));
  }

  std::minstd_rand random{7};
  std::size_t abandoned = 0;
};
INSTANTIATE_TEST_SUITE_P(On, FPKill, testing::ValuesIn(testedFileSystems()), fileSystemName);

TEST_P(FPKill, inImportsAndDeletionsLeavesAllOrNothing) {
  makeTree("tree");
  makeFolder("to");
  for (int i = 0; i < kKills; ++i) {
    kill({"import-delete", path("tree"), path("to")}, 60);
    const auto there = shown("to");
    if (!there.empty()) {
      EXPECT_EQ(there, std::vector<std::string>{"tree"});
      EXPECT_TRUE(isWholeTree(path("to/tree")));
      EXPECT_FALSE(remove(url("to/tree")));
    }
    expectCleanAfterTheCleaner("to");
  }
  EXPECT_GT(abandoned, 0U) << "no kill was in the middle";
  EXPECT_TRUE(isWholeTree(path("tree")));
}

TEST_P(FPKill, inRenamesLeavesOneName) {
  write("in/a", "words");
  for (int i = 0; i < kKills; ++i) {
    kill({"rename", path("in"), "a", "b"}, 20);
    const auto there = names("in");
    ASSERT_EQ(there.size(), 1U);
    EXPECT_EQ(read("in/" + there[0]), "words");
    if (there[0] == "b") fs::rename(path("in/b"), path("in/a"));
  }
}

TEST_P(FPKill, inMovesLeavesTheItemInOneFolder) {
  makeTree("one/tree");
  makeFolder("two");
  for (int i = 0; i < kKills; ++i) {
    kill({"move", "tree", path("one"), path("two")}, 20);
    EXPECT_EQ(names("one").size() + names("two").size(), 1U);
    if (exists("two/tree")) fs::rename(path("two/tree"), path("one/tree"));
    EXPECT_TRUE(isWholeTree(path("one/tree")));
  }
}

TEST_P(FPKill, inNewFoldersLeavesOneOrNone) {
  makeFolder("in");
  for (int i = 0; i < kKills; ++i) {
    kill({"create-delete", path("in"), "new"}, 20);
    const auto there = shown("in");
    EXPECT_TRUE(there.empty() || there == std::vector<std::string>{"new"});
    if (!there.empty()) fs::remove(path("in/new"));
    expectCleanAfterTheCleaner("in");
  }
}

TEST_P(FPKill, inMovesToAnotherFileSystemNeverLeavesNothing) {
  const MountedFileSystem other("tmpfs", "size=256m");
  if (!other.isMounted()) GTEST_SKIP() << "this machine mounts nothing";
  makeTree("one/tree");
  for (int i = 0; i < kKills; ++i) {
    kill({"move", "tree", path("one"), other.path()}, 120);
    FPRemoveAbandonedReplacements(url("one"));
    FPRemoveAbandonedReplacements(NSURL::fileURLWithPath(other.path()));
    const bool isHere = exists("one/tree");
    const bool isThere = fs::exists(other.path() + "/tree");
    EXPECT_TRUE(isHere || isThere);
    EXPECT_TRUE(!isThere || isWholeTree(other.path() + "/tree"));
    if (isThere) fs::remove_all(other.path() + "/tree");
    EXPECT_TRUE(!isHere || isWholeTree(path("one/tree")));
    if (!isHere) makeTree("one/tree");
    EXPECT_TRUE(fs::is_empty(other.path()));
    EXPECT_EQ(names("one"), std::vector<std::string>{"tree"});
  }
}

}  // namespace
}  // namespace droxa
