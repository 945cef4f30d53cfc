// The parts that need no daemon around them.

#include <gtest/gtest.h>
#include <unistd.h>

#include "keld/AccountKeeper.h"
#include "keld/FolderReading.h"
#include "keld/HomeLock.h"
#include "keld/Placement.h"
#include "keld/RecentFiles.h"
#include "keld/TypeIdentifiers.h"
#include "tests/support/ScratchHome.h"

namespace droxa::keld {

TEST(TypeIdentifiers, goByTheLongestSuffix) {
  EXPECT_EQ(TypeIdentifierForName("a.txt"), "text/plain");
  EXPECT_EQ(TypeIdentifierForName("A.TXT"), "text/plain");
  EXPECT_EQ(TypeIdentifierForName("a.b.pdf"), "application/pdf");
  EXPECT_EQ(TypeIdentifierForName("nothing"), kUnknownType);
  EXPECT_EQ(TypeIdentifierForName(".txt"), kUnknownType);
  EXPECT_EQ(TypeIdentifierForName("a."), kUnknownType);
  EXPECT_EQ(TypeIdentifierForName(""), kUnknownType);
  EXPECT_EQ(TypeIdentifierForName("\xff\xfe.\xff"), kUnknownType);
}

TEST(BackupNames, areThoseOfTheOriginal) {
  for (const char *name : {"a.txt~", "a.txt.bak", "a.txt.orig", "#a.txt#"})
    EXPECT_TRUE(IsBackupName(name, "a.txt"));
  for (const char *name : {"a.txt", "b.txt~", "a.txt2", "~", ""}) EXPECT_FALSE(IsBackupName(name, "a.txt"));
}

TEST(ContainerNames, areReverseDNS) {
  for (const char *name : {"com.quorva.Tessaly.default", "org.example"})
    EXPECT_TRUE(IsContainerName(name)) << name;
  for (const char *name : {"", "plain", ".hidden.one", "ends.", "a..b"})
    EXPECT_FALSE(IsContainerName(name)) << name;
}

TEST(NameList, isSortedByBytes) {
  NameList names;
  for (const char *name : {"b", "a", "\xff", "A", "ab", ""}) names.add(name);
  names.sort();
  std::vector<std::string> sorted;
  for (std::size_t index = 0; index < names.size(); ++index) sorted.emplace_back(names[index]);
  EXPECT_EQ(sorted, (std::vector<std::string>{"", "A", "a", "ab", "b", "\xff"}));
}

TEST(RecentFiles, giveADeadFilesNumberBackOnce) {
  RecentFiles recent;
  ItemRecord record;
  record.id = 7;
  record.facts.inode = 42;
  record.facts.birth = 1;
  recent.died(record);
  FileFacts reused = record.facts;
  reused.birth = 2;
  EXPECT_EQ(recent.takeDead(reused), std::nullopt);
  EXPECT_EQ(recent.takeDead(record.facts), 7U);
  EXPECT_EQ(recent.takeDead(record.facts), std::nullopt);
}

TEST(RecentFiles, forgetTheOldest) {
  RecentFiles recent;
  ItemRecord record;
  for (ItemNumber id = 1; id <= 5000; ++id) {
    record.id = id;
    record.facts.inode = id;
    recent.died(record);
  }
  record.facts.inode = 1;
  EXPECT_EQ(recent.takeDead(record.facts), std::nullopt);
  record.facts.inode = 5000;
  EXPECT_EQ(recent.takeDead(record.facts), 5000U);
}

TEST(HomeLock, isOneProcessesAtATime) {
  ScratchHome home;
  const std::string path = home.root() + "/keld.lock";
  std::string problem;
  auto first = HomeLock::take(path, &problem);
  ASSERT_TRUE(first) << problem;
  EXPECT_FALSE(HomeLock::take(path, &problem));
  EXPECT_EQ(problem, "keld runs for this home already (process " + std::to_string(::getpid()) + " holds " +
                         path + ")");
  first.reset();
  EXPECT_TRUE(HomeLock::take(path, &problem));
}

TEST(HomeLock, namesAFileThatItCannotMake) {
  std::string problem;
  EXPECT_FALSE(HomeLock::take("/nonexistent/keld.lock", &problem));
  EXPECT_EQ(problem, "/nonexistent/keld.lock: No such file or directory");
}

TEST(AccountKeeper, refusesNamesThatAreNone) {
  EXPECT_FALSE(AccountKeeper::isValidName(""));
  EXPECT_FALSE(AccountKeeper::isValidName("a\nb"));
  EXPECT_FALSE(AccountKeeper::isValidName("\x7f"));
  EXPECT_TRUE(AccountKeeper::isValidName("J\xc3\xb6rg"));
  EXPECT_TRUE(AccountKeeper::isValidName(AccountKeeper::localUserName()));
}

}  // namespace droxa::keld
