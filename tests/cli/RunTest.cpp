#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include "cli/ChildProcess.h"
#include "cli/CommandLine.h"
#include "cli/DocumentCopy.h"
#include "cli/HomeSetup.h"
#include "cli/Run.h"
#include "cli/SampleDrive.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using namespace std::chrono_literals;

// A folder that is removed at the end.
class Setup : public ::testing::Test {
 protected:
  Setup() {
    std::string path = ::testing::TempDir() + "/droxa-cli-XXXXXX";
    root = mkdtemp(path.data());
  }
  ~Setup() override { fs::remove_all(root); }

  static void write(const fs::path &path, const std::string &text) {
    fs::create_directories(path.parent_path());
    std::ofstream(path, std::ios::binary) << text;
  }
  static std::string read(const fs::path &path) {
    std::ostringstream text;
    text << std::ifstream(path, std::ios::binary).rdbuf();
    return text.str();
  }
  DroxaHome home() const { return DroxaHome((root / "home").native()); }
  fs::path documents() const { return documentsFolder(home().replica(), kDefaultContainer); }
  std::optional<HomeSetup> setUp(const std::optional<std::string> &folder = {}) {
    return setUpHome(home(), folder, err, &problem);
  }

  fs::path root;
  std::ostringstream err;
  std::string problem;
};

TEST_F(Setup, aNewHomeGetsTheSampleDrive) {
  const auto made = setUp();
  ASSERT_TRUE(made) << problem;
  EXPECT_TRUE(made->isNew);
  EXPECT_TRUE(fs::exists(documents() / "Welcome.txt"));
  EXPECT_TRUE(fs::is_symlink(documents() / "Budget"));
  EXPECT_TRUE(fs::exists(documents() / "Budget"));
  EXPECT_TRUE(fs::exists(documents() / "~$Welcome.txt"));
  EXPECT_TRUE(fs::exists(home().replica() + "/org.example.sketches/Library/recent"));
}

TEST_F(Setup, aHomeThatHasDocumentsStaysAsItIs) {
  ASSERT_TRUE(setUp());
  fs::remove_all(documents() / "Recipes");
  const auto again = setUp();
  ASSERT_TRUE(again);
  EXPECT_FALSE(again->isNew);
  EXPECT_FALSE(fs::exists(documents() / "Recipes"));
}

TEST_F(Setup, aFillingThatWasCutOffIsGoneOnWith) {
  ASSERT_TRUE(setUp());
  fs::remove(documents() / "Welcome.txt");
  write(home().state() + "/filling", "1");
  ASSERT_TRUE(setUp());
  EXPECT_TRUE(fs::exists(documents() / "Welcome.txt"));
  EXPECT_FALSE(fs::exists(home().state() + "/filling"));
}

TEST_F(Setup, aFoldersDocumentsAreCopied) {
  const fs::path source = root / "source";
  write(source / "a.txt", "one");
  write(source / "inner/deep/b.txt", std::string(300'000, 'b'));
  write(source / "\xff\nname", "odd");
  fs::create_symlink("a.txt", source / "link");
  ::mkfifo((source / "pipe").c_str(), 0600);
  const auto time = fs::last_write_time(source / "a.txt") - 24h;
  fs::last_write_time(source / "a.txt", time);
  const auto made = setUp(source.native());
  ASSERT_TRUE(made) << problem;
  EXPECT_EQ(read(documents() / "a.txt"), "one");
  EXPECT_EQ(fs::last_write_time(documents() / "a.txt"), time);
  EXPECT_EQ(read(documents() / "inner/deep/b.txt"), std::string(300'000, 'b'));
  EXPECT_EQ(read(documents() / "\xff\nname"), "odd");
  EXPECT_EQ(fs::read_symlink(documents() / "link"), "a.txt");
  EXPECT_FALSE(fs::exists(documents() / "pipe"));
  EXPECT_NE(err.str().find("pipe: neither a file, a folder nor a symbolic link"), std::string::npos);
  EXPECT_NE(made->summary.find("a copy of 4 documents in 2 folders"), std::string::npos) << made->summary;
}

TEST_F(Setup, aHomeInsideTheFolderIsntCopiedIntoItself) {
  write(root / "a.txt", "one");
  ASSERT_TRUE(setUp(root.native())) << problem;
  EXPECT_TRUE(fs::exists(documents() / "a.txt"));
  EXPECT_FALSE(fs::exists(documents() / "home"));
}

TEST_F(Setup, documentsThatAreThereAlreadyStay) {
  write(root / "source/a.txt", "theirs");
  write(root / "target/a.txt", "mine");
  DocumentCopy copy("", [](const std::string &, const std::string &) {});
  DocumentCopy::Result result;
  EXPECT_TRUE(copy.copy(root / "source", root / "target", &result, &problem));
  EXPECT_EQ(read(root / "target/a.txt"), "mine");
  EXPECT_EQ(result.documents, 0U);
}

TEST(Run, eachFolderHasAHomeOfItsOwn) {
  EXPECT_EQ(homeForFolder("/x/docs").root(), homeForFolder("/x/docs").root());
  EXPECT_NE(homeForFolder("/x/docs").root(), homeForFolder("/y/docs").root());
}

TEST_F(Setup, aProgramThatKeepsEndingWaitsLongerEachTime) {
  ChildProcess child("failing", {"/bin/false"}, root / "failing.log");
  std::vector<long> pauses;
  for (int end = 0; end < 9; ++end) {
    ASSERT_TRUE(child.start(&problem)) << problem;
    int status = 0;
    ASSERT_EQ(waitpid(child.identifier(), &status, 0), child.identifier());
    const auto now = ChildProcess::Clock::now();
    child.ended(status, now);
    pauses.push_back(
        std::chrono::duration_cast<std::chrono::milliseconds>(child.startAgainAt() - now).count());
  }
  EXPECT_EQ(child.lastEnd(), "exit status 1");
  EXPECT_EQ(pauses, (std::vector<long>{0, 200, 400, 800, 1600, 3200, 6400, 10'000, 10'000}));
}

TEST_F(Setup, whatAProgramPrintsIsInItsLog) {
  ChildProcess child("talking", {"/bin/sh", "-c", "echo out; echo err >&2"}, root / "talking.log");
  ASSERT_TRUE(child.start(&problem)) << problem;
  int status = 0;
  ASSERT_EQ(waitpid(child.identifier(), &status, 0), child.identifier());
  EXPECT_EQ(read(root / "talking.log"), "out\nerr\n");
}

// The whole command line, without anything that runs.
class CommandLineTest : public Setup {
 protected:
  int droxa(std::vector<std::string> words) {
    words.insert(words.begin(), {"droxa", "--home", (root / "home").native()});
    std::vector<const char *> argv;
    for (const std::string &word : words) argv.push_back(word.c_str());
    out.str("");
    err.str("");
    return droxaMain(static_cast<int>(argv.size()), argv.data(), out, err);
  }
  std::ostringstream out;
};

TEST_F(CommandLineTest, everyCommandHasHelp) {
  for (const char *command : {"ls", "stat", "id", "url", "tree", "watch", "status", "account", "run"}) {
    EXPECT_EQ(droxa({command, "--help"}), 0) << command;
    EXPECT_NE(out.str().find("Usage: "), std::string::npos) << command;
  }
  EXPECT_EQ(droxa({"--help"}), 0);
  EXPECT_NE(out.str().find("Exit status"), std::string::npos);
}

TEST_F(CommandLineTest, wrongUsageEndsWith2) {
  const std::vector<std::vector<std::string>> wrong{{},
                                                    {"no-such"},
                                                    {"ls", "--no-such"},
                                                    {"ls", "--sort", "size"},
                                                    {"ls", "--working-set", "--sort", "date"},
                                                    {"ls", "-0", "--json"},
                                                    {"stat"},
                                                    {"--timeout", "never", "ls"},
                                                    {"account", "sign-in"}};
  for (const auto &words : wrong) EXPECT_EQ(droxa(words), 2) << (words.empty() ? "" : words.back());
}

TEST_F(CommandLineTest, withoutAHostEveryQuestionEndsWith69) {
  for (const char *command : {"ls", "tree"}) {
    EXPECT_EQ(droxa({command}), 69) << command;
    EXPECT_NE(err.str().find("fileproviderd doesn't answer at"), std::string::npos) << err.str();
  }
}

TEST_F(CommandLineTest, runNamesAFolderThatIsntThere) {
  EXPECT_EQ(droxa({"run", "/no/such/folder"}), 66);
  EXPECT_NE(err.str().find("/no/such/folder"), std::string::npos);
}

}  // namespace
}  // namespace droxa::testing
