#pragma once

#include <chrono>
#include <functional>
#include <thread>

namespace droxa {

// How long a test waits for what must happen. Generous: it is reached only by a test that fails.
inline constexpr std::chrono::seconds kTestDeadline{20};

// Whether `condition` came true before the deadline. For conditions that nobody signals.
inline bool eventually(const std::function<bool()> &condition,
                       std::chrono::milliseconds deadline = kTestDeadline) {
  const auto end = std::chrono::steady_clock::now() + deadline;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > end) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return true;
}

}  // namespace droxa
