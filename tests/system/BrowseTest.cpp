#include <algorithm>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <sys/stat.h>
#include <unistd.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;

bool contains(const std::vector<std::string> &names, const std::string &name) {
  return std::find(names.begin(), names.end(), name) != names.end();
}

TEST(Browse, aFreshHomeListsTheContainersAndNoTrash) {
  Drive drive;
  drive.start();
  const auto names = drive.names();
  EXPECT_TRUE(contains(names, "Documents"));
  EXPECT_TRUE(contains(names, "Desktop"));
  EXPECT_FALSE(contains(names, ".Trash"));
}

TEST(Browse, aFolderOfManyPagesIsListedWholeOnceAndInOrder) {
  Drive drive;
  std::filesystem::create_directories(drive.documents() + "/many");
  for (int i = 0; i < 1001; ++i)
    writeFile(drive.documents() + "/many/file " + std::to_string(10000 + i), "x");
  drive.start();
  const auto names = drive.names("many");
  EXPECT_EQ(names.size(), 1001u);
  EXPECT_TRUE(std::is_sorted(names.begin(), names.end()));
  EXPECT_EQ(std::adjacent_find(names.begin(), names.end()), names.end());
}

TEST(Browse, everyIdentityLeadsToTheOthers) {
  Drive drive;
  std::filesystem::create_directories(drive.documents() + "/folder");
  writeFile(drive.documents() + "/folder/note.txt", "hello");
  drive.start();
  const Json item = Json::parse(drive.droxa({"stat", "--json", "folder/note.txt"}).output);
  const std::string identifier = item["identifier"];
  EXPECT_EQ(identifier[0], 'd');
  EXPECT_EQ(item["size"], 5);
  EXPECT_EQ(item["type"], "text/plain");
  EXPECT_EQ(drive.droxa({"id", "folder/note.txt"}).output, identifier + "\n");
  EXPECT_EQ(drive.droxa({"id", drive.documents() + "/folder/note.txt"}).output, identifier + "\n");
  EXPECT_NE(drive.droxa({"url", identifier}).output.find("/folder/note.txt"), std::string::npos);
  EXPECT_EQ(Json::parse(drive.droxa({"stat", "--json", identifier}).output)["name"], "note.txt");
}

TEST(Browse, hostileNamesComeThroughAsTheyAre) {
  Drive drive;
  const std::vector<std::string> hostile{
      "new\nline", "\xff\xfe not UTF-8",      std::string(255, 'n'),    ".hidden",
      "..almost",  "tab\tand \x1b[31mcolour", " leading and trailing ", "d12"};
  for (const std::string &name : hostile) writeFile(drive.documents() + "/" + name, "x");
  drive.start();
  const auto names = drive.names();
  for (const std::string &name : hostile) {
    EXPECT_TRUE(contains(names, name)) << name;
    const Result id = drive.droxa({"id", "/" + name});
    EXPECT_EQ(id.status, 0) << name << ": " << id.errors;
  }
  // A line is an item: no name may forge another, or write to the terminal.
  const Result listing = drive.droxa({"ls"});
  EXPECT_EQ(listing.output.find('\x1b'), std::string::npos);
  EXPECT_EQ(static_cast<std::size_t>(std::count(listing.output.begin(), listing.output.end(), '\n')),
            names.size());
}

TEST(Browse, aLinkOutOfTheReplicaIsShownAndNotFollowed) {
  Drive drive;
  std::filesystem::create_symlink("/etc", drive.documents() + "/outside");
  drive.start();
  EXPECT_EQ(Json::parse(drive.droxa({"stat", "--json", "outside"}).output)["kind"], "symbolicLink");
  EXPECT_NE(drive.droxa({"stat", "outside/passwd"}).status, 0);
}

TEST(Browse, anAliasHasAFolderIdentifierAndLeadsToItsTarget) {
  Drive drive;
  std::filesystem::create_directories(drive.container("com.example.Notes"));
  writeFile(drive.container("com.example.Notes") + "/real.txt", "the target");
  std::filesystem::create_symlink(drive.container("com.example.Notes") + "/real.txt",
                                  drive.documents() + "/bookmark");
  drive.start();
  const Json alias = Json::parse(drive.droxa({"stat", "--json", "bookmark"}).output);
  EXPECT_EQ(alias["kind"], "alias");
  const std::string identifier = alias["identifier"];
  EXPECT_EQ(identifier[0], 'i');
  EXPECT_NE(drive.droxa({"url", identifier}).output.find("real.txt"), std::string::npos);
}

TEST(Browse, aNameThatEditorsPassThroughIsMarkedAsLocal) {
  Drive drive;
  writeFile(drive.documents() + "/draft.tmp", "x");
  drive.start();
  EXPECT_EQ(Json::parse(drive.droxa({"stat", "--json", "draft.tmp"}).output)["excludedFromSync"], true);
}

TEST(Browse, allFoldersAndTheTreeReachEveryDepth) {
  Drive drive;
  std::filesystem::create_directories(drive.documents() + "/a/b/c");
  writeFile(drive.documents() + "/a/b/c/deep.txt", "x");
  drive.start();
  const Result folders = drive.droxa({"ls", "--all-folders", "-0"});
  for (const std::string name : {"a", "b", "c"})
    EXPECT_NE(folders.output.find(name + std::string(1, '\0')), std::string::npos) << name;
  EXPECT_NE(drive.droxa({"tree"}).output.find("deep.txt"), std::string::npos);
}

TEST(Browse, theWorkingSetTellsEveryItem) {
  Drive drive;
  for (int i = 0; i < 450; ++i) writeFile(drive.documents() + "/w" + std::to_string(i), "x");
  drive.start();
  const Result set = drive.droxa({"ls", "--working-set", "-0"});
  EXPECT_EQ(set.status, 0) << set.errors;
  EXPECT_GE(std::count(set.output.begin(), set.output.end(), '\0'), 450);
}

TEST(Browse, theNewestComesFirstByDate) {
  Drive drive;
  std::filesystem::create_directories(drive.documents() + "/dated");
  const auto now = std::filesystem::file_time_type::clock::now();
  int age = 0;
  for (const std::string name : {"newest", "a middle", "the oldest"}) {
    writeFile(drive.documents() + "/dated/" + name, "x");
    std::filesystem::last_write_time(drive.documents() + "/dated/" + name, now - std::chrono::hours(age++));
  }
  drive.start();
  EXPECT_EQ(drive.droxa({"ls", "--sort", "date", "dated"}).output, "newest\na middle\nthe oldest\n");
}

TEST(Browse, whatIsNotThereIsNamedWithStatus66) {
  Drive drive;
  drive.start();
  for (const std::string word : {"no such thing", "d999999999", "/a/b/c"}) {
    const Result result = drive.droxa({"stat", word});
    EXPECT_EQ(result.status, 66) << word;
    EXPECT_NE(result.errors.find(word), std::string::npos) << result.errors;
  }
  EXPECT_EQ(drive.droxa({"ls", "--no-such-option"}).status, 2);
}

TEST(Browse, signingOutClosesTheDriveAndSigningInOpensIt) {
  Drive drive;
  writeFile(drive.documents() + "/mine.txt", "x");
  drive.start();
  ASSERT_EQ(drive.droxa({"account", "sign-out"}).status, 0);
  EXPECT_EQ(drive.droxa({"ls"}).status, 77);
  ASSERT_EQ(drive.droxa({"account", "sign-in", "somebody"}).status, 0);
  EXPECT_TRUE(eventually([&] { return drive.droxa({"ls"}).status == 0; }));
  EXPECT_TRUE(contains(drive.names(), "mine.txt"));
}

TEST(Browse, withoutTheDaemonsEveryCommandSaysSo) {
  Drive drive;
  EXPECT_EQ(drive.droxa({"ls"}).status, 69);
  EXPECT_EQ(drive.droxa({"status"}).status, 69);
  drive.startHost();
  EXPECT_TRUE(
      eventually([&] { return drive.droxa({"status"}).output.find("process") != std::string::npos; }));
  const Result listing = drive.droxa({"--timeout", "3", "ls"});
  EXPECT_NE(listing.status, 0);
  EXPECT_FALSE(listing.errors.empty());
}

}  // namespace
}  // namespace droxa::testing
