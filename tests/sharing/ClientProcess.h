#pragma once

#include <csignal>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <poll.h>
#include <spawn.h>
#include <string>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/xpc/NSXPCListener.h"

namespace droxa {

// A process that is a client of an endpoint (client.cpp); killed at the end.
class ClientProcess {
 public:
  ClientProcess(const NSXPCListenerEndpoint &endpoint, const std::string &what) {
    int pipes[2] = {-1, -1};
    EXPECT_EQ(pipe2(pipes, O_CLOEXEC), 0);
    // Numbers above those that the child is to have.
    const int given = fcntl(endpoint.descriptor(), F_DUPFD_CLOEXEC, 10);
    const int written = fcntl(pipes[1], F_DUPFD_CLOEXEC, 10);
    close(pipes[1]);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, given, 3);
    posix_spawn_file_actions_adddup2(&actions, written, 1);
    char program[] = SHARING_TEST_CLIENT;
    std::string argument = what;
    char *const arguments[] = {program, argument.data(), nullptr};
    EXPECT_EQ(posix_spawn(&process_, program, &actions, nullptr, arguments, environ), 0);
    posix_spawn_file_actions_destroy(&actions);
    close(given);
    close(written);
    output_ = pipes[0];
  }
  ~ClientProcess() {
    killNow();
    close(output_);
  }
  ClientProcess(const ClientProcess &) = delete;
  ClientProcess &operator=(const ClientProcess &) = delete;

  // All that it writes until it ends, or the first line.
  std::string read(bool firstLine) const {
    std::string text;
    pollfd waiting{output_, POLLIN, 0};
    while (poll(&waiting, 1, 60'000) == 1) {
      char c = 0;
      if (::read(output_, &c, 1) != 1 || (firstLine && c == '\n')) break;
      text += c;
    }
    return text;
  }
  void killNow() {
    if (process_ > 0) kill(process_, SIGKILL);
    waitForEnd();
  }
  // Its exit status; -1 when a signal ended it.
  int waitForEnd() {
    int status = 0;
    if (process_ > 0) waitpid(process_, &status, 0);
    process_ = -1;
    return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
  }

 private:
  pid_t process_ = -1;
  int output_ = -1;
};

}  // namespace droxa
