#include <gtest/gtest.h>

#include "keld/ChangeJournal.h"

namespace droxa::keld {

namespace {

Commit ofChanges(std::size_t count) {
  Commit commit;
  commit.changes.resize(count);
  return commit;
}

std::vector<std::uint64_t> numbersAfter(const ChangeJournal &journal, std::uint64_t number) {
  std::vector<std::uint64_t> numbers;
  const auto commits = journal.after(number);
  EXPECT_TRUE(commits.has_value());
  if (!commits) return numbers;
  for (const auto &commit : *commits) numbers.push_back(commit->number);
  return numbers;
}

}  // namespace

TEST(ChangeJournal, tellsTheCommitsAfterANumberInOrder) {
  ChangeJournal journal(10);
  EXPECT_EQ(journal.last(), 0U);
  EXPECT_TRUE(numbersAfter(journal, 0).empty());
  for (std::uint64_t number = 1; number <= 3; ++number)
    EXPECT_EQ(journal.append(ofChanges(1))->number, number);
  EXPECT_EQ(journal.last(), 3U);
  EXPECT_EQ(numbersAfter(journal, 0), (std::vector<std::uint64_t>{1, 2, 3}));
  EXPECT_EQ(numbersAfter(journal, 2), (std::vector<std::uint64_t>{3}));
  EXPECT_TRUE(numbersAfter(journal, 3).empty());
}

TEST(ChangeJournal, forgetsTheOldestCommitsAndSaysSo) {
  ChangeJournal journal(10);
  journal.append(ofChanges(4));
  journal.append(ofChanges(4));
  journal.append(ofChanges(4));
  EXPECT_FALSE(journal.after(0).has_value());
  EXPECT_EQ(numbersAfter(journal, 1), (std::vector<std::uint64_t>{2, 3}));
}

TEST(ChangeJournal, keepsNothingOfACommitThatIsTooLarge) {
  ChangeJournal journal(10);
  journal.append(ofChanges(1));
  journal.append(ofChanges(11));
  EXPECT_FALSE(journal.after(1).has_value());
  EXPECT_TRUE(numbersAfter(journal, 2).empty());
  journal.append(ofChanges(1));
  EXPECT_EQ(numbersAfter(journal, 2), (std::vector<std::uint64_t>{3}));
}

}  // namespace droxa::keld
