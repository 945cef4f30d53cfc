#pragma once

#include <memory>
#include <string>

namespace droxa {

// Lets one process of a kind run at a time: a locked file that holds the process's identifier. The kernel
// frees the lock when the process ends, however it ends; the file stays. Thread contract: immutable; the last
// reference frees the lock.
class ProcessLock {
 public:
  // Null when another process holds it, with `holder` set to its identifier (0 when it can't be told), or
  // when the file can't be made, with `problem` naming it.
  static std::unique_ptr<ProcessLock> acquire(const std::string &path, int *holder, std::string *problem);
  // The process that holds the lock; 0 when none does.
  static int holderOf(const std::string &path);
  ~ProcessLock();
  ProcessLock(const ProcessLock &) = delete;
  ProcessLock &operator=(const ProcessLock &) = delete;

 private:
  explicit ProcessLock(int descriptor) : descriptor_(descriptor) {}
  const int descriptor_;
};

}  // namespace droxa
