#include <cstdlib>
#include <gtest/gtest.h>
#include <thread>

#include "platform/oslog/os_log.h"
#include "tests/platform/oslog/StderrPipe.h"

namespace droxa {
namespace {

using Texts = std::vector<std::string>;

os_log_t handle() {
  return os_log_create("com.example", "tests");
}

TEST(os_log, aHandleIsTheSameForTheSameNames) {
  EXPECT_EQ(os_log_create("a", "b"), os_log_create("a", "b"));
  EXPECT_NE(os_log_create("a", "b"), os_log_create("a", "c"));
  EXPECT_EQ(os_log_create("a", "b")->subsystem, "a");
  EXPECT_EQ(os_log_create("a", "b")->category, "b");
}

TEST(os_log, aCaptureKeepsHandleLevelAndTextOfEveryLevel) {
  const OSLogCapture log;
  os_log_debug(handle(), "[DEBUG] %d", 1);
  os_log_info(handle(), "[INFO] %@", std::string("two"));
  os_log(handle(), "[NOTICE] %s", "three");
  os_log_error(handle(), "[ERROR] four");
  os_log_fault(os_log_create("x", "y"), "[CRIT] %llx", 5ULL);
  const std::vector<OSLogLine> lines = log.lines();
  ASSERT_EQ(lines.size(), 5U);
  EXPECT_EQ(log.texts(), (Texts{"[DEBUG] 1", "[INFO] two", "[NOTICE] three", "[ERROR] four", "[CRIT] 5"}));
  EXPECT_EQ(lines[0].type, os_log_type_t::debug);
  EXPECT_EQ(lines[1].type, os_log_type_t::info);
  EXPECT_EQ(lines[2].type, os_log_type_t::normal);
  EXPECT_EQ(lines[3].type, os_log_type_t::error);
  EXPECT_EQ(lines[4].type, os_log_type_t::fault);
  EXPECT_EQ(lines[0].handle, handle());
  EXPECT_EQ(lines[4].handle, os_log_create("x", "y"));
}

TEST(os_log, aCaptureKeepsTheRawText) {
  const OSLogCapture log;
  os_log_error(handle(), "%@", std::string("a\nb\x1b"));
  EXPECT_EQ(log.texts(), (Texts{"a\nb\x1b"}));
}

TEST(os_log, theNewestCaptureGetsTheLine) {
  const StderrPipe pipe;
  const OSLogCapture outer;
  {
    const OSLogCapture inner;
    os_log_error(handle(), "inner");
    EXPECT_TRUE(inner.contains("inner"));
  }
  os_log_error(handle(), "outer");
  EXPECT_EQ(outer.texts(), (Texts{"outer"}));
  EXPECT_EQ(pipe.nextWrite(), "");
}

TEST(os_log, aCaptureIsCleared) {
  OSLogCapture log;
  os_log_error(handle(), "before");
  log.clear();
  EXPECT_FALSE(log.contains("before"));
  EXPECT_TRUE(log.lines().empty());
}

TEST(os_log, linesBelowTheThresholdAreDropped) {
  const StderrPipe pipe;
  OSLogSetThreshold(os_log_type_t::error);
  os_log(handle(), "dropped");
  os_log_error(handle(), "kept");
  EXPECT_FALSE(OSLogIsEnabled(os_log_type_t::info));
  EXPECT_FALSE(OSLogIsEnabled(os_log_type_t::normal));
  EXPECT_TRUE(OSLogIsEnabled(os_log_type_t::fault));
  OSLogSetThreshold(os_log_type_t::debug);
  EXPECT_TRUE(OSLogIsEnabled(os_log_type_t::debug));
  OSLogSetThreshold(os_log_type_t::normal);
  EXPECT_TRUE(pipe.nextWrite().ends_with(" error: kept\n"));
  EXPECT_EQ(pipe.nextWrite(), "");
}

TEST(os_log, linesOfOneThreadKeepTheirOrder) {
  const OSLogCapture log;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([t] {
      for (int i = 0; i < 200; ++i) os_log_info(os_log_create("t", std::to_string(t)), "%d", i);
    });
  }
  for (std::thread &thread : threads) thread.join();
  std::vector<int> next(4);
  for (const OSLogLine &line : log.lines()) {
    int &expected = next[static_cast<std::size_t>(std::stoi(line.handle->category))];
    EXPECT_EQ(line.text, std::to_string(expected++));
  }
  EXPECT_EQ(next, (std::vector<int>(4, 200)));
}

TEST(os_log, capturesMayComeAndGoWhileOthersLog) {
  const OSLogCapture outer;
  std::thread logger([] {
    for (int i = 0; i < 1000; ++i) os_log_info(handle(), "%d", i);
  });
  for (int i = 0; i < 200; ++i) {
    const OSLogCapture inner;
    EXPECT_LE(inner.lines().size(), 1000U);
  }
  logger.join();
  os_log_info(handle(), "last");
  EXPECT_EQ(outer.texts().back(), "last");
}

[[noreturn]] void logEveryLevel(const char *threshold) {
  setenv("DROXA_LOG", threshold, 1);
  unsetenv("JOURNAL_STREAM");
  os_log_debug(handle(), "one");
  os_log_info(handle(), "two");
  os_log(handle(), "three");
  os_log_error(handle(), "four");
  os_log_fault(handle(), "five");
  std::exit(0);
}

TEST(os_logDeathTest, theEnvironmentSetsTheThreshold) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logEveryLevel("debug"), testing::ExitedWithCode(0), "^[^\n]*debug: one\n");
  EXPECT_EXIT(logEveryLevel("info"), testing::ExitedWithCode(0), "^[^\n]*info: two\n");
  EXPECT_EXIT(logEveryLevel("default"), testing::ExitedWithCode(0), "^[^\n]*default: three\n");
  EXPECT_EXIT(logEveryLevel(""), testing::ExitedWithCode(0), "^[^\n]*default: three\n");
  EXPECT_EXIT(logEveryLevel("error"), testing::ExitedWithCode(0), "^[^\n]*error: four\n");
  EXPECT_EXIT(logEveryLevel("fault"), testing::ExitedWithCode(0), "^[^\n]*fault: five\n");
}

TEST(os_logDeathTest, anUnknownThresholdIsNamed) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logEveryLevel("loud"), testing::ExitedWithCode(0),
              "error: \\[ERROR\\] DROXA_LOG=loud is none of debug, info, default, error, fault\n"
              "[^\n]*default: three\n");
}

}  // namespace
}  // namespace droxa
