#pragma once

#include <fcntl.h>
#include <gtest/gtest.h>
#include <string>
#include <unistd.h>

namespace droxa {

// Takes stderr for a scope and gives each write() to it as a piece of its own.
class StderrPipe {
 public:
  StderrPipe() : before_(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)) {
    EXPECT_EQ(pipe2(ends_, O_DIRECT | O_NONBLOCK | O_CLOEXEC), 0);
    dup2(ends_[1], STDERR_FILENO);
  }
  ~StderrPipe() {
    dup2(before_, STDERR_FILENO);
    close(before_);
    close(ends_[0]);
    close(ends_[1]);
  }
  StderrPipe(const StderrPipe &) = delete;
  StderrPipe &operator=(const StderrPipe &) = delete;

  // What the next write wrote; "" when there was none.
  std::string nextWrite() const {
    char buffer[4096];
    const ssize_t length = read(ends_[0], buffer, sizeof buffer);
    return length > 0 ? std::string(buffer, static_cast<std::size_t>(length)) : "";
  }

 private:
  const int before_;
  int ends_[2] = {-1, -1};
};

}  // namespace droxa
