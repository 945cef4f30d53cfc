#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <optional>
#include <random>
#include <string>
#include <unistd.h>

#include "tests/crash/CrashRun.h"
#include "tests/crash/DocumentText.h"
#include "tests/crash/RenamingEdit.h"
#include "tests/crash/ReplicaReading.h"
#include "tests/crash/Schedule.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa::crash {
namespace {

void expectNothingLost(std::uint64_t seed) {
  CrashOptions options;
  options.seed = seed;
  const CrashReport report = RunCrashes(options);
  EXPECT_GE(report.kills, options.kills);
  for (const std::string &finding : report.findings) ADD_FAILURE() << finding;
  if (!report.findings.empty()) ADD_FAILURE() << report.summary << "; left behind: " << report.folder;
}

TEST(Crash, tenKillsLoseNothing) {
  expectNothingLost(20261121);
}

TEST(Crash, tenKillsAtOtherMomentsLoseNothing) {
  expectNothingLost(std::random_device()());
}

TEST(Crash, aSeedGivesItsSchedule) {
  Schedule one(5), same(5), other(6);
  const Round round = one.next(), again = same.next(), different = other.next();
  ASSERT_EQ(round.steps.size(), again.steps.size());
  EXPECT_EQ(round.untilKill, again.untilKill);
  EXPECT_EQ(round.steps.front().pick, again.steps.front().pick);
  EXPECT_NE(round.steps.front().pick, different.steps.front().pick);
}

TEST(Crash, onlyAWholeTextIsAVersion) {
  const VersionName name{3, 7};
  const std::string text = DocumentText(name, 1000);
  EXPECT_EQ(ReadDocumentText(text), name);
  EXPECT_EQ(ReadDocumentText(text.substr(0, text.size() - 1)), std::nullopt);
  std::string mixed = text;
  mixed.replace(500, 100, DocumentText({3, 8}, 1000).substr(500, 100));
  EXPECT_EQ(ReadDocumentText(mixed), std::nullopt);
  EXPECT_EQ(ReadDocumentText(text + '\0'), std::nullopt);
  EXPECT_EQ(ReadDocumentText(""), std::nullopt);
}

TEST(Crash, anEditWhoseFolderIsMovedLeavesNoTemporaryFile) {
  for (const bool isBeside : {true, false}) {
    const TemporaryFolder folder;
    const std::filesystem::path root = folder.path();
    std::filesystem::create_directories(root / "f");
    std::filesystem::create_directories(root / "outside");
    std::ofstream(root / "f/a") << "old";
    for (const bool isDone : {false, true}) {
      {
        RenamingEdit edit(root / "f/a", isBeside ? "" : root / "outside", "saving 1");
        ASSERT_TRUE(edit.makeTemporary());
        ASSERT_EQ(::write(edit.temporary(), "new", 3), 3);
        std::filesystem::rename(root / "f", root / "g");
        if (isDone) {
          EXPECT_TRUE(edit.renameOver());
        }
      }
      std::filesystem::rename(root / "g", root / "f");
      EXPECT_EQ(ReadAll(root / "f/a"), isDone ? "new" : "old");
    }
    EXPECT_EQ(ReadTree(root).size(), 3U) << "both folders and the document";
  }
}

}  // namespace
}  // namespace droxa::crash
