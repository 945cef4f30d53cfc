#include "keld/ChangeJournal.h"

#include <utility>

namespace droxa::keld {

std::shared_ptr<const Commit> ChangeJournal::append(Commit commit) {
  commit.number = ++last_;
  changes_ += commit.changes.size();
  auto kept = std::make_shared<const Commit>(std::move(commit));
  commits_.push_back(kept);
  while (changes_ > mostChanges_) {
    changes_ -= commits_.front()->changes.size();
    commits_.pop_front();
  }
  return kept;
}

std::optional<Commits> ChangeJournal::after(std::uint64_t number) const {
  const std::uint64_t missing = last_ - number;
  if (missing > commits_.size()) return std::nullopt;
  return Commits(commits_.end() - static_cast<std::ptrdiff_t>(missing), commits_.end());
}

}  // namespace droxa::keld
