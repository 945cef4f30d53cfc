#pragma once

#include <atomic>
#include <cstdint>

namespace droxa {

// How many items the host may keep in memory, over all containers.
// Thread contract: any thread.
class ItemBudget {
 public:
  explicit ItemBudget(std::uint64_t limit = 50'000) : limit_(limit) {}

  // False, with nothing taken, when the limit would be passed.
  bool take() {
    if (used_.fetch_add(1) < limit_) return true;
    used_.fetch_sub(1);
    return false;
  }
  void giveBack(std::uint64_t count) { used_.fetch_sub(count); }
  std::uint64_t used() const { return used_.load(); }

 private:
  const std::uint64_t limit_;
  std::atomic<std::uint64_t> used_{0};
};

}  // namespace droxa
