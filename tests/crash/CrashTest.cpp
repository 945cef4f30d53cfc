#include <gtest/gtest.h>
#include <optional>
#include <random>
#include <string>

#include "tests/crash/CrashRun.h"
#include "tests/crash/DocumentText.h"
#include "tests/crash/Schedule.h"

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

}  // namespace
}  // namespace droxa::crash
