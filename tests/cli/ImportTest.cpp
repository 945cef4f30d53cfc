#include <filesystem>
#include <fstream>
#include <stdlib.h>

#include "tests/cli/ActionsFixture.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;

// Files of this machine.
class ImportCommand : public ActionsTest {
 protected:
  ImportCommand() {
    std::string path = ::testing::TempDir() + "droxa-import-XXXXXX";
    root = fs::canonical(mkdtemp(path.data()));
    for (const char *file : {"one", "two", "three"}) std::ofstream(root / file) << file;
  }
  ~ImportCommand() override { fs::remove_all(root); }
  int import(const Words &files, const std::string &to = "in", bool json = false) {
    return run([&](CommandContext &made) { return runImport(made, files, to, json); });
  }
  fs::path root;
};

TEST_F(ImportCommand, asksForEachFileAndPrintsWhatCameBack) {
  EXPECT_EQ(import({root / "one", root / "two"}), 0) << err.str();
  ASSERT_EQ(host->requests.size(), 2U);
  EXPECT_EQ(request().kind, Kind::importDocument);
  EXPECT_EQ(request().url.path(), root / "one");
  EXPECT_EQ(request().parentIdentifier, "i2");
  EXPECT_EQ(request(1).url.path(), root / "two");
  EXPECT_EQ(out.str(), longLine(*result) + "\n" + longLine(*result) + "\n");
}

TEST_F(ImportCommand, relativePathsAreThoseOfTheWorkingDirectory) {
  const fs::path before = fs::current_path();
  fs::create_directory(root / "sub");
  fs::create_symlink("one", root / "link");
  fs::current_path(root);
  EXPECT_EQ(import({"one", "./two", "sub/../three", "sub/", "link", "."}, "/"), 0) << err.str();
  fs::current_path(before);
  const Words expected{root / "one", root / "two", root / "three", root / "sub", root / "link", root};
  ASSERT_EQ(host->requests.size(), expected.size());
  for (std::size_t index = 0; index < expected.size(); ++index) {
    EXPECT_EQ(request(index).url.path(), expected[index]);
    EXPECT_EQ(request(index).parentIdentifier, kRoot);
  }
}

TEST_F(ImportCommand, goesOnAfterOneThatFailed) {
  failures = {NSError(NSCocoaErrorDomain, NSFileWriteOutOfSpaceError)};
  EXPECT_EQ(import({root / "one", root / "missing", root / "two"}), 73);
  EXPECT_EQ(host->requests.size(), 2U);
  EXPECT_TRUE(said("one: the disk is full")) << err.str();
  EXPECT_TRUE(said("missing: it can't be imported: No such file or directory")) << err.str();
  EXPECT_TRUE(printed(*result));
}

TEST_F(ImportCommand, intoWhatIsNoFolderAsksForNothing) {
  EXPECT_EQ(import({root / "one"}, "a.txt"), 1);
  EXPECT_TRUE(said("a.txt: it is a document, not a folder")) << err.str();
  EXPECT_EQ(import({root / "one"}, "nowhere"), 66);
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(ImportCommand, aNewItemThatNobodyCanDescribeWasImportedAllTheSame) {
  result.reset();
  EXPECT_EQ(import({root / "one"}), 0);
  EXPECT_TRUE(said("it was imported")) << err.str();
  EXPECT_EQ(out.str(), "");
}

TEST_F(ImportCommand, showsHowFarItIsInLinesOrInABar) {
  for (const bool terminal : {false, true}) {
    isTerminal = terminal;
    const auto action = std::make_shared<ScriptedAction>();
    action->total = 4000;
    action->completed = 1000;
    host->act = [&](const FPDActionRequest &) { return action; };
    stop = [&] {
      if (out.str().find("1.0 kB of 4.0 kB (25%)") != std::string::npos) action->end(*result);
      return false;
    };
    EXPECT_EQ(import({root / "one"}), 0);
    const std::string bar = "\r[#######.......................] 1.0 kB of 4.0 kB (25%)\033[K";
    EXPECT_EQ(out.str().starts_with(terminal ? bar : (root / "one").string() + ": 1.0 kB of"), true)
        << out.str();
    EXPECT_TRUE(out.str().ends_with((terminal ? "\r\033[K" : "\n") + longLine(*result) + "\n"));
  }
}

TEST_F(ImportCommand, ctrlCCancelsAndStops) {
  const auto action = std::make_shared<ScriptedAction>();
  host->act = [&](const FPDActionRequest &) { return action; };
  stop = [] { return true; };
  EXPECT_EQ(import({root / "one", root / "two"}), 130);
  EXPECT_TRUE(action->wasCancelled());
  EXPECT_EQ(host->requests.size(), 1U);
  EXPECT_TRUE(said("one: cancelled, nothing was changed")) << err.str();
}

TEST_F(ImportCommand, ctrlCThatCameTooLateSaysSo) {
  const auto action = std::make_shared<ScriptedAction>();
  action->onCancel = [&] { action->end(*result); };
  host->act = [&](const FPDActionRequest &) { return action; };
  stop = [] { return true; };
  EXPECT_EQ(import({root / "one", root / "two"}), 130);
  EXPECT_TRUE(said("one: it was done before it could be cancelled")) << err.str();
  EXPECT_TRUE(printed(*result));
}

}  // namespace
}  // namespace droxa::testing
