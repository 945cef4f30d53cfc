#include <atomic>
#include <filesystem>
#include <gtest/gtest.h>
#include <random>
#include <thread>

#include "platform/foundation/NSFileCoordinator.h"
#include "tests/platform/FileWorkerProcess.h"
#include "tests/platform/TemporaryFolder.h"
#include "tests/support/Eventually.h"

namespace droxa {
namespace {

using std::chrono::milliseconds;

struct NSFileCoordinatorTest : testing::Test {
  NSURL url(const std::string &name) const { return NSURL::fileURLWithPath(folder.path() + "/" + name); }
  std::unique_ptr<NSFileAccess> take(const std::vector<NSFileAccessIntent> &intents,
                                     milliseconds patience = kTestDeadline) {
    return NSFileCoordinator(lockFile, patience).coordinateAccess(intents, nullptr, &error);
  }
  std::unique_ptr<NSFileAccess> read(const std::string &name, milliseconds patience = kTestDeadline) {
    return take({NSFileAccessIntent::readingIntent(url(name))}, patience);
  }
  std::unique_ptr<NSFileAccess> write(const std::string &name, milliseconds patience = kTestDeadline) {
    return take({NSFileAccessIntent::writingIntent(url(name))}, patience);
  }
  bool isFreeForReading(const std::string &name) { return read(name, milliseconds(20)) != nullptr; }
  bool isFreeForWriting(const std::string &name) { return write(name, milliseconds(20)) != nullptr; }

  const TemporaryFolder folder;
  const std::string lockFile = folder.path() + "/.locks";
  NSError error;
};

TEST_F(NSFileCoordinatorTest, aWriterKeepsOutOthersOfThePathAndBelow) {
  const auto access = write("a");
  ASSERT_TRUE(access);
  EXPECT_FALSE(isFreeForWriting("a"));
  EXPECT_FALSE(isFreeForReading("a"));
  EXPECT_FALSE(isFreeForWriting("a/b/c"));
  EXPECT_FALSE(isFreeForReading("a/b/c"));
}

TEST_F(NSFileCoordinatorTest, aWriterWaitsForThoseAtWorkBelow) {
  const auto access = read("a/b/c");
  EXPECT_FALSE(isFreeForWriting("a/b"));
  EXPECT_FALSE(isFreeForWriting(""));
  EXPECT_TRUE(isFreeForReading("a/b"));
}

TEST_F(NSFileCoordinatorTest, readersShareAndUnrelatedPathsDontMeet) {
  const auto reader = read("a");
  const auto writer = write("b");
  EXPECT_TRUE(isFreeForReading("a"));
  EXPECT_FALSE(isFreeForWriting("a"));
  EXPECT_TRUE(isFreeForWriting("c"));
  EXPECT_TRUE(isFreeForWriting("bb"));
  EXPECT_TRUE(isFreeForReading(""));
}

TEST_F(NSFileCoordinatorTest, anAccessIsGivenBackWhenItGoes) {
  write("a").reset();
  EXPECT_TRUE(isFreeForWriting("a"));
}

TEST_F(NSFileCoordinatorTest, onePathTwiceIsTheStrongerAccess) {
  const auto access =
      take({NSFileAccessIntent::writingIntent(url("a")), NSFileAccessIntent::readingIntent(url("a")),
            NSFileAccessIntent::writingIntent(url("a/b"))});
  ASSERT_TRUE(access) << error.description();
  EXPECT_FALSE(isFreeForReading("a"));
}

TEST_F(NSFileCoordinatorTest, aFolderIsTheSameThroughASymbolicLink) {
  std::filesystem::create_directory(folder.path() + "/real");
  std::filesystem::create_symlink("real", folder.path() + "/link");
  const auto access = write("real/a");
  EXPECT_FALSE(isFreeForWriting("link/a"));
}

TEST_F(NSFileCoordinatorTest, theEndOfPatienceNamesThePath) {
  const auto access = write("a");
  EXPECT_FALSE(write("a/b", milliseconds(5)));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileWriteUnknownError));
  EXPECT_EQ(error.underlyingError(), NSError::errorWithPOSIXCode(ETIMEDOUT));
  EXPECT_NE(error.localizedDescription().find(url("a").path()), std::string::npos);
}

TEST_F(NSFileCoordinatorTest, cancellationEndsAWait) {
  const auto access = write("a");
  const auto progress = std::make_shared<NSProgress>();
  std::jthread canceller([&] { progress->cancel(); });
  EXPECT_FALSE(NSFileCoordinator(lockFile).coordinateAccess({NSFileAccessIntent::readingIntent(url("a"))},
                                                            progress, &error));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSUserCancelledError));
}

TEST_F(NSFileCoordinatorTest, aLockFileThatCantBeUsedIsNamed) {
  NSFileCoordinator coordinator(folder.path() + "/missing/locks");
  EXPECT_FALSE(coordinator.coordinateAccess({NSFileAccessIntent::readingIntent(url("a"))}, nullptr, &error));
  EXPECT_NE(error.localizedDescription().find("/missing/locks"), std::string::npos);
}

TEST_F(NSFileCoordinatorTest, anotherProcessHoldsUntilItLetsGo) {
  FileWorkerProcess holder({lockFile, "write", url("a").path()});
  ASSERT_EQ(holder.nextLine(), "held");
  EXPECT_FALSE(isFreeForReading("a/b"));
  EXPECT_TRUE(isFreeForWriting("b"));
  holder.letGo();
  EXPECT_TRUE(read("a/b"));
}

TEST_F(NSFileCoordinatorTest, anotherProcessWaits) {
  auto access = write("a");
  FileWorkerProcess waiter({lockFile, "read", url("a/b").path()});
  EXPECT_TRUE(waiter.isQuietFor(milliseconds(50)));
  access.reset();
  EXPECT_EQ(waiter.nextLine(), "held");
}

TEST_F(NSFileCoordinatorTest, aKilledHolderHoldsNothing) {
  FileWorkerProcess holder({lockFile, "write", url("a").path()});
  ASSERT_EQ(holder.nextLine(), "held");
  holder.kill();
  EXPECT_TRUE(write("a"));
}

TEST_F(NSFileCoordinatorTest, aKilledWaiterIsInNobodysWay) {
  auto access = read("a");
  FileWorkerProcess waiter({lockFile, "write", url("a").path()});
  // The waiter's turnstile keeps new readers out.
  ASSERT_TRUE(eventually([&] { return !isFreeForReading("a"); }));
  waiter.kill();
  EXPECT_TRUE(read("a"));
}

TEST_F(NSFileCoordinatorTest, aWriterIsNotOvertakenForEver) {
  std::atomic<bool> stop = false;
  std::atomic<int> reads = 0;
  std::vector<std::jthread> readers;
  for (int i = 0; i < 4; ++i) {
    readers.emplace_back([&] {
      NSError ignored;
      const NSFileCoordinator coordinator(lockFile);
      while (!stop) {
        const auto held =
            coordinator.coordinateAccess({NSFileAccessIntent::readingIntent(url("a/b"))}, nullptr, &ignored);
        if (held) ++reads;
        // Long enough that the others come in meanwhile: there is a reader nearly always.
        for (int yields = 0; yields < 200; ++yields) std::this_thread::yield();
      }
    });
  }
  EXPECT_TRUE(eventually([&] { return reads > 100; }));
  for (int i = 0; i < 5; ++i) EXPECT_TRUE(write("a")) << error.description();
  stop = true;
}

TEST_F(NSFileCoordinatorTest, processesNeverWriteTogether) {
  constexpr int kTimes = 200;
  {
    std::vector<std::unique_ptr<FileWorkerProcess>> workers;
    for (int i = 0; i < 4; ++i) {
      workers.push_back(std::make_unique<FileWorkerProcess>(std::vector<std::string>{
          lockFile, "count", url("a").path(), url("number").path(), std::to_string(kTimes)}));
    }
    for (const auto &worker : workers) EXPECT_EQ(worker->waitForEnd(), 0);
  }
  long number = 0;
  std::ifstream(url("number").path()) >> number;
  EXPECT_EQ(number, 4 * kTimes);
}

// Accesses to random pairs of nested paths, in any order, by threads that note who is where.
struct CrossingAccesses : NSFileCoordinatorTest {
  static constexpr int kPaths = 7;
  static bool related(int a, int b) {
    return kParts[a].starts_with(kParts[b]) || kParts[b].starts_with(kParts[a]);
  }
  void work(unsigned seed) {
    std::minstd_rand random(seed);
    for (int i = 0; i < 150; ++i) {
      const int a = static_cast<int>(random() % kPaths);
      const int b = static_cast<int>(random() % kPaths);
      NSError failure;
      const auto access =
          NSFileCoordinator(lockFile, kTestDeadline)
              .coordinateAccess({NSFileAccessIntent::writingIntent(url(std::string(kParts[a]))),
                                 NSFileAccessIntent::writingIntent(url(std::string(kParts[b])))},
                                nullptr, &failure);
      if (!access) ++failures;
      if (access) enter(a, b);
    }
  }
  void enter(int a, int b) {
    for (const int mine : {a, b}) ++writers[mine];
    for (int other = 0; other < kPaths; ++other) {
      const int expected = (other == a ? 1 : 0) + (other == b ? 1 : 0);
      if ((related(other, a) || related(other, b)) && writers[other] != expected) ++meetings;
    }
    for (const int mine : {a, b}) --writers[mine];
  }
  static constexpr std::string_view kParts[kPaths] = {"r/",     "r/a/",   "r/b/", "r/a/x/",
                                                      "r/a/y/", "r/b/x/", "s/"};
  std::atomic<int> writers[kPaths] = {};
  std::atomic<int> meetings = 0;
  std::atomic<int> failures = 0;
};

TEST_F(CrossingAccesses, neverMeetAndNeverWaitInACircle) {
  {
    std::vector<std::jthread> threads;
    for (unsigned seed = 1; seed <= 8; ++seed) threads.emplace_back([this, seed] { work(seed); });
  }
  EXPECT_EQ(meetings, 0);
  EXPECT_EQ(failures, 0);
}

}  // namespace
}  // namespace droxa
