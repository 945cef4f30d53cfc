#pragma once

#include <array>
#include <chrono>
#include <cstdint>

namespace droxa::keld {

// Bytes per second over the last seconds. Thread contract: its owner's lock.
class TransferRate {
 public:
  using Clock = std::chrono::steady_clock;

  void add(std::uint64_t bytes, Clock::time_point now = Clock::now()) {
    advance(now);
    slots_[static_cast<std::size_t>(second_) % slots_.size()] += bytes;
    total_ += bytes;
  }
  std::uint64_t bytesPerSecond(Clock::time_point now = Clock::now()) {
    advance(now);
    std::uint64_t sum = 0;
    for (const std::uint64_t slot : slots_) sum += slot;
    return sum / slots_.size();
  }
  std::uint64_t total() const { return total_; }

 private:
  void advance(Clock::time_point now) {
    const std::int64_t second =
        std::chrono::duration_cast<std::chrono::seconds>(now.time_since_epoch()).count();
    const auto size = static_cast<std::int64_t>(slots_.size());
    if (second - second_ >= size) second_ = second - size;
    while (second_ < second) slots_[static_cast<std::size_t>(++second_) % slots_.size()] = 0;
  }
  std::array<std::uint64_t, 5> slots_{};
  std::int64_t second_ = 0;
  std::uint64_t total_ = 0;
};

}  // namespace droxa::keld
