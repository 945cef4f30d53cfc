#pragma once

#include <chrono>
#include <cstddef>
#include <memory>

#include "platform/dispatch/dispatch.h"

namespace droxa {

// The process's elastic pool of threads, with its timers. A thread that waits for work or for a timer is
// idle; a block that is handed over while none is free gets a new thread, up to a limit. Beyond the limit
// blocks wait for a thread to come free. Thread contract: every member may be called on any thread. Never
// destroyed, so that threads may run while the process ends.
class ThreadPool {
 public:
  static constexpr std::size_t kMostThreads = 512;
  static constexpr std::chrono::seconds kIdleTime{5};

  static ThreadPool &shared();

  void post(dispatch_block_t block);
  // Hands the block over when the delay has passed.
  void postAfter(std::chrono::nanoseconds delay, dispatch_block_t block);

  std::size_t threadCount() const;

  ThreadPool(const ThreadPool &) = delete;
  ThreadPool &operator=(const ThreadPool &) = delete;

 private:
  ThreadPool();
  ~ThreadPool() = delete;

  struct State;
  const std::unique_ptr<State> state_;
};

}  // namespace droxa
