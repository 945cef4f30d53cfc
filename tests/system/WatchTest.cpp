#include <filesystem>
#include <gtest/gtest.h>
#include <signal.h>
#include <unistd.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

// A drive with a watch of its root that stands.
class Watch : public ::testing::Test {
 protected:
  void SetUp() override {
    writeFile(drive.documents() + "/first.txt", "x");
    drive.start();
    if (HasFatalFailure()) return;
    watch = drive.droxaInBackground({"watch", "/"}, "watch");
    ASSERT_TRUE(eventually([this] { return watch->errors().find("watching") != std::string::npos; }))
        << watch->errors();
    writeFile(drive.documents() + "/ready.txt", "x");
    ASSERT_TRUE(prints("ready.txt"));
  }

  ::testing::AssertionResult prints(const std::string &line) {
    if (eventually([&] { return watch->output().find(line) != std::string::npos; }))
      return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure() << "no \"" << line << "\" in:\n"
                                         << watch->output() << watch->errors();
  }

  Drive drive;
  std::unique_ptr<Process> watch;
};

TEST_F(Watch, tellsWhatAnyProgramDoesInTheReplica) {
  writeFile(drive.documents() + "/made.txt", "x");
  EXPECT_TRUE(prints("+ made.txt"));
  writeFile(drive.documents() + "/made.txt", "something longer");
  EXPECT_TRUE(prints("~ made.txt"));
  std::filesystem::rename(drive.documents() + "/made.txt", drive.documents() + "/renamed.txt");
  EXPECT_TRUE(prints("> made.txt -> renamed.txt"));
  std::filesystem::remove(drive.documents() + "/renamed.txt");
  EXPECT_TRUE(prints("- renamed.txt"));
}

TEST_F(Watch, nothingStaleIsSeenAfterAPush) {
  for (int i = 0; i < 20; ++i) {
    const std::string name = "name " + std::to_string(i);
    std::filesystem::rename(drive.documents() + (i == 0 ? "/first.txt" : "/name " + std::to_string(i - 1)),
                            drive.documents() + "/" + name);
    ASSERT_TRUE(prints("-> " + name));
    EXPECT_EQ(drive.droxa({"stat", name}).status, 0);
  }
}

TEST_F(Watch, aSaveByRenameIsAChangeOfTheSameItem) {
  const std::string before = drive.droxa({"id", "first.txt"}).output;
  writeFile(drive.documents() + "/.first.txt.new", "the new contents");
  std::filesystem::rename(drive.documents() + "/.first.txt.new", drive.documents() + "/first.txt");
  EXPECT_TRUE(prints("~ first.txt"));
  EXPECT_EQ(drive.droxa({"id", "first.txt"}).output, before);
}

TEST_F(Watch, anApplicationsFolderAppearsInTheRoot) {
  std::filesystem::create_directories(drive.container("org.example.Sketch"));
  EXPECT_TRUE(prints("Sketch"));
}

TEST_F(Watch, survivesTheExtensionsDeath) {
  const pid_t extension = drive.extensionPid();
  ASSERT_GT(extension, 0);
  kill(extension, SIGKILL);
  writeFile(drive.documents() + "/after.txt", "x");
  EXPECT_TRUE(prints("after.txt"));
}

TEST_F(Watch, survivesTheDaemonsDeath) {
  drive.keld().signal(SIGKILL);
  ASSERT_TRUE(drive.keld().wait());
  writeFile(drive.documents() + "/while it was down.txt", "x");
  drive.startKeld();
  EXPECT_TRUE(prints("while it was down.txt"));
  writeFile(drive.documents() + "/after.txt", "x");
  EXPECT_TRUE(prints("after.txt"));
}

TEST_F(Watch, endsWithStatus0OnInterrupt) {
  watch->signal(SIGINT);
  EXPECT_EQ(watch->wait(), 0);
}

TEST_F(Watch, saysThatTheHostHasGone) {
  drive.host().signal(SIGKILL);
  EXPECT_EQ(watch->wait(), 69);
}

}  // namespace
}  // namespace droxa::testing
