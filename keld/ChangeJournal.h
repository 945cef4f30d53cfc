#pragma once

#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <vector>

#include "keld/ContainerList.h"
#include "keld/ItemRecord.h"

namespace droxa::keld {

// What one of the keeper's transactions changed, with the containers around it.
struct Commit {
  std::uint64_t number = 0;
  std::vector<ItemChange> changes;
  std::shared_ptr<const Containers> before, after;
};
using Commits = std::vector<std::shared_ptr<const Commit>>;

// The newest commits, for those who want to know later what happened since a moment. It is memory alone: who
// asks doesn't outlive the daemon either.
// Thread contract: none; its owner locks.
class ChangeJournal {
 public:
  // As many changes as an enumerator would hold back before it has its folder listed anew.
  explicit ChangeJournal(std::size_t mostChanges = 5000) : mostChanges_(mostChanges) {}

  // Numbers the commit, and forgets the oldest ones when there are too many changes.
  std::shared_ptr<const Commit> append(Commit commit);
  std::uint64_t last() const { return last_; }
  // The commits after that number, in order; nullopt when one of them is forgotten.
  std::optional<Commits> after(std::uint64_t number) const;

 private:
  const std::size_t mostChanges_;
  std::deque<std::shared_ptr<const Commit>> commits_;
  std::size_t changes_ = 0;  // in all of them
  std::uint64_t last_ = 0;
};

}  // namespace droxa::keld
