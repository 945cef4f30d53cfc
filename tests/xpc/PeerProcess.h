#pragma once

#include <csignal>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <memory>
#include <spawn.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// A process that serves a host (peer.cpp), and the connection to it. Killed at the end.
class PeerProcess {
 public:
  PeerProcess() {
    int ends[2] = {-1, -1};
    EXPECT_EQ(socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, ends), 0);
    posix_spawn_file_actions_t actions;
    posix_spawn_file_actions_init(&actions);
    posix_spawn_file_actions_adddup2(&actions, ends[1], 3);
    char program[] = XPC_TEST_PEER;
    char *const arguments[] = {program, nullptr};
    // A descriptor that already has the number would stay close-on-exec.
    if (ends[1] == 3) fcntl(ends[1], F_SETFD, 0);
    EXPECT_EQ(posix_spawn(&process_, program, &actions, nullptr, arguments, environ), 0);
    posix_spawn_file_actions_destroy(&actions);
    close(ends[1]);
    connection_ = NSXPCConnection::connectionWithDescriptor(ends[0]);
    connection_->setRemoteObjectInterface(NSFileProviderHostInterface());
  }
  ~PeerProcess() {
    connection_->invalidate();
    signal(SIGKILL);
    waitForEnd();
  }
  PeerProcess(const PeerProcess &) = delete;
  PeerProcess &operator=(const PeerProcess &) = delete;

  const std::shared_ptr<NSXPCConnection> &connection() const { return connection_; }
  void signal(int number) const {
    if (process_ > 0) kill(process_, number);
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
  std::shared_ptr<NSXPCConnection> connection_;
};

}  // namespace droxa
