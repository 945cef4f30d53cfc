#pragma once

#include <condition_variable>
#include <mutex>
#include <string>
#include <vector>

#include "tests/support/Eventually.h"

namespace droxa {

// What a double was asked, in order, as readable lines.
// Thread contract: any thread.
class CallLog {
 public:
  void add(std::string call) {
    const std::lock_guard<std::mutex> lock(mutex_);
    calls_.push_back(std::move(call));
    condition_.notify_all();
  }
  std::vector<std::string> calls() const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return calls_;
  }
  void clear() {
    const std::lock_guard<std::mutex> lock(mutex_);
    calls_.clear();
  }
  // How many lines begin with `prefix`.
  std::size_t count(const std::string &prefix) const {
    const std::lock_guard<std::mutex> lock(mutex_);
    return countLocked(prefix);
  }
  // Whether `times` lines that begin with `prefix` came before the deadline.
  bool waitFor(const std::string &prefix, std::size_t times = 1) const {
    std::unique_lock<std::mutex> lock(mutex_);
    return condition_.wait_for(lock, kTestDeadline, [&] { return countLocked(prefix) >= times; });
  }

 private:
  std::size_t countLocked(const std::string &prefix) const {
    std::size_t found = 0;
    for (const std::string &call : calls_)
      if (call.compare(0, prefix.size(), prefix) == 0) ++found;
    return found;
  }
  mutable std::mutex mutex_;
  mutable std::condition_variable condition_;
  std::vector<std::string> calls_;
};

}  // namespace droxa
