#include <algorithm>
#include <cstdlib>
#include <gtest/gtest.h>
#include <thread>
#include <vector>

#include "additions/QVLogSection.h"
#include "tests/support/LogLines.h"

namespace droxa {
namespace {

using Lines = std::vector<std::string>;

// The counter belongs to the process: these tests speak of the tags that follow the newest odd one.
std::uint64_t newestOddTag() {
  return QVLogSectionCreate(false);
}

TEST(LogSection, debugSectionsHaveOddTags) {
  const std::uint64_t before = newestOddTag();
  EXPECT_EQ(before % 2, 1u);
  EXPECT_EQ(QVLogSectionCreate(false), before + 2);
  EXPECT_EQ(QVLogSectionCreate(false), before + 4);
}

TEST(LogSection, informationSectionsHaveEvenTags) {
  const std::uint64_t before = newestOddTag();
  EXPECT_EQ(QVLogSectionCreate(true), before + 1);
  EXPECT_EQ(QVLogSectionCreate(true), before + 3);
}

TEST(LogSection, anInformationSectionFitsBetweenTwoDebugSections) {
  const std::uint64_t first = newestOddTag();
  EXPECT_EQ(QVLogSectionCreate(true), first + 1);
  EXPECT_EQ(QVLogSectionCreate(false), first + 2);
}

TEST(LogSection, theFirstTagsOfAProcessAreOneTwoThree) {
  GTEST_FLAG_SET(death_test_style,
                 "threadsafe");  // the child is a new process, which has opened no section yet
  EXPECT_EXIT(
      {
        const bool expected =
            QVLogSectionCreate(false) == 1 && QVLogSectionCreate(true) == 2 && QVLogSectionCreate(false) == 3;
        std::_Exit(expected ? 0 : 1);
      },
      testing::ExitedWithCode(0), "");
}

TEST(LogSection, aProcessThatBeginsWithAnInformationSectionBeginsWithTwo) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(std::_Exit(QVLogSectionCreate(true) == 2 ? 0 : 1), testing::ExitedWithCode(0), "");
}

TEST(LogSection, theEndIsLoggedAtTheSectionsLevel) {
  const OSLogCapture capture;
  QVLogSectionEnd(0x1f);
  QVLogSectionEnd(0x20);
  EXPECT_EQ(logLines(capture), (Lines{"debug: [DEBUG] ┗1f ", "info: [INFO] ┗20 "}));
}

TEST(LogSection, theEndOfNoSectionLogsNothing) {
  const OSLogCapture capture;
  QVLogSectionEnd(0);
  EXPECT_EQ(logLines(capture), Lines{});
}

TEST(LogSection, openingLogsNothing) {
  const OSLogCapture capture;
  QVLogSectionCreate(false);
  QVLogSectionCreate(true);
  EXPECT_EQ(logLines(capture), Lines{});
}

TEST(LogSection, aScopeEndsItsSectionOnEveryWayOut) {
  const OSLogCapture capture;
  std::uint64_t tag = 0;
  const auto leaveEarly = [&tag] {
    const QVLogSection section(false);
    tag = section.tag();
    if (tag != 0) return;
    FAIL();
  };
  leaveEarly();
  EXPECT_EQ(logLines(capture), (Lines{"debug: [DEBUG] ┗" + hexTag(tag) + " "}));
}

TEST(LogSection, threadsGetTagsOfTheirOwnWithTheRightParity) {
  constexpr std::size_t kThreads = 8;
  constexpr std::size_t kSections = 500;
  std::vector<std::vector<std::uint64_t>> tags(kThreads);
  std::vector<std::thread> threads;
  for (std::size_t i = 0; i < kThreads; ++i) {
    threads.emplace_back([&tags, i] {
      for (std::size_t n = 0; n < kSections; ++n) tags[i].push_back(QVLogSectionCreate(i % 2 == 0));
    });
  }
  for (std::thread &thread : threads) thread.join();

  std::vector<std::uint64_t> all;
  for (std::size_t i = 0; i < kThreads; ++i) {
    EXPECT_TRUE(std::is_sorted(tags[i].begin(), tags[i].end()));
    for (const std::uint64_t tag : tags[i]) EXPECT_EQ(tag % 2 == 0, i % 2 == 0) << tag;
    all.insert(all.end(), tags[i].begin(), tags[i].end());
  }
  std::sort(all.begin(), all.end());
  EXPECT_EQ(std::adjacent_find(all.begin(), all.end()), all.end()) << "a tag was given out twice";
}

}  // namespace
}  // namespace droxa
