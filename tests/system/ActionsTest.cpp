#include <algorithm>
#include <filesystem>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <signal.h>

#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;

// Names that are items' names like any other.
const std::string kEmoji = "\xF0\x9F\x93\x84 \xF0\x9F\x91\xA9\xE2\x80\x8D\xF0\x9F\x92\xBB.txt";
const std::string kComposed = "caf\xC3\xA9.txt";
const std::string kDecomposed = "cafe\xCC\x81.txt";

// A drive with the documents that a test writes into it, and files beside it.
class Actions : public ::testing::Test {
 protected:
  Actions() { fs::create_directories(outside("")); }

  std::string outside(const std::string &name) const { return drive.home() + "/outside/" + name; }
  std::string inside(const std::string &name) const { return drive.documents() + "/" + name; }
  void startWith(const std::vector<std::string> &documents) {
    drive.start();
    for (const std::string &document : documents) {
      fs::create_directories(fs::path(inside(document)).parent_path());
      writeFile(inside(document), "of " + document);
    }
    for (const std::string &document : documents)
      ASSERT_TRUE(eventually([&] { return drive.droxa({"id", document}).status == 0; })) << document;
  }
  void expectDone(const std::vector<std::string> &words) {
    const Result result = drive.droxa(words);
    EXPECT_EQ(result.status, 0) << words[0] << ": " << result.errors;
  }
  // Refused with that status, and words of the reason.
  void expectRefused(const std::vector<std::string> &words, int status, const std::string &reason) {
    const Result result = drive.droxa(words);
    EXPECT_EQ(result.status, status) << words[0] << ": " << result.errors << result.output;
    EXPECT_NE(result.errors.find(reason), std::string::npos) << result.errors;
  }
  std::string id(const std::string &path) { return drive.droxa({"id", path}).output; }
  Json stat(const std::string &path) {
    return Json::parse(drive.droxa({"stat", "--json", path}).output, nullptr, false);
  }
  bool has(const std::string &name, const std::string &folder = "/") {
    const auto names = drive.names(folder);
    return std::find(names.begin(), names.end(), name) != names.end();
  }

  Drive drive;
};

TEST_F(Actions, anImportCopiesDocumentsAndFoldersAndOverwritesNothing) {
  startWith({"in/taken.txt"});
  const std::string bytes = std::string("he\0llo\xff", 7) + std::string(3'000'000, 'x');
  writeFile(outside("one.bin"), bytes);
  writeFile(outside("taken.txt"), "another");
  fs::create_directories(outside("dir/sub"));
  writeFile(outside("dir/sub/two.txt"), "two");
  const Result result =
      drive.droxa({"import", "--json", outside("one.bin"), outside("taken.txt"), outside("dir"), "in"}, 120s);
  EXPECT_EQ(result.status, 1) << result.errors;
  EXPECT_NE(result.errors.find("taken.txt: something has that name already"), std::string::npos)
      << result.errors;
  EXPECT_EQ(Json::parse(result.output.substr(0, result.output.find('\n')))["name"], "one.bin");
  EXPECT_TRUE(readFile(inside("in/one.bin")) == bytes);
  EXPECT_EQ(readFile(inside("in/taken.txt")), "of in/taken.txt");
  EXPECT_EQ(readFile(outside("one.bin")).size(), bytes.size());
  EXPECT_TRUE(drive.waitForName("two.txt", "in/dir/sub"));
  expectRefused({"import", outside("missing"), "in"}, 66, "can't be imported");
  expectRefused({"import", outside("one.bin"), "nowhere"}, 66, "nowhere: there is no such item");
}

// Ctrl-C may come too late; what is there then is the whole of it.
TEST_F(Actions, anImportThatIsStoppedLeavesNothingHalfDone) {
  startWith({});
  writeFile(outside("big"), std::string(150'000'000, 'b'));
  const auto import = drive.droxaInBackground({"import", outside("big"), "/"}, "import");
  (void)eventually([&] { return fs::exists(inside("big")) || !import->output().empty(); }, 2s);
  import->signal(SIGINT);
  const auto status = import->wait(60s);
  ASSERT_TRUE(status == 130 || status == 0) << import->errors();
  const bool wasStopped = import->errors().find("nothing was changed") != std::string::npos;
  EXPECT_EQ(has("big"), !wasStopped) << import->errors();
  EXPECT_EQ(fs::exists(inside("big")) ? fs::file_size(inside("big")) : 0, wasStopped ? 0U : 150'000'000U);
  const auto documents = fs::directory_iterator(drive.documents());
  EXPECT_EQ(std::distance(begin(documents), end(documents)), wasStopped ? 0 : 1) << "no hidden rest";
  expectDone({"import", outside("big"), "Documents"});
}

TEST_F(Actions, foldersAreMadeWithTheirParents) {
  startWith({"a.txt"});
  expectDone({"mkdir", "new"});
  EXPECT_TRUE(has("new"));
  expectDone({"mkdir", "-p", "x/y/z", "new"});
  EXPECT_TRUE(has("z", "x/y"));
  expectRefused({"mkdir", "new"}, 1, "something has that name already");
  expectRefused({"mkdir", "a.txt"}, 1, "something has that name already");
  expectRefused({"mkdir", "nowhere/new"}, 66, "nowhere");
  expectRefused({"mkdir", "a.txt/new"}, 1, "not a folder");
}

TEST_F(Actions, anyNameThatAnItemCanHaveIsTakenAsItIs) {
  startWith({"a.txt"});
  const std::string before = id("a.txt");
  const std::string longest = std::string(251, 'n') + ".txt";
  std::string last = "a.txt";
  for (const std::string &name :
       {std::string("A.txt"), kEmoji, kComposed, kDecomposed, std::string("trailing. ."),
        std::string(" blanks "), std::string("line\nbreak"), longest, std::string("100% \\sure?*"),
        std::string("\xff\xfe"), std::string("a.txt")}) {
    expectDone({"rename", "./" + last, name});
    EXPECT_TRUE(has(name)) << name;
    EXPECT_FALSE(has(last)) << last;
    EXPECT_EQ(id("./" + name), before);
    last = name;
  }
  EXPECT_EQ(readFile(inside("a.txt")), "of a.txt");
}

TEST_F(Actions, bothUnicodeFormsOfANameAreNamesOfTheirOwn) {
  startWith({"a.txt"});
  expectDone({"mkdir", kComposed});
  expectDone({"mkdir", kDecomposed});
  EXPECT_TRUE(has(kComposed) && has(kDecomposed));
  EXPECT_NE(id(kComposed), id(kDecomposed));
}

TEST_F(Actions, aNameThatCantBeIsRefusedWithItsReason) {
  startWith({"a.txt", "b.txt", "f/c.txt"});
  expectRefused({"rename", "a.txt", "b.txt"}, 1, "something has that name already (b.txt, d");
  expectRefused({"rename", "a.txt", "f/b"}, 1, "a name has no '/'");
  expectRefused({"rename", "a.txt", std::string(256, 'x')}, 1, "255 is the most");
  expectRefused({"rename", "a.txt", ".."}, 1, "that name is the system's own");
  expectRefused({"rename", "a.txt", ""}, 1, "it is empty");
  expectRefused({"rename", "missing", "x"}, 66, "there is no such item");
  expectRefused({"rename", "Desktop", "x"}, 1, "one of the drive's own folders");
  EXPECT_EQ(readFile(inside("a.txt")), "of a.txt");
  EXPECT_EQ(readFile(inside("b.txt")), "of b.txt");
}

TEST_F(Actions, aMoveKeepsTheItem) {
  startWith({"a.txt", "f/b.txt", "g/c.txt"});
  const std::string before = id("a.txt");
  expectDone({"mv", "a.txt", "f"});
  EXPECT_EQ(id("f/a.txt"), before);
  expectDone({"mv", "f/a.txt", "g/other.txt"});
  EXPECT_EQ(id("g/other.txt"), before);
  expectDone({"mv", "f", "h"});
  EXPECT_TRUE(has("b.txt", "h"));
  expectDone({"mv", "h", "g"});
  EXPECT_TRUE(has("b.txt", "g/h"));
  expectRefused({"mv", "g", "g/h"}, 1, "The move between those locations is invalid");
  expectRefused({"mv", "g/c.txt", "g"}, 1, "in that folder already");
  expectRefused({"mv", "g/c.txt", "g/other.txt"}, 1, "nothing is overwritten");
  writeFile(inside("c.txt"), "another");
  ASSERT_TRUE(drive.waitForName("c.txt"));
  expectRefused({"mv", "g/c.txt", "/"}, 1, "something has that name already");
  EXPECT_EQ(readFile(inside("c.txt")), "another");
}

TEST_F(Actions, aMoveThatNeedsContentsFetchesThemFirst) {
  const std::string bytes(400'000, 'y');
  writeFile(outside("far.bin"), bytes);
  drive.importFolder(outside(""));
  drive.start();
  ASSERT_TRUE(drive.waitForName("far.bin"));
  ASSERT_EQ(drive.contents("far.bin").value("contents", ""), "dataless");
  expectDone({"mv", "far.bin", "Documents"});
  EXPECT_TRUE(readFile(drive.container("com.quorva.Tessaly.documents") + "/far.bin") == bytes);
  EXPECT_FALSE(has("far.bin"));
  EXPECT_TRUE(has("far.bin", "Documents"));
}

TEST_F(Actions, whatIsTrashedCanBeRestored) {
  startWith({"f/a.txt", "b.txt"});
  const std::string before = id("f/a.txt");
  expectDone({"trash", "f/a.txt", "b.txt"});
  EXPECT_FALSE(has("a.txt", "f"));
  EXPECT_TRUE(has("a.txt", ".Trash") && has("b.txt", ".Trash"));
  EXPECT_TRUE(stat(".Trash/a.txt").value("trashed", false));
  expectRefused({"trash", ".Trash/a.txt"}, 1, "in the trash already");
  expectDone({"restore", ".Trash/a.txt"});
  EXPECT_EQ(id("f/a.txt"), before);
  EXPECT_EQ(readFile(inside("f/a.txt")), "of f/a.txt");
  expectDone({"restore", ".Trash/b.txt", "--to", "f"});
  EXPECT_TRUE(has("b.txt", "f"));
  expectRefused({"restore", "f/b.txt"}, 1, "it isn't in the trash");
  expectRefused({"trash", "missing"}, 66, "there is no such item");
}

TEST_F(Actions, aRestoredItemWhoseNameIsTakenGetsANumber) {
  startWith({"a.txt"});
  expectDone({"trash", "a.txt"});
  writeFile(inside("a.txt"), "newer");
  ASSERT_TRUE(drive.waitForName("a.txt"));
  expectDone({"restore", ".Trash/a.txt"});
  EXPECT_EQ(readFile(inside("a.txt")), "newer");
  EXPECT_EQ(readFile(inside("a 2.txt")), "of a.txt");
}

TEST_F(Actions, aDeletionIsForGoodAndOfFoldersOnlyWhenAskedFor) {
  startWith({"a.txt", "f/sub/b.txt"});
  expectRefused({"rm", "f"}, 1, "-r deletes it with everything below it");
  expectDone({"rm", "-r", "a.txt", "f"});
  EXPECT_FALSE(has("a.txt") || has("f") || has("a.txt", ".Trash"));
  EXPECT_FALSE(fs::exists(inside("f")));
  expectRefused({"rm", "a.txt"}, 66, "there is no such item");
  expectRefused({"rm", "-r", "Documents"}, 1, "one of the drive's own folders");
}

TEST_F(Actions, notesOnAnItemAreKept) {
  startWith({"a.txt"});
  expectDone({"tag", "a.txt", "work", "caf\xC3\xA9"});
  EXPECT_EQ(drive.droxa({"tag", "a.txt"}).output, "work\ncaf\xC3\xA9\n");
  expectDone({"untag", "a.txt", "work"});
  EXPECT_EQ(stat("a.txt")["tagNames"], Json{"caf\xC3\xA9"});
  expectDone({"untag", "a.txt", "--all"});
  EXPECT_EQ(stat("a.txt")["tagNames"], Json::array());
  expectDone({"favorite", "a.txt", "7"});
  EXPECT_EQ(stat("a.txt")["favoriteRank"], 7);
  expectDone({"favorite", "a.txt", "--none"});
  EXPECT_EQ(stat("a.txt")["favoriteRank"], 0);
  expectDone({"used", "a.txt", "2026-01-31T12:00:00Z"});
  EXPECT_EQ(stat("a.txt")["lastUsed"], "2026-01-31T12:00:00.000000000Z");
  expectDone({"used", "a.txt", "--never"});
  EXPECT_EQ(stat("a.txt")["lastUsed"], Json(nullptr));
  expectRefused({"tag", "a.txt", "one,two"}, 1, "");
  expectRefused({"favorite", "missing", "1"}, 66, "there is no such item");
  EXPECT_EQ(drive.droxa({"favorite", "a.txt"}).status, 2);
  EXPECT_EQ(drive.droxa({"used", "a.txt", "soon"}).status, 2);
  EXPECT_EQ(readFile(inside("a.txt")), "of a.txt");
}

TEST_F(Actions, whoWatchesAFolderSeesThem) {
  startWith({"a.txt"});
  const auto watch = drive.droxaInBackground({"watch", "/"}, "watch");
  const auto sees = [&](const std::string &line) {
    return eventually([&] { return watch->output().find(line) != std::string::npos; });
  };
  // The first one tells that the watch has begun.
  int number = 0;
  ASSERT_TRUE(eventually([&] {
    expectDone({"mkdir", "begun" + std::to_string(++number)});
    return watch->output().find("+ begun") != std::string::npos;
  }));
  expectDone({"rename", "a.txt", "b.txt"});
  EXPECT_TRUE(sees("> a.txt -> b.txt")) << watch->output();
  expectDone({"trash", "b.txt"});
  EXPECT_TRUE(sees("- b.txt")) << watch->output();
}

TEST_F(Actions, anActionOutlivesAnExtensionThatDiesBeforeItBegan) {
  startWith({"a.txt"});
  const pid_t extension = drive.extensionPid();
  ASSERT_GT(extension, 0);
  ASSERT_EQ(kill(extension, SIGSTOP), 0);
  const auto rename = drive.droxaInBackground({"rename", "a.txt", "b.txt"}, "rename");
  ASSERT_EQ(kill(extension, SIGKILL), 0);
  EXPECT_EQ(rename->wait(60s), 0) << rename->errors();
  EXPECT_TRUE(has("b.txt"));
  EXPECT_FALSE(has("a.txt"));
}

TEST_F(Actions, withoutTheDaemonNothingIsChangedAndTheReasonIsSaid) {
  startWith({"a.txt"});
  drive.keld().signal(SIGKILL);
  (void)drive.keld().wait();
  for (const std::vector<std::string> &words :
       {std::vector<std::string>{"rename", "a.txt", "b.txt"}, {"trash", "a.txt"}, {"rm", "a.txt"}}) {
    const Result result = drive.droxa(words);
    EXPECT_NE(result.status, 0);
    EXPECT_NE(result.errors.find("droxa: a.txt: "), std::string::npos) << result.errors;
  }
  EXPECT_EQ(readFile(inside("a.txt")), "of a.txt");
}

}  // namespace
}  // namespace droxa::testing
