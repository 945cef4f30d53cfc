#include <filesystem>
#include <gtest/gtest.h>
#include <map>
#include <nlohmann/json.hpp>
#include <signal.h>
#include <stdlib.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

// `droxa run` on a home of its own.
class Run : public ::testing::Test {
 protected:
  void start(std::vector<std::string> words = {}) {
    words.insert(words.begin(), "run");
    run = drive.droxaInBackground(words, "run");
    ASSERT_TRUE(eventually([this] { return run->output().find("next:") != std::string::npos; }, 60s))
        << run->output() << run->errors();
  }

  nlohmann::json status() {
    return nlohmann::json::parse(drive.droxa({"status", "--json"}).output, nullptr, false);
  }
  pid_t process(const std::string &name) {
    const nlohmann::json json = status();
    return json.is_object() && json[name].is_object() ? json[name].value("process", 0) : 0;
  }

  static std::map<std::string, std::string> contents(const std::string &folder) {
    std::map<std::string, std::string> all;
    for (const auto &entry : std::filesystem::recursive_directory_iterator(folder))
      if (entry.is_regular_file()) all[entry.path().string()] = readFile(entry.path());
    return all;
  }

  Drive drive;
  std::unique_ptr<Process> run;
};

TEST_F(Run, startsThreeProcessesAndEndsThemOnInterrupt) {
  start();
  std::vector<pid_t> pids;
  for (const char *name : {"keld", "fileproviderd", "extension"}) {
    pids.push_back(process(name));
    EXPECT_GT(pids.back(), 0) << name;
  }
  run->signal(SIGINT);
  EXPECT_EQ(run->wait(), 0) << run->errors();
  for (const pid_t pid : pids) EXPECT_TRUE(eventually([pid] { return kill(pid, 0) != 0; })) << pid;
}

TEST_F(Run, aSecondOneFindsTheFirst) {
  start();
  const Result second = drive.droxa({"run"});
  EXPECT_EQ(second.status, 0);
  EXPECT_NE(second.output.find("runs already, under process " + std::to_string(run->pid())),
            std::string::npos)
      << second.output;
}

TEST_F(Run, servesTheDocumentsOfAFolderAndNeverWritesToIt) {
  const std::string folder = drive.home() + "/original";
  std::filesystem::create_directories(folder + "/inner");
  writeFile(folder + "/one.txt", "1");
  writeFile(folder + "/inner/two.txt", "2");
  const auto before = contents(folder);
  start({folder});
  EXPECT_NE(run->output().find("2 documents in 1 folder of " + folder), std::string::npos) << run->output();
  ASSERT_TRUE(drive.waitForName("one.txt"));
  ASSERT_TRUE(drive.waitForName("two.txt", "inner"));
  EXPECT_TRUE(
      eventually([&] { return drive.contents("inner/two.txt").value("contents", "") == "dataless"; }));
  EXPECT_EQ(drive.droxa({"cat", "inner/two.txt"}).output, "2");
  writeFile(drive.documents() + "/one.txt", "changed in the drive");
  EXPECT_EQ(drive.droxa({"wait"}).status, 0);
  EXPECT_EQ(contents(folder), before);
}

TEST_F(Run, twoHomesOnOneCloudAreTwoDevices) {
  const std::string cloud = drive.home() + "/shared";
  Drive other;
  start({"--cloud", cloud, "--device", "first"});
  ASSERT_TRUE(drive.waitForName("Recipes"));
  ASSERT_EQ(drive.droxa({"wait"}).status, 0);
  const auto second = other.droxaInBackground({"run", "--cloud", cloud, "--device", "second"}, "run");
  ASSERT_TRUE(eventually([&] { return second->output().find("next:") != std::string::npos; }, 60s))
      << second->output() << second->errors();
  ASSERT_TRUE(other.waitForName("Recipes"));
  EXPECT_NE(other.droxa({"status"}).output.find("second"), std::string::npos);
  ASSERT_TRUE(other.waitForName("Welcome.txt"));
  EXPECT_EQ(other.droxa({"cat", "Welcome.txt"}).output, readFile(drive.documents() + "/Welcome.txt"));
  second->signal(SIGINT);
  EXPECT_EQ(second->wait(), 0);
}

TEST_F(Run, aHomeRemembersItsCloudAndRefusesAnother) {
  const std::string cloud = drive.home() + "/shared";
  start({"--cloud", cloud});
  run->signal(SIGINT);
  ASSERT_EQ(run->wait(), 0) << run->errors();
  const Result other = drive.droxa({"run", "--cloud", drive.home() + "/another"});
  EXPECT_EQ(other.status, 78);
  EXPECT_NE(other.errors.find(cloud), std::string::npos) << other.errors;
  EXPECT_FALSE(std::filesystem::exists(drive.home() + "/another"));
  start();
  EXPECT_NE(drive.droxa({"status"}).output.find(cloud), std::string::npos);
}

TEST_F(Run, startsADeadProcessAgain) {
  start();
  for (const char *name : {"keld", "fileproviderd"}) {
    const pid_t first = process(name);
    ASSERT_GT(first, 0);
    kill(first, SIGKILL);
    EXPECT_TRUE(eventually([&] {
      const pid_t now = process(name);
      return now > 0 && now != first;
    })) << name;
    EXPECT_TRUE(eventually([&] { return drive.droxa({"ls"}).status == 0; })) << name;
  }
}

TEST_F(Run, aFolderThatIsNotThereIsNamed) {
  const Result result = drive.droxa({"run", "/no/such/folder"});
  EXPECT_EQ(result.status, 66);
  EXPECT_NE(result.errors.find("/no/such/folder"), std::string::npos);
}

}  // namespace
}  // namespace droxa::testing
