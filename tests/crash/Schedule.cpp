#include "tests/crash/Schedule.h"

#include <array>
#include <utility>

namespace droxa::crash {

namespace {

// How often each comes.
constexpr std::array<std::pair<Action, std::uint64_t>, 15> kShares{{
    {Action::create, 10},
    {Action::editInPlace, 6},
    {Action::editByTruncating, 7},
    {Action::editByRenamingOver, 8},
    {Action::editOnBoth, 5},
    {Action::renameDocument, 5},
    {Action::moveDocument, 5},
    {Action::deleteDocument, 5},
    {Action::makeFolder, 3},
    {Action::renameFolder, 2},
    {Action::moveFolder, 2},
    {Action::deleteFolder, 1},
    {Action::download, 14},
    {Action::evict, 12},
    {Action::waitForUpload, 3},
}};

constexpr std::uint64_t shares() {
  std::uint64_t sum = 0;
  for (const auto &[action, share] : kShares) sum += share;
  return sum;
}

}  // namespace

Step Schedule::followingStep() {
  Step step;
  std::uint64_t drawn = random_() % shares();
  for (const auto &[action, share] : kShares) {
    step.action = action;
    if (drawn < share) break;
    drawn -= share;
  }
  step.device = upTo(1);
  step.pick = random_();
  step.otherPick = random_();
  // Most documents are small, some take several chunks and are sent beside the sync's thread.
  const std::uint64_t size = upTo(19);
  step.length = size == 0   ? 0
                : size < 16 ? upTo(20'000)
                : size < 19 ? upTo(600'000)
                            : 5'000'000 + upTo(1'000'000);
  step.pause = std::chrono::microseconds(upTo(2) == 0 ? upTo(40'000) : upTo(3'000));
  return step;
}

Round Schedule::next() {
  Round round;
  const std::uint64_t count = 4 + upTo(14);
  for (std::uint64_t i = 0; i < count; ++i) round.steps.push_back(followingStep());
  round.untilKill = std::chrono::microseconds(upTo(3) == 0 ? upTo(40'000) : upTo(500'000));
  round.untilStart = std::chrono::microseconds(upTo(3) == 0 ? upTo(300'000) : upTo(5'000));
  const std::uint64_t who = upTo(4);
  round.kills[0] = who == 0 || who == 1 || who == 4;
  round.kills[1] = who == 2 || who == 3 || who == 4;
  return round;
}

}  // namespace droxa::crash
