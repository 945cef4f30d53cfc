#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <signal.h>
#include <stdlib.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/ExtensionLauncher.h"
#include "tests/fileproviderd/ScriptedExtension.h"

namespace droxa::testing {
namespace {

using namespace std::chrono_literals;

class NoSignals final : public NSFileProviderHostProtocol {
 public:
  void signalEnumerator(const std::string &, NSFileProviderErrorCompletion completion) override {
    completion(NSError());
  }
};

// Real processes, but programs that aren't extensions.
class ExtensionLauncherTest : public ::testing::Test {
 protected:
  ExtensionLauncherTest() {
    std::string path = ::testing::TempDir() + "/droxa-launcher-XXXXXX";
    folder = mkdtemp(path.data());
  }
  ~ExtensionLauncherTest() override {
    if (launcher) launcher->stop();
    std::filesystem::remove_all(folder);
  }

  void launchFrom(const std::string &program) {
    ExtensionLauncher::Configuration configuration;
    configuration.program = program;
    configuration.home = "/h";
    configuration.firstPause = 1h;
    configuration.longestPause = 1h;
    launcher = std::make_shared<ExtensionLauncher>(configuration, [told = ends] { told->put(true); });
    launcher->setHost(std::make_shared<NoSignals>());
    calls = std::make_unique<ExtensionCalls>(launcher);
  }
  std::string script(const std::string &text) {
    const std::string path = folder + "/program";
    std::ofstream(path) << "#!/bin/sh\n" << text << "\n";
    chmod(path.c_str(), 0700);
    return path;
  }
  // What a question of the extension ends with.
  std::string ask() {
    Arrivals<std::string> answers;
    calls->itemForIdentifier(
        "d1", [&](const auto &, const NSError &error) { answers.put(error.localizedDescription()); });
    return answers.take();
  }

  std::string folder;
  std::shared_ptr<ExtensionLauncher> launcher;
  std::unique_ptr<ExtensionCalls> calls;
  // Shared: the last end may be told after stop() has returned.
  std::shared_ptr<Arrivals<bool>> ends = std::make_shared<Arrivals<bool>>();
};

TEST_F(ExtensionLauncherTest, nothingRunsBeforeItIsNeeded) {
  launchFrom("/bin/false");
  EXPECT_EQ(launcher->status().launches, 0U);
  EXPECT_EQ(launcher->status().processIdentifier, 0);
}

TEST_F(ExtensionLauncherTest, aProgramThatIsntThereIsNamed) {
  launchFrom("/no/such/program");
  EXPECT_EQ(ask(), "can't start /no/such/program: No such file or directory");
}

TEST_F(ExtensionLauncherTest, oneThatKeepsEndingIsLeftAloneAndTheReasonTold) {
  launchFrom(script("exit 3"));
  EXPECT_EQ(ask(), "the extension ended before it answered: exit status 3");
  EXPECT_EQ(launcher->status().launches, 2U);
  EXPECT_TRUE(ends->take());
  EXPECT_TRUE(ends->take());
  const std::string last = ask();
  EXPECT_TRUE(last.starts_with(
      "the extension ended 3 times before it answered anything (exit status 3); it is started "
      "again in "))
      << last;
  EXPECT_EQ(launcher->status().launches, 3U);
  EXPECT_EQ(launcher->status().lastEnd, "exit status 3");
}

TEST_F(ExtensionLauncherTest, itGetsItsHomeAndOneSocketAndNothingElse) {
  const int leak = fcntl(0, F_DUPFD, 50);  // without close-on-exec
  launchFrom(script("echo \"$@\" > " + folder + "/arguments; ls /proc/$$/fd | tr '\\n' ' ' > " + folder +
                    "/descriptors"));
  ask();
  EXPECT_TRUE(ends->take());
  std::string arguments;
  std::getline(std::ifstream(folder + "/arguments") >> std::ws, arguments);
  EXPECT_EQ(arguments, "--home /h --host-descriptor 3");
  std::string descriptors;
  std::getline(std::ifstream(folder + "/descriptors"), descriptors);
  EXPECT_EQ(descriptors.find(" " + std::to_string(leak) + " "), std::string::npos) << descriptors;
  close(leak);
}

TEST_F(ExtensionLauncherTest, aKilledOneIsStartedAgainHoweverOften) {
  launchFrom(script("kill -9 $$"));
  for (int round = 0; round < 4; ++round)
    EXPECT_EQ(ask(), "the extension ended before it answered: killed by signal 9");
  EXPECT_EQ(launcher->status().launches, 8U);
}

TEST_F(ExtensionLauncherTest, stoppingEndsTheProcessAndStartsNoOther) {
  launchFrom(script("exec sleep 100"));
  NSError error;
  ASSERT_TRUE(launcher->extension([](const NSError &) {}, &error)) << error.description();
  const pid_t process = launcher->status().processIdentifier;
  ASSERT_GT(process, 0);
  launcher->stop();
  EXPECT_EQ(launcher->status().processIdentifier, 0);
  EXPECT_NE(kill(process, 0), 0);
  EXPECT_EQ(launcher->status().lastEnd, "killed by signal 15");
  EXPECT_EQ(ask(), "the host is ending");
}

TEST_F(ExtensionLauncherTest, oneThatDoesntEndIsKilled) {
  launchFrom(script("trap '' TERM; echo up > " + folder + "/up; while :; do sleep 1; done"));
  NSError error;
  ASSERT_TRUE(launcher->extension([](const NSError &) {}, &error)) << error.description();
  const auto until = std::chrono::steady_clock::now() + 10s;
  while (!std::filesystem::exists(folder + "/up") && std::chrono::steady_clock::now() < until)
    std::this_thread::yield();
  launcher->stop();
  EXPECT_EQ(launcher->status().lastEnd, "killed by signal 9");
}

}  // namespace
}  // namespace droxa::testing
