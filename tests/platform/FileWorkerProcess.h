#pragma once

#include <csignal>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <spawn.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "tests/support/Eventually.h"

namespace droxa {

// A process that works on files (file_worker.cpp), for what only another process can do: hold a coordinated
// access, and be killed in the middle of its work. Killed at the end.
class FileWorkerProcess {
 public:
  explicit FileWorkerProcess(std::vector<std::string> arguments) {
    arguments.insert(arguments.begin(), FILE_WORKER);
    std::vector<char *> pointers;
    for (std::string &argument : arguments) pointers.push_back(argument.data());
    pointers.push_back(nullptr);
    int input[2] = {-1, -1};
    int output[2] = {-1, -1};
    EXPECT_EQ(pipe2(input, O_CLOEXEC), 0);
    EXPECT_EQ(pipe2(output, O_CLOEXEC), 0);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, input[0], 0);
    posix_spawn_file_actions_adddup2(&actions, output[1], 1);
    EXPECT_EQ(posix_spawn(&process_, FILE_WORKER, &actions, nullptr, pointers.data(), environ), 0);
    posix_spawn_file_actions_destroy(&actions);
    close(input[0]);
    close(output[1]);
    input_ = input[1];
    output_ = output[0];
  }
  ~FileWorkerProcess() {
    kill();
    close(input_);
    close(output_);
  }
  FileWorkerProcess(const FileWorkerProcess &) = delete;
  FileWorkerProcess &operator=(const FileWorkerProcess &) = delete;

  // Its next line; "" when it ended, or said nothing within the deadline.
  std::string nextLine(std::chrono::milliseconds deadline = kTestDeadline) {
    std::string line;
    pollfd readable{output_, POLLIN, 0};
    while (poll(&readable, 1, static_cast<int>(deadline.count())) == 1) {
      char byte = 0;
      if (read(output_, &byte, 1) != 1 || byte == '\n') break;
      line += byte;
    }
    return line;
  }
  bool isQuietFor(std::chrono::milliseconds time) {
    pollfd readable{output_, POLLIN, 0};
    return poll(&readable, 1, static_cast<int>(time.count())) == 0;
  }
  // Ends a holder, which waits for the end of its input.
  void letGo() { close(std::exchange(input_, -1)); }
  void kill() {
    if (process_ <= 0) return;
    ::kill(process_, SIGKILL);
    (void)waitForEnd();
  }
  // Its exit status; -1 when a signal ended it.
  int waitForEnd() {
    int status = 0;
    if (process_ <= 0 || waitpid(process_, &status, 0) != process_) return -1;
    process_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

 private:
  pid_t process_ = -1;
  int input_ = -1;
  int output_ = -1;
};

}  // namespace droxa
