#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <sys/types.h>
#include <vector>

namespace droxa {

// A program that the supervisor keeps running: what it is, and its present run.
// Thread contract: the main thread only. The kernel ends a run when the thread that started it ends.
class ChildProcess {
 public:
  using Clock = std::chrono::steady_clock;

  // Its output is appended to `logFile`.
  ChildProcess(std::string name, std::vector<std::string> command, std::string logFile);

  bool start(std::string *problem);
  // The end was seen (waitpid): decides when it is started again. `now` is a parameter for the tests.
  void ended(int waitStatus, Clock::time_point now);
  void signal(int number) const;

  const std::string &name() const { return name_; }
  const std::string &logFile() const { return logFile_; }
  pid_t identifier() const { return identifier_; }  // 0: not running
  bool isRunning() const { return identifier_ != 0; }
  const std::string &lastEnd() const { return lastEnd_; }
  // When it is to be started again; one that keeps ending at once waits longer each time, at most ten
  // seconds.
  Clock::time_point startAgainAt() const { return startAgainAt_; }

 private:
  [[noreturn]] void runChild(char *const *argv, int log, pid_t parent) const;

  const std::string name_;
  const std::vector<std::string> command_;
  const std::string logFile_;
  pid_t identifier_ = 0;
  Clock::time_point startedAt_;
  Clock::time_point startAgainAt_;
  std::chrono::milliseconds pause_{0};
  std::string lastEnd_;
};

}  // namespace droxa
