#pragma once

#include <chrono>
#include <cstdint>
#include <random>
#include <vector>

namespace droxa::crash {

enum class Action : std::uint8_t {
  create,
  editInPlace,
  editByTruncating,
  editByRenamingOver,
  editOnBoth,
  renameDocument,
  moveDocument,
  deleteDocument,
  makeFolder,
  renameFolder,
  moveFolder,
  deleteFolder,
  download,
  evict,
  waitForUpload,
};

// What is done next. The picks choose among what there is when its time has come.
struct Step {
  Action action = Action::create;
  std::size_t device = 0;
  std::uint64_t pick = 0, otherPick = 0;
  std::uint64_t length = 0;
  std::chrono::microseconds pause{0};  // before it
};

// Some work, in the middle of which daemons are killed, and started again a while later.
struct Round {
  std::vector<Step> steps;
  std::chrono::microseconds untilKill{0}, untilStart{0};
  bool kills[2] = {false, false};
};

// The same seed gives the same schedule. Thread contract: one thread.
class Schedule {
 public:
  explicit Schedule(std::uint64_t seed) : random_(seed) {}
  Round next();

 private:
  std::uint64_t upTo(std::uint64_t most) { return random_() % (most + 1); }
  Step followingStep();
  std::mt19937_64 random_;
};

}  // namespace droxa::crash
