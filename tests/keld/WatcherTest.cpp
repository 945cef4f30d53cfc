// Each way of noticing changes notices the same ones.

#include <fcntl.h>
#include <unistd.h>

#include "keld/FolderReading.h"
#include "tests/keld/KeldFixture.h"
#include "tests/support/LogLines.h"

namespace droxa::keld {

namespace {

class Watchers : public testing::TestWithParam<WatcherKind> {
 protected:
  Watchers() : drive(WatchedBy(GetParam())) {}
  KeldFixture drive;
};

std::string kindName(const testing::TestParamInfo<WatcherKind> &info) {
  switch (info.param) {
    case WatcherKind::best:
      return "Best";
    case WatcherKind::fanotify:
      return "Fanotify";
    case WatcherKind::inotify:
      return "Inotify";
    case WatcherKind::scan:
      return "Scanning";
  }
  return "";
}

}  // namespace

TEST_P(Watchers, noticeWhatIsMadeChangedRenamedAndRemoved) {
  drive.waitForFirstScan();
  drive.folder("f/g");
  drive.write("f/g/a", "1");
  ASSERT_TRUE(eventually([&] { return drive.knows("f/g/a"); }));
  drive.write("f/g/a", "longer");
  EXPECT_TRUE(eventually([&] { return drive.record("f/g/a")->facts.size == 6; }));
  std::filesystem::permissions(drive.at("f/g/a"), std::filesystem::perms::owner_read);
  EXPECT_TRUE(eventually([&] { return (drive.record("f/g/a")->facts.mode & 0777) == 0400; }));
  drive.rename("f", "h");
  EXPECT_TRUE(eventually([&] { return drive.knows("h/g/a") && !drive.knows("f"); }));
  drive.write("h/g/b");
  EXPECT_TRUE(eventually([&] { return drive.knows("h/g/b"); }));
  drive.remove("h");
  EXPECT_TRUE(eventually([&] { return !drive.knows("h"); }));
}

TEST_P(Watchers, noticeAFolderThatComesWithItsContents) {
  drive.waitForFirstScan();
  const std::string outside = drive.home().makeFolder("outside/deep");
  drive.home().write("outside/deep/file", "x");
  drive.rename(drive.home().root() + "/outside", "inside");
  EXPECT_TRUE(eventually([&] { return drive.knows("inside/deep/file"); }));
  drive.write("inside/deep/second");
  EXPECT_TRUE(eventually([&] { return drive.knows("inside/deep/second"); }));
}

TEST_P(Watchers, noticeWritesInAFolderThatWasWrittenInBeforeItCame) {
  drive.waitForFirstScan();
  drive.home().makeFolder("outside");
  const std::string path = drive.home().root() + "/outside/file";
  const OwnedDescriptor file(::open(path.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  for (int i = 0; i < 100; ++i) {
    ASSERT_EQ(::write(file.get(), "x", 1), 1);
    // So that the watcher has met the folder as one that is none of its own.
    drive.write("witness " + std::to_string(i));
  }
  ASSERT_TRUE(eventually([&] { return drive.knows("witness 99"); }));
  drive.rename(drive.home().root() + "/outside", "inside");
  ASSERT_TRUE(eventually([&] { return drive.knows("inside/file"); }));
  // Without an end of the writing, which is told by itself.
  ASSERT_EQ(::write(file.get(), "y", 1), 1);
  EXPECT_TRUE(eventually([&] { return drive.record("inside/file")->facts.size == 101; }));
}

TEST_P(Watchers, keepUpWithABurst) {
  drive.waitForFirstScan();
  for (int folder = 0; folder < 20; ++folder) {
    drive.folder("f" + std::to_string(folder));
    for (int file = 0; file < 50; ++file)
      drive.write("f" + std::to_string(folder) + "/" + std::to_string(file));
  }
  drive.settle();
  for (int folder = 0; folder < 20; ++folder)
    EXPECT_EQ(drive.namesIn("f" + std::to_string(folder)).size(), 50U) << folder;
}

TEST_P(Watchers, makeGoodWhatWasLost) {
  drive.folder("f");
  drive.settle();
  OSLogCapture log;
  drive.daemon().keeper().replicaChangesLost("the queue of file-system events ran over");
  drive.write("f/a");
  EXPECT_TRUE(eventually([&] { return drive.knows("f/a"); }));
  EXPECT_TRUE(
      log.contains("[WARNING] the queue of file-system events ran over: looking at the whole replica again"));
}

INSTANTIATE_TEST_SUITE_P(Kinds, Watchers,
                         testing::Values(WatcherKind::best, WatcherKind::inotify, WatcherKind::scan),
                         kindName);

TEST(Watcher, tellsWhichItIs) {
  KeldFixture drive(WatchedBy(WatcherKind::scan));
  Once<QVDaemonStatus, NSError> status("status");
  drive.session()->getStatus(status.completion());
  EXPECT_EQ(status.value<0>().watcher, "scanning, because it was asked for");
  drive.stop();
  drive.options() = WatchedBy(WatcherKind::inotify);
  drive.start();
  EXPECT_EQ(drive.daemon().keeper().watcherDescription(), "inotify");
}

}  // namespace droxa::keld
