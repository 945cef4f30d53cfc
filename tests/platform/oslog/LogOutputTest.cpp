#include <cstdlib>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <regex>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/oslog/LogOutput.h"
#include "tests/platform/oslog/StderrPipe.h"

namespace droxa {
namespace {

os_log_t handle() {
  return os_log_create("com.example", "tests");
}

TEST(LogOutput, aLineHasTimeProcessLevelAndTextInOneWrite) {
  const StderrPipe pipe;
  LogOutput(handle(), os_log_type_t::error, "[ERROR] text");
  const std::string line = pipe.nextWrite();
  const std::regex expected("\\d{4}-\\d\\d-\\d\\d \\d\\d:\\d\\d:\\d\\d\\.\\d{6} platform_oslog_\\S*\\[" +
                            std::to_string(getpid()) + "\\] error: \\[ERROR\\] text\n");
  EXPECT_TRUE(std::regex_match(line, expected)) << line;
  EXPECT_EQ(pipe.nextWrite(), "");
}

TEST(LogOutput, namesTheLevel) {
  EXPECT_STREQ(LogLevelName(os_log_type_t::debug), "debug");
  EXPECT_STREQ(LogLevelName(os_log_type_t::info), "info");
  EXPECT_STREQ(LogLevelName(os_log_type_t::normal), "default");
  EXPECT_STREQ(LogLevelName(os_log_type_t::error), "error");
  EXPECT_STREQ(LogLevelName(os_log_type_t::fault), "fault");
}

TEST(LogOutput, aTextCannotForgeALine) {
  const StderrPipe pipe;
  LogOutput(handle(), os_log_type_t::error, "a\nforged line\r\x1b[2J");
  const std::string line = pipe.nextWrite();
  EXPECT_TRUE(line.ends_with(" error: a\\nforged line\\r\\x1b[2J\n")) << line;
  EXPECT_EQ(pipe.nextWrite(), "");
}

TEST(LogEscaped, writesControlCharactersAsEscapes) {
  EXPECT_EQ(LogEscaped(std::string_view("\0\t\x7f", 3)), "\\x00\\t\\x7f");
  EXPECT_EQ(LogEscaped("\xc2\x9b"
                       "2J"),
            "\\xc2\\x9b2J");
}

TEST(LogEscaped, leavesOtherBytesAsTheyAre) {
  const std::string text = "┏1 \xc3\xa9 \xc2\xa0 \xff \\n";
  EXPECT_EQ(LogEscaped(text), text);
  EXPECT_EQ(LogEscaped("ends with \xc2"), "ends with \xc2");
}

// With stderr said to be the journal, or another file said to be, logs one line and ends.
[[noreturn]] void logWithJournalStream(bool isStderr) {
  struct stat status {};
  if (fstat(STDERR_FILENO, &status) != 0) std::exit(1);
  const std::string stream =
      std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino + (isStderr ? 0 : 1));
  setenv("JOURNAL_STREAM", stream.c_str(), 1);
  LogOutput(handle(), os_log_type_t::normal, "a line");
  std::exit(0);
}

TEST(LogOutputDeathTest, goesToTheJournalWhenStderrIsConnectedToIt) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logWithJournalStream(true), testing::ExitedWithCode(0), "^$");
}

TEST(LogOutputDeathTest, goesToStderrWhenAnotherFileIsTheJournal) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logWithJournalStream(false), testing::ExitedWithCode(0), "default: a line");
}

[[noreturn]] void logWithMalformedJournalStream() {
  setenv("JOURNAL_STREAM", "not a stream", 1);
  LogOutput(handle(), os_log_type_t::normal, "a line");
  std::exit(0);
}

TEST(LogOutputDeathTest, goesToStderrWhenTheJournalIsNotToldProperly) {
  GTEST_FLAG_SET(death_test_style, "threadsafe");
  EXPECT_EXIT(logWithMalformedJournalStream(), testing::ExitedWithCode(0), "default: a line");
}

TEST(LogOutput, survivesAClosedStderr) {
  const int before = fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3);
  close(STDERR_FILENO);
  LogOutput(handle(), os_log_type_t::error, "nobody reads this");
  dup2(before, STDERR_FILENO);
  close(before);
}

}  // namespace
}  // namespace droxa
