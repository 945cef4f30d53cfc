#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <stdlib.h>
#include <sys/stat.h>
#include <sys/wait.h>

#include "cli/ChildProcess.h"
#include "cli/CommandLine.h"
#include "cli/FolderImport.h"
#include "cli/HomeCloud.h"
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
    std::string path = ::testing::TempDir() + "droxa-cli-XXXXXX";
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
    HomeSetupRequest request;
    request.folder = folder;
    request.hasCloudOfOthers = hasCloudOfOthers;
    request.import = [this](const std::string &asked) {
      imported.push_back(asked);
      markerStood = fs::exists(home().state() + "/filling");
      return importEnds;
    };
    return setUpHome(home(), request, &problem);
  }

  fs::path root;
  std::ostringstream err;
  std::string problem;
  bool hasCloudOfOthers = false;
  FolderImportResult importEnds{FolderImportResult::End::done, 4, 2, 1'400'000, 0, ""};
  std::vector<std::string> imported;
  bool markerStood = false;
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

TEST_F(Setup, aFoldersDocumentsGoIntoTheCloudAndNotIntoTheReplica) {
  write(root / "source/a.txt", "one");
  const auto made = setUp(root / "source");
  ASSERT_TRUE(made) << problem;
  EXPECT_EQ(imported, std::vector<std::string>{(root / "source").native()});
  EXPECT_TRUE(markerStood);
  EXPECT_TRUE(fs::is_empty(documents()));
  EXPECT_NE(made->summary.find("4 documents in 2 folders of "), std::string::npos) << made->summary;
  EXPECT_NE(made->summary.find("1.4 MB in the cloud alone"), std::string::npos) << made->summary;
}

TEST_F(Setup, anImportThatFailedOrWasStoppedIsDoneAgain) {
  importEnds.end = FolderImportResult::End::failed;
  importEnds.problem = "the cloud is full";
  EXPECT_FALSE(setUp(root));
  EXPECT_NE(problem.find("the cloud is full"), std::string::npos) << problem;
  importEnds.end = FolderImportResult::End::stopped;
  EXPECT_TRUE(setUp(root)->isStopped);
  importEnds.end = FolderImportResult::End::done;
  EXPECT_TRUE(setUp(root)->isNew);
  EXPECT_EQ(imported.size(), 3U);
}

TEST_F(Setup, aHomeThatIsntNewImportsNothing) {
  ASSERT_TRUE(setUp());
  const auto again = setUp(root);
  ASSERT_TRUE(again);
  EXPECT_TRUE(imported.empty());
  EXPECT_NE(again->summary.find("is not put in again"), std::string::npos) << again->summary;
}

TEST_F(Setup, aHomeOnTheCloudOfOthersGetsNoSampleDrive) {
  hasCloudOfOthers = true;
  const auto made = setUp();
  ASSERT_TRUE(made);
  EXPECT_TRUE(made->isNew);
  EXPECT_TRUE(fs::is_empty(documents()));
}

// A program that stands for the importing one.
class Import : public Setup {
 protected:
  FolderImportResult import(const std::string &script, bool isTerminal = false) {
    return runFolderImport({"/bin/sh", "-c", script}, isTerminal, out, err);
  }
  std::ostringstream out;
};

TEST_F(Import, countsWhatItIsToldAndPassesOnWhatIsLeftOut) {
  const auto result = import(
      "echo '1 documents, 0 folders, 5 bytes'; echo 'keld: left out a\tb: no' >&2;"
      "echo '2 documents, 1 folders, 9 bytes'");
  EXPECT_EQ(result.end, FolderImportResult::End::done);
  EXPECT_EQ(result.documents, 2U);
  EXPECT_EQ(result.folders, 1U);
  EXPECT_EQ(result.bytes, 9U);
  EXPECT_EQ(result.leftOut, 1U);
  EXPECT_NE(err.str().find("droxa: left out a"), std::string::npos) << err.str();
  EXPECT_EQ(out.str(), "") << "lines are for a terminal";
}

TEST_F(Import, showsHowFarItIsInOneLineOfATerminal) {
  import("echo '1 documents, 0 folders, 5 bytes'", true);
  EXPECT_EQ(out.str(), "\rinto the cloud: 1 document, 0 folders, 5 bytes\033[K\r\033[K");
}

TEST_F(Import, aFailureHasTheLastWordsOfTheProgram) {
  const auto result = import("echo 'keld: the disk is full' >&2; exit 74");
  EXPECT_EQ(result.end, FolderImportResult::End::failed);
  EXPECT_EQ(result.problem, "the disk is full");
  EXPECT_EQ(import("exit 3").problem, "keld ended with status 3");
  EXPECT_EQ(runFolderImport({"/no/such/program"}, false, out, err).end, FolderImportResult::End::failed);
}

TEST_F(Setup, aHomeRemembersItsCloudAndItsDevice) {
  ASSERT_TRUE(home().create(&problem));
  const auto first = resolveHomeCloud(home(), root / "cloud", "laptop", {}, &problem);
  ASSERT_TRUE(first) << problem;
  EXPECT_EQ(first->keldOptions(),
            (std::vector<std::string>{"--cloud", (root / "cloud").native(), "--device", "laptop"}));
  ASSERT_TRUE(rememberHomeCloud(home(), *first, &problem)) << problem;
  const auto later = resolveHomeCloud(home(), {}, {}, {}, &problem);
  ASSERT_TRUE(later) << problem;
  EXPECT_EQ(later->keldOptions(), first->keldOptions());
}

TEST_F(Setup, aDriveStaysInItsCloudOnceItWasServed) {
  ASSERT_TRUE(home().create(&problem));
  ASSERT_TRUE(rememberHomeCloud(home(), HomeCloud(), &problem));
  EXPECT_TRUE(resolveHomeCloud(home(), root / "other", {}, {}, &problem))
      << "nothing was served yet: " << problem;
  write(home().state() + "/sync.sqlite", "");
  EXPECT_FALSE(resolveHomeCloud(home(), root / "other", {}, {}, &problem));
  EXPECT_NE(problem.find((root / "other").native()), std::string::npos) << problem;
  EXPECT_NE(problem.find(home().root() + "/cloud"), std::string::npos) << problem;
  EXPECT_TRUE(resolveHomeCloud(home(), home().root() + "/cloud/", {}, {}, &problem)) << problem;
}

TEST_F(Setup, aDriveStaysItsAccountsOnceItWasServed) {
  ASSERT_TRUE(home().create(&problem));
  const auto first = resolveHomeCloud(home(), {}, {}, "anna", &problem);
  ASSERT_TRUE(first) << problem;
  EXPECT_EQ(first->keldOptions(), (std::vector<std::string>{"--account", "anna"}));
  ASSERT_TRUE(rememberHomeCloud(home(), *first, &problem)) << problem;
  EXPECT_EQ(rememberedAccount(home()), "anna");
  EXPECT_TRUE(resolveHomeCloud(home(), {}, {}, "ben", &problem)) << "nothing was served yet: " << problem;
  write(home().state() + "/sync.sqlite", "");
  EXPECT_FALSE(resolveHomeCloud(home(), {}, {}, "ben", &problem));
  EXPECT_NE(problem.find("\"anna\""), std::string::npos) << problem;
  EXPECT_NE(problem.find("name another --home"), std::string::npos) << problem;
  const auto later = resolveHomeCloud(home(), {}, {}, {}, &problem);
  ASSERT_TRUE(later) << problem;
  EXPECT_EQ(later->keldOptions(), first->keldOptions());
  EXPECT_FALSE(resolveHomeCloud(home(), {}, {}, "", &problem));
}

TEST_F(Setup, aCloudAmongTheDocumentsIsRefused) {
  ASSERT_TRUE(home().create(&problem));
  EXPECT_FALSE(resolveHomeCloud(home(), home().replica() + "/cloud", {}, {}, &problem));
  EXPECT_FALSE(resolveHomeCloud(home(), home().root(), {}, {}, &problem));
}

TEST_F(Setup, aSettingThatCantBeReadIsNamed) {
  ASSERT_TRUE(home().create(&problem));
  write(home().configuration() + "/cloud.json", "no JSON");
  EXPECT_FALSE(resolveHomeCloud(home(), {}, {}, {}, &problem));
  EXPECT_NE(problem.find("cloud.json"), std::string::npos) << problem;
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
  for (const char *command : {"ls", "stat", "id", "url", "tree", "watch", "status", "account", "run", "cat",
                              "open", "download", "evict", "pin", "unpin", "wait", "deletions"}) {
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
                                                    {"account", "sign-in"},
                                                    {"cat"},
                                                    {"evict"},
                                                    {"wait", "--timeout", "0"},
                                                    {"deletions", "perhaps"}};
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
