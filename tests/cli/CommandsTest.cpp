#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "cli/Commands.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tests/cli/ScriptedHost.h"

namespace droxa::testing {
namespace {

constexpr char kRoot[] = "NSFileProviderRootContainerItemIdentifier";

class Commands : public ::testing::Test, protected CommandFixture {
 protected:
  int ls(const LsOptions &options = {}) {
    return run([&](CommandContext &made) { return runLs(made, options); });
  }
  int ls(const std::string &argument) {
    LsOptions options;
    options.argument = argument;
    return ls(options);
  }
  int tree(const TreeOptions &options = {}) {
    return run([&](CommandContext &made) { return runTree(made, options); });
  }
  void addFolderWithNote() {
    host->items["i2"] = folder("i2", "Recipes");
    host->paths["Recipes"] = "i2";
    host->listings["i2"] = {{item("d3", "Soup.md")}};
    host->listings[kRoot] = {{item("d1", "a.txt"), folder("i2", "Recipes")}};
  }
};

TEST_F(Commands, lsPrintsEachPageBeforeItAsksForTheNext) {
  host->listings[kRoot] = {{item("d1", "a"), item("d2", "b")}, {item("d3", "c")}, {}};
  std::vector<std::string> printed;
  host->onPage = [&](const std::string &, std::size_t) { printed.push_back(out.str()); };
  EXPECT_EQ(ls(), 0);
  EXPECT_EQ(printed, (std::vector<std::string>{"", "a\nb\n", "a\nb\nc\n"}));
  EXPECT_EQ(out.str(), "a\nb\nc\n");
}

TEST_F(Commands, lsTakesPathsAndIdentifiers) {
  addFolderWithNote();
  EXPECT_EQ(ls("/"), 0);
  EXPECT_EQ(out.str(), "a.txt\nRecipes\n");
  EXPECT_EQ(ls("Recipes"), 0);
  EXPECT_EQ(out.str(), "Soup.md\n");
  EXPECT_EQ(ls("i2"), 0);
  EXPECT_EQ(out.str(), "Soup.md\n");
}

TEST_F(Commands, aNameThatLooksLikeAnIdentifierIsFoundWhenThereIsNoSuchItem) {
  host->items["d77"] = item("d77", "d5");
  host->paths["/d5"] = "d77";
  EXPECT_EQ(run([](CommandContext &made) { return runStat(made, "d5", false); }), 0);
  EXPECT_NE(out.str().find("identifier:  d77\n"), std::string::npos);
}

TEST_F(Commands, lsOfADocumentPrintsIt) {
  host->items["d1"] = item("d1", "a.txt");
  EXPECT_EQ(ls("d1"), 0);
  EXPECT_EQ(out.str(), "a.txt\n");
}

TEST_F(Commands, lsOfAnAliasListsItsTarget) {
  addFolderWithNote();
  host->items["i9"] = folder("i2", "Recipes");
  host->items["link"] = item("i9", "link", NSFileProviderItemKind::alias);
  EXPECT_EQ(ls("link"), 0);
  EXPECT_EQ(out.str(), "Soup.md\n");
}

TEST_F(Commands, lsEscapesNamesUnlessTheyAreToBeRaw) {
  host->listings[kRoot] = {{item("d1", "new\nline"), item("d2", "\xff")}};
  EXPECT_EQ(ls(), 0);
  EXPECT_EQ(out.str(), "new\\nline\n\\xff\n");
  LsOptions options;
  options.nulls = true;
  EXPECT_EQ(ls(options), 0);
  EXPECT_EQ(out.str(), std::string("new\nline\0\xff\0", 11));
}

TEST_F(Commands, lsInJSONIsOneObjectALine) {
  host->listings[kRoot] = {{item("d1", "a"), item("d2", "b\xff")}};
  LsOptions options;
  options.json = true;
  EXPECT_EQ(ls(options), 0);
  std::istringstream lines(out.str());
  std::string line;
  std::getline(lines, line);
  EXPECT_EQ(nlohmann::json::parse(line)["name"], "a");
  std::getline(lines, line);
  EXPECT_EQ(nlohmann::json::parse(line)["nameBytes"], "Yv8=");
}

TEST_F(Commands, lsSortsByDateOnDemand) {
  LsOptions options;
  options.byDate = true;
  EXPECT_EQ(ls(options), 0);
  EXPECT_TRUE(host->firstPageWasByDate);
}

TEST_F(Commands, lsOfTheWorkingSetDrainsItsChanges) {
  host->listings[NSFileProviderWorkingSetContainerItemIdentifier] = {{item("d1", "a")}, {item("d2", "b")}};
  LsOptions options;
  options.workingSet = true;
  EXPECT_EQ(ls(options), 0);
  EXPECT_EQ(out.str(), "a\nb\n");
}

TEST_F(Commands, lsOfAllFoldersAsksTheContainerOfThatName) {
  host->listings[NSFileProviderAllDirectoriesContainerItemIdentifier] = {{folder("i1", "x")}};
  LsOptions options;
  options.allFolders = true;
  EXPECT_EQ(ls(options), 0);
  EXPECT_EQ(out.str(), "x\n");
}

TEST_F(Commands, aListingThatBreaksOffSaysSoAfterWhatItHad) {
  host->listings[kRoot] = {{item("d1", "a")}};
  host->pageErrors[kRoot] = NSError(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid);
  EXPECT_EQ(ls(), 75);
  EXPECT_EQ(out.str(), "a\n");
  EXPECT_NE(err.str().find("no answer in time"), std::string::npos);
}

TEST_F(Commands, errorsNameWhatWasAskedAndEndWithTheirStatus) {
  EXPECT_EQ(ls("no\nsuch"), 66);
  EXPECT_EQ(err.str(), "droxa: no\\nsuch: there is no such item; `droxa ls` shows what there is\n");
  EXPECT_EQ(run([](CommandContext &made) { return runStat(made, "d9", false); }), 66);
  EXPECT_EQ(run([](CommandContext &made) { return runId(made, "x"); }), 66);
  EXPECT_EQ(run([](CommandContext &made) { return runUrl(made, "i5"); }), 66);
  EXPECT_EQ(run([](CommandContext &made) { return runWatch(made, "x", false); }), 66);
  connecting->failure = NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid);
  EXPECT_EQ(ls("a"), 69);
}

TEST_F(Commands, idAndUrlPrintOneLine) {
  host->items["d1"] = item("d1", "a b");
  host->paths["dir/a b"] = "d1";
  host->urls["d1"] = "/r/a b";
  EXPECT_EQ(run([](CommandContext &made) { return runId(made, "dir/a b"); }), 0);
  EXPECT_EQ(out.str(), "d1\n");
  EXPECT_EQ(run([](CommandContext &made) { return runUrl(made, "d1"); }), 0);
  EXPECT_EQ(out.str(), "file:///r/a%20b\n");
}

TEST_F(Commands, treeGoesDownAndMarksTheLast) {
  addFolderWithNote();
  host->listings[kRoot] = {{folder("i2", "Recipes")}, {item("d1", "z.txt")}};
  EXPECT_EQ(tree(), 0);
  EXPECT_EQ(out.str(), "/\n├── Recipes\n│   └── Soup.md\n└── z.txt\n");
  TreeOptions shallow;
  shallow.depth = 1;
  EXPECT_EQ(tree(shallow), 0);
  EXPECT_EQ(out.str(), "/\n├── Recipes\n└── z.txt\n");
}

TEST_F(Commands, treeInJSONHasPathAndDepth) {
  addFolderWithNote();
  TreeOptions options;
  options.json = true;
  EXPECT_EQ(tree(options), 0);
  const std::string last = out.str().substr(out.str().rfind('\n', out.str().size() - 2) + 1);
  EXPECT_EQ(nlohmann::json::parse(last)["path"], "/Recipes/Soup.md");
  EXPECT_EQ(nlohmann::json::parse(last)["depth"], 2);
}

TEST_F(Commands, treeShowsTheRestWhenAFolderCantBeListed) {
  host->listings[kRoot] = {{folder("i2", "lost"), item("d1", "z.txt")}};
  EXPECT_EQ(tree(), 66);
  EXPECT_NE(out.str().find("└── z.txt"), std::string::npos);
  EXPECT_NE(err.str().find("/lost"), std::string::npos);
}

TEST_F(Commands, watchPrintsWhatIsPushedAndReplies) {
  int replies = 0;
  stop = [&] {
    FPDChange change;
    change.kind = FPDChange::Kind::renamed;
    change.identifier = "d1";
    change.item = item("d1", "new");
    change.oldName = "old";
    host->observer->receiveChanges({change}, [&] { ++replies; });
    return true;
  };
  EXPECT_EQ(run([](CommandContext &made) { return runWatch(made, "/", false); }), 0);
  EXPECT_EQ(out.str(), "> old -> new  (d1)\n");
  EXPECT_EQ(replies, 1);
  EXPECT_NE(err.str().find("watching / ("), std::string::npos);
}

TEST_F(Commands, watchEndsWhenTheHostHasGone) {
  stop = [&] {
    connecting->endHandler();
    return false;
  };
  EXPECT_EQ(run([](CommandContext &made) { return runWatch(made, "/", false); }), 69);
  EXPECT_NE(err.str().find("fileproviderd has gone"), std::string::npos);
}

TEST_F(Commands, aDocumentCantBeWatched) {
  host->items["d1"] = item("d1", "a.txt");
  EXPECT_EQ(run([](CommandContext &made) { return runWatch(made, "d1", false); }), 1);
  EXPECT_NE(err.str().find("only folders can be watched"), std::string::npos);
}

TEST_F(Commands, statusTellsWhichPartsAreDown) {
  host->status.processIdentifier = 7;
  host->status.lastExtensionEnd = "killed by signal 9";
  EXPECT_EQ(run([](CommandContext &made) { return runStatus(made, false); }), 69);
  EXPECT_NE(out.str().find("keld           does not answer"), std::string::npos);
  EXPECT_NE(out.str().find("fileproviderd  process 7"), std::string::npos);
  EXPECT_NE(out.str().find("extension      not running"), std::string::npos);
  EXPECT_NE(out.str().find("last ended with killed by signal 9"), std::string::npos);
  EXPECT_EQ(run([](CommandContext &made) { return runStatus(made, true); }), 69);
  const auto json = nlohmann::json::parse(out.str());
  EXPECT_EQ(json["keld"]["running"], false);
  EXPECT_EQ(json["fileproviderd"]["process"], 7);
  EXPECT_EQ(json["extension"]["running"], false);
}

TEST_F(Commands, theAccountNeedsTheDaemon) {
  EXPECT_EQ(run([](CommandContext &made) { return runAccountShow(made, false); }), 69);
  EXPECT_EQ(run([](CommandContext &made) { return runAccountSignIn(made, "ada"); }), 69);
  EXPECT_NE(err.str().find("ada"), std::string::npos);
  EXPECT_EQ(run([](CommandContext &made) { return runAccountSignOut(made); }), 69);
}

}  // namespace
}  // namespace droxa::testing
