#include <atomic>
#include <filesystem>
#include <gtest/gtest.h>
#include <random>
#include <set>
#include <signal.h>
#include <thread>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

// Makes, renames and removes documents in a folder until it is stopped.
class Workload {
 public:
  explicit Workload(std::string folder) : folder_(std::move(folder)), thread_([this] { run(); }) {}
  ~Workload() { stop(); }
  void stop() {
    stopping_ = true;
    if (thread_.joinable()) thread_.join();
  }

 private:
  void run() {
    std::mt19937 random(7);
    for (int i = 0; !stopping_; ++i) {
      const auto name = [&](int n) { return folder_ + "/work " + std::to_string(n); };
      std::error_code ignored;
      writeFile(name(i), std::to_string(random()));
      if (i % 3 == 0) std::filesystem::rename(name(i), name(i) + " renamed", ignored);
      if (i % 5 == 0) std::filesystem::remove(name(i - 5), ignored);
      std::this_thread::sleep_for(1ms);
    }
  }

  const std::string folder_;
  std::atomic<bool> stopping_{false};
  std::thread thread_;
};

std::set<std::string> namesOnDisk(const std::string &folder) {
  std::set<std::string> names;
  for (const auto &entry : std::filesystem::directory_iterator(folder)) names.insert(entry.path().filename());
  return names;
}

class Kill : public ::testing::Test {
 protected:
  void SetUp() override {
    std::filesystem::create_directories(folder);
    drive.start();
  }

  // What the drive shows is what is on the disk, once nothing changes any more.
  void expectTheDiskIsShown() {
    EXPECT_TRUE(eventually([this] {
      const Result result = drive.droxa({"ls", "-0", "work"});
      std::set<std::string> names;
      std::size_t start = 0;
      for (std::size_t end; (end = result.output.find('\0', start)) != std::string::npos; start = end + 1)
        names.insert(result.output.substr(start, end - start));
      return result.status == 0 && names == namesOnDisk(folder);
    })) << drive.droxa({"ls", "work"}).errors;
  }

  Drive drive;
  const std::string folder = drive.documents() + "/work";
  std::mt19937 random{11};
};

TEST_F(Kill, keldAtRandomMomentsLeavesAnIntactDatabase) {
  Workload workload(folder);
  for (int round = 0; round < 8; ++round) {
    std::this_thread::sleep_for(std::chrono::milliseconds(random() % 120));
    drive.keld().signal(SIGKILL);
    ASSERT_EQ(drive.keld().wait(), 128 + SIGKILL);
    drive.startKeld();
    EXPECT_TRUE(eventually([this] { return drive.droxa({"ls", "work"}).status == 0; })) << "round " << round;
  }
  workload.stop();
  expectTheDiskIsShown();
  for (const auto &entry : std::filesystem::directory_iterator(drive.home() + "/state"))
    EXPECT_EQ(entry.path().string().find("damaged"), std::string::npos) << entry.path();
}

TEST_F(Kill, theExtensionAtRandomMomentsIsNotNoticed) {
  Workload workload(folder);
  for (int round = 0; round < 8; ++round) {
    const pid_t extension = drive.extensionPid();
    std::this_thread::sleep_for(std::chrono::milliseconds(random() % 60));
    if (extension > 0) kill(extension, SIGKILL);
    const Result listing = drive.droxa({"ls", "work"});
    EXPECT_EQ(listing.status, 0) << "round " << round << ": " << listing.errors;
  }
  workload.stop();
  expectTheDiskIsShown();
}

TEST_F(Kill, theHostAtRandomMomentsIsStartedAnew) {
  Workload workload(folder);
  for (int round = 0; round < 5; ++round) {
    std::this_thread::sleep_for(std::chrono::milliseconds(random() % 60));
    drive.host().signal(SIGKILL);
    ASSERT_EQ(drive.host().wait(), 128 + SIGKILL);
    drive.startHost();
    EXPECT_TRUE(eventually([this] { return drive.droxa({"ls", "work"}).status == 0; })) << "round " << round;
  }
  workload.stop();
  expectTheDiskIsShown();
}

// A command that waits for a process that doesn't answer ends by its own deadline.
class Hang : public Kill {
 protected:
  void expectADeadline() {
    const auto start = std::chrono::steady_clock::now();
    const Result result = drive.droxa({"--timeout", "2", "ls", "work"});
    EXPECT_NE(result.status, 0);
    EXPECT_NE(result.status, -1) << "droxa hung";
    EXPECT_FALSE(result.errors.empty());
    EXPECT_LT(std::chrono::steady_clock::now() - start, 30s);
  }
};

TEST_F(Hang, aStoppedDaemonCostsOneDeadline) {
  drive.keld().signal(SIGSTOP);
  expectADeadline();
  drive.keld().signal(SIGCONT);
  EXPECT_TRUE(eventually([this] { return drive.droxa({"ls", "work"}).status == 0; }));
}

TEST_F(Hang, aStoppedExtensionCostsOneDeadline) {
  const pid_t extension = drive.extensionPid();
  ASSERT_GT(extension, 0);
  kill(extension, SIGSTOP);
  expectADeadline();
  kill(extension, SIGCONT);
  EXPECT_TRUE(eventually([this] { return drive.droxa({"ls", "work"}).status == 0; }));
}

TEST_F(Hang, aStoppedHostCostsOneDeadline) {
  drive.host().signal(SIGSTOP);
  expectADeadline();
  drive.host().signal(SIGCONT);
  EXPECT_TRUE(eventually([this] { return drive.droxa({"ls", "work"}).status == 0; }));
}

}  // namespace
}  // namespace droxa::testing
