#include <cerrno>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <stdlib.h>

#include "cli/Actions.h"
#include "cli/ItemText.h"
#include "platform/fileprovider/FPTags.h"
#include "platform/foundation/Paths.h"
#include "tests/cli/ScriptedHost.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;
using Kind = FPDActionRequest::Kind;
using Words = std::vector<std::string>;

const std::string kRoot = NSFileProviderRootContainerItemIdentifier;

// A drive with the document "a.txt" (d1) in the root, and the folder "in" (i2) with "b.txt" (d3). Actions end
// as `result` and `failures` say.
class ActionsTest : public ::testing::Test, protected CommandFixture {
 protected:
  ActionsTest() {
    stop = [] { return false; };
    name("/", root());
    name("a.txt", item("d1", "a.txt"));
    name("in", folder("i2", "in"));
    NSFileProviderItemFields inner = item("d3", "b.txt");
    inner.parentItemIdentifier = "i2";
    name("in/b.txt", inner);
    host->act = [this](const FPDActionRequest &) { return done(); };
  }
  static NSFileProviderItemFields root() {
    NSFileProviderItemFields fields = folder(kRoot, "");
    return fields;
  }
  void name(const std::string &path, const NSFileProviderItemFields &fields) {
    host->items[fields.itemIdentifier] = fields;
    host->paths[path] = fields.itemIdentifier;
    host->paths["./" + path] = fields.itemIdentifier;
    if (path != "/") host->paths["/" + path] = fields.itemIdentifier;
  }
  std::shared_ptr<FPDAction> done() {
    auto action = std::make_shared<ScriptedAction>();
    NSError failure;
    if (!failures.empty()) {
      failure = failures.front();
      failures.erase(failures.begin());
    }
    if (failure) {
      action->end(nullptr, failure);
    } else {
      action->end(result ? std::make_shared<NSFileProviderPlainItem>(*result) : nullptr);
    }
    return action;
  }
  const FPDActionRequest &request(std::size_t index = 0) const { return host->requests.at(index); }
  bool said(const std::string &words) const { return err.str().find(words) != std::string::npos; }
  bool printed(const NSFileProviderItemFields &fields) const { return out.str() == longLine(fields) + "\n"; }

  std::optional<NSFileProviderItemFields> result = item("d9", "result");
  std::vector<NSError> failures;  // of the next actions; nil: done
};

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

class MkdirCommand : public ActionsTest {
 protected:
  int mkdir(const Words &paths, bool withParents = false, bool json = false) {
    return run([&](CommandContext &made) { return runMkdir(made, paths, withParents, json); });
  }
};

TEST_F(MkdirCommand, makesAFolderInItsParent) {
  EXPECT_EQ(mkdir({"new", "in/other/", "/in/third", "d77"}), 0) << err.str();
  ASSERT_EQ(host->requests.size(), 4U);
  EXPECT_EQ(request().kind, Kind::createDirectory);
  EXPECT_EQ(request().name, "new");
  EXPECT_EQ(request(1).name, "other");
  EXPECT_EQ(request(1).parentIdentifier, "i2");
  EXPECT_EQ(request(2).parentIdentifier, "i2");
  EXPECT_EQ(request(3).name, "d77");
}

TEST_F(MkdirCommand, printsAnItemAsJSON) {
  EXPECT_EQ(mkdir({"in/new"}, false, true), 0);
  EXPECT_EQ(Json::parse(out.str())["identifier"], "d9");
}

TEST_F(MkdirCommand, aNameThatIsTakenSaysByWhatAndTheNextIsMade) {
  failures = {
      fileProviderErrorForCollisionWithItem(std::make_shared<NSFileProviderPlainItem>(item("d1", "a.txt")))};
  EXPECT_EQ(mkdir({"a.txt", "new"}), 1);
  EXPECT_TRUE(said("a.txt: something has that name already (a.txt, d1); choose another name")) << err.str();
  EXPECT_TRUE(printed(*result));
}

TEST_F(MkdirCommand, aNameThatCantBeSaysWhy) {
  failures = {NSError(NSCocoaErrorDomain, NSFileWriteInvalidFileNameError,
                      NSUserInfo{{NSLocalizedDescriptionKey, "it has 300 bytes, and 255 is the most"}})};
  EXPECT_EQ(mkdir({std::string(300, 'x')}), 1);
  EXPECT_TRUE(said(": it has 300 bytes, and 255 is the most")) << err.str();
}

TEST_F(MkdirCommand, withoutItsParentNamesTheParent) {
  EXPECT_EQ(mkdir({"nowhere/new"}), 66);
  EXPECT_TRUE(said("nowhere: there is no such item")) << err.str();
  EXPECT_EQ(mkdir({"a.txt/new"}), 1);
  EXPECT_TRUE(said("a.txt: it is a document, not a folder")) << err.str();
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(MkdirCommand, withParentsMakesWhatIsMissing) {
  host->act = [this](const FPDActionRequest &made) {
    result = folder("i" + std::to_string(10 + host->requests.size()), *made.name);
    return done();
  };
  EXPECT_EQ(mkdir({"in/x/y"}, true), 0) << err.str();
  ASSERT_EQ(host->requests.size(), 2U);
  EXPECT_EQ(request().parentIdentifier, "i2");
  EXPECT_EQ(request().name, "x");
  EXPECT_EQ(request(1).parentIdentifier, "i11");
  EXPECT_EQ(request(1).name, "y");
}

TEST_F(MkdirCommand, withParentsIsContentWithWhatIsThere) {
  EXPECT_EQ(mkdir({"in"}, true), 0) << err.str();
  EXPECT_TRUE(printed(folder("i2", "in")));
  EXPECT_EQ(mkdir({"a.txt"}, true), 1);
  EXPECT_TRUE(said("a.txt: it is a document, not a folder")) << err.str();
  EXPECT_EQ(mkdir({"a.txt/x"}, true), 1);
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(MkdirCommand, withParentsDoesntMindWhoeverWasQuicker) {
  host->act = [this](const FPDActionRequest &made) {
    if (*made.name == "x") {
      name("in/x", folder("i20", "x"));
      failures = {fileProviderErrorForCollisionWithItem(nullptr)};
    }
    return done();
  };
  EXPECT_EQ(mkdir({"in/x/y"}, true), 0) << err.str();
  EXPECT_EQ(request(1).parentIdentifier, "i20");
}

class MvCommand : public ActionsTest {
 protected:
  int mv(const Words &items, const std::string &to, bool json = false) {
    return run([&](CommandContext &made) { return runMv(made, items, to, json); });
  }
  int rename(const std::string &argument, const std::string &to) {
    return run([&](CommandContext &made) { return runRename(made, argument, to, false); });
  }
};

TEST_F(MvCommand, intoAFolderKeepsTheName) {
  EXPECT_EQ(mv({"a.txt"}, "in"), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::reparent);
  EXPECT_EQ(request().identifier, "d1");
  EXPECT_EQ(request().parentIdentifier, "i2");
  EXPECT_EQ(request().name, std::nullopt);
  EXPECT_TRUE(printed(*result));
}

TEST_F(MvCommand, toANewNameElsewhereTakesIt) {
  EXPECT_EQ(mv({"a.txt"}, "in/new.txt"), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::reparent);
  EXPECT_EQ(request().parentIdentifier, "i2");
  EXPECT_EQ(request().name, "new.txt");
}

// A folder can't be moved into the folder that it is in, which would be into itself.
TEST_F(MvCommand, toANewNameInItsFolderIsARename) {
  EXPECT_EQ(mv({"in"}, "out"), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::rename);
  EXPECT_EQ(request().name, "out");
  EXPECT_EQ(request().parentIdentifier, std::nullopt);
}

// Renaming an alias would rename its target.
TEST_F(MvCommand, ofAnAliasInItsFolderIsAMove) {
  name("alias", item("i5", "alias", NSFileProviderItemKind::alias));
  EXPECT_EQ(mv({"alias"}, "other"), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::reparent);
  EXPECT_EQ(request().identifier, "i5");
  EXPECT_EQ(request().parentIdentifier, kRoot);
}

TEST_F(MvCommand, severalNeedAFolder) {
  EXPECT_EQ(mv({"a.txt", "in/b.txt"}, "new"), 66);
  EXPECT_EQ(mv({"in", "in/b.txt"}, "a.txt"), 1);
  EXPECT_TRUE(said("a.txt: it is a document, not a folder, and nothing is overwritten")) << err.str();
  EXPECT_EQ(mv({"a.txt"}, "new/"), 66);
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(MvCommand, goesOnAfterOneThatFailed) {
  EXPECT_EQ(mv({"missing", "in/b.txt", "a.txt"}, "/"), 66);
  EXPECT_TRUE(said("a.txt: it is in that folder already")) << err.str();
  ASSERT_EQ(host->requests.size(), 1U);
  EXPECT_EQ(request().identifier, "d3");
  EXPECT_EQ(request().parentIdentifier, kRoot);
}

TEST_F(MvCommand, aMoveThatIsRefusedSaysWhy) {
  failures = {NSError(
      NSCocoaErrorDomain, 512,
      NSUserInfo{{NSUnderlyingErrorKey,
                  NSError::errorWithPOSIXCode(EACCES, "The move between those locations is invalid")}})};
  EXPECT_EQ(mv({"a.txt"}, "in"), 1);
  EXPECT_TRUE(said("a.txt: The move between those locations is invalid")) << err.str();
}

TEST_F(MvCommand, ctrlCCancelsTheDownload) {
  const auto action = std::make_shared<ScriptedAction>();
  host->act = [&](const FPDActionRequest &) { return action; };
  stop = [] { return true; };
  EXPECT_EQ(mv({"a.txt"}, "in"), 130);
  EXPECT_TRUE(action->wasCancelled());
}

TEST_F(MvCommand, aRenameTakesAnyNameButOneWithASlash) {
  for (const std::string name :
       {"B.txt", "line\nbreak", "trailing. ", "\xF0\x9F\x98\x80", "e\xCC\x81", "\xC3\xA9"}) {
    EXPECT_EQ(rename("a.txt", name), 0) << err.str();
    EXPECT_EQ(host->requests.back().kind, Kind::rename);
    EXPECT_EQ(host->requests.back().identifier, "d1");
    EXPECT_EQ(host->requests.back().name, name);
  }
  host->requests.clear();
  EXPECT_EQ(rename("a.txt", "in/b"), 1);
  EXPECT_TRUE(said("a name has no '/'; `droxa mv` moves")) << err.str();
  EXPECT_EQ(rename("missing", "b"), 66);
  EXPECT_TRUE(host->requests.empty());
}

class TrashCommand : public ActionsTest {
 protected:
  TrashCommand() {
    NSFileProviderItemFields trashed = item("d4", "old.txt");
    trashed.isTrashed = true;
    name(".Trash/old.txt", trashed);
  }
  int trash(const Words &items) {
    return run([&](CommandContext &made) { return runTrash(made, items, false); });
  }
  int restore(const Words &items, const std::optional<std::string> &to = std::nullopt) {
    return run([&](CommandContext &made) { return runRestore(made, items, to, false); });
  }
  int rm(const Words &items, bool withContents = false, bool json = false) {
    return run([&](CommandContext &made) { return runRm(made, items, withContents, json); });
  }
};

TEST_F(TrashCommand, trashesEach) {
  EXPECT_EQ(trash({"a.txt", "missing", "in"}), 66);
  ASSERT_EQ(host->requests.size(), 2U);
  EXPECT_EQ(request().kind, Kind::trash);
  EXPECT_EQ(request().identifier, "d1");
  EXPECT_EQ(request(1).identifier, "i2");
}

TEST_F(TrashCommand, whatIsInTheTrashIsNotTrashedAgain) {
  EXPECT_EQ(trash({".Trash/old.txt"}), 1);
  EXPECT_TRUE(said("it is in the trash already")) << err.str();
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(TrashCommand, theDrivesOwnFoldersStay) {
  const std::string replica = DroxaProcessHome().replica();
  name("Desktop", folder("i8", "Desktop"));
  host->urls["i8"] = replica + "/com.quorva.Tessaly.desktop/Documents";
  host->urls["i2"] = replica + "/com.quorva.Tessaly.default/Documents/in";
  host->urls[kRoot] = replica + "/com.quorva.Tessaly.default/Documents";
  for (const std::string folder : {"Desktop", "/"}) {
    EXPECT_EQ(trash({folder}), 1);
    EXPECT_TRUE(said("it is one of the drive's own folders")) << err.str();
    EXPECT_EQ(rm({folder}, true), 1);
    EXPECT_EQ(run([&](CommandContext &made) { return runMv(made, {folder}, "in", false); }), 1);
    EXPECT_EQ(run([&](CommandContext &made) { return runRename(made, folder, "x", false); }), 1);
  }
  EXPECT_TRUE(host->requests.empty());
  EXPECT_EQ(trash({"in"}), 0);
}

TEST_F(TrashCommand, restoresToWhereItWasOrToAFolder) {
  EXPECT_EQ(restore({".Trash/old.txt"}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::untrash);
  EXPECT_EQ(request().identifier, "d4");
  EXPECT_EQ(request().parentIdentifier, std::nullopt);
  EXPECT_EQ(restore({".Trash/old.txt"}, "in"), 0);
  EXPECT_EQ(request(1).parentIdentifier, "i2");
  EXPECT_EQ(restore({".Trash/old.txt"}, "nowhere"), 66);
  EXPECT_EQ(host->requests.size(), 2U);
}

TEST_F(TrashCommand, whatIsNotInTheTrashIsNotRestored) {
  EXPECT_EQ(restore({"a.txt"}), 1);
  EXPECT_TRUE(said("it isn't in the trash; `droxa ls .Trash` shows what is")) << err.str();
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(TrashCommand, anItemThatIsStillInTheTrashIsNotRestored) {
  result->isTrashed = true;
  EXPECT_EQ(restore({".Trash/old.txt"}), 1);
  EXPECT_TRUE(said("--to FOLDER says where to")) << err.str();
}

TEST_F(TrashCommand, deletesForGood) {
  result.reset();
  EXPECT_EQ(rm({"a.txt", ".Trash/old.txt"}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::deleteItem);
  EXPECT_EQ(request().identifier, "d1");
  EXPECT_EQ(out.str(), "a.txt: deleted (d1)\n.Trash/old.txt: deleted (d4)\n");
  EXPECT_EQ(rm({"a.txt"}, false, true), 0);
  EXPECT_EQ(Json::parse(out.str())["deleted"], true);
  EXPECT_EQ(Json::parse(out.str())["identifier"], "d1");
}

TEST_F(TrashCommand, aFolderIsDeletedWithMinusRAlone) {
  result.reset();
  EXPECT_EQ(rm({"in"}), 1);
  EXPECT_TRUE(said("in: it is a folder; -r deletes it with everything below it")) << err.str();
  EXPECT_TRUE(host->requests.empty());
  EXPECT_EQ(rm({"in"}, true), 0);
}

TEST_F(TrashCommand, aDeletionThatIsRefusedPrintsNothing) {
  failures = {NSError(NSCocoaErrorDomain, NSFileWriteNoPermissionError)};
  EXPECT_EQ(rm({"a.txt"}), 77);
  EXPECT_TRUE(said("a.txt: it may not be changed")) << err.str();
  EXPECT_EQ(out.str(), "");
}

class NotesCommand : public ActionsTest {
 protected:
  NotesCommand() {
    NSFileProviderItemFields tagged = item("d5", "tagged");
    tagged.tagData = FPGetTagsDataFromTags({{"work", 6}, {"later", 0}});
    name("tagged", tagged);
  }
  int tag(const std::string &argument, const Words &names, bool json = false) {
    return run([&](CommandContext &made) { return runTag(made, argument, names, json); });
  }
  int untag(const std::string &argument, const Words &names) {
    return run([&](CommandContext &made) { return runUntag(made, argument, names, false); });
  }
  int used(const UsedOptions &options) {
    return run([&](CommandContext &made) { return runUsed(made, options); });
  }
};

TEST_F(NotesCommand, withoutNamesTagShowsThoseThereAre) {
  EXPECT_EQ(tag("tagged", {}), 0);
  EXPECT_EQ(out.str(), "work (red)\nlater\n");
  EXPECT_EQ(tag("a.txt", {}), 0);
  EXPECT_EQ(out.str(), "");
  EXPECT_EQ(tag("tagged", {}, true), 0);
  EXPECT_EQ(Json::parse(out.str())["tagNames"], (Json{"work", "later"}));
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(NotesCommand, tagAddsWhatIsNew) {
  EXPECT_EQ(tag("tagged", {"later", "new", "new"}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::setTagData);
  EXPECT_EQ(FPGetTagsFromTagsData(request().tagData),
            (std::vector<FPTag>{{"work", 6}, {"later", 0}, {"new", 0}}));
  EXPECT_TRUE(printed(*result));
}

TEST_F(NotesCommand, untagRemovesThoseOrAll) {
  EXPECT_EQ(untag("tagged", {"work"}), 0) << err.str();
  EXPECT_EQ(FPGetTagsFromTagsData(request().tagData), (std::vector<FPTag>{{"later", 0}}));
  EXPECT_EQ(untag("tagged", {}), 0);
  EXPECT_FALSE(request(1).tagData);
  EXPECT_EQ(untag("tagged", {"other"}), 1);
  EXPECT_TRUE(said("tagged: it has no tag \"other\"")) << err.str();
  EXPECT_EQ(host->requests.size(), 2U);
}

TEST_F(NotesCommand, whatCantBeATagSaysSo) {
  for (const std::string name : {"", "line\nbreak", "\xff"}) {
    EXPECT_EQ(tag("a.txt", {name}), 1);
    EXPECT_TRUE(said("it can't be a tag")) << err.str();
  }
  EXPECT_TRUE(host->requests.empty());
}

TEST_F(NotesCommand, anItemThatHasGoneMeanwhileIsNoSuchItem) {
  result.reset();
  EXPECT_EQ(tag("a.txt", {"new"}), 66);
}

TEST_F(NotesCommand, favoriteSetsAndRemovesTheRank) {
  const auto favorite = [&](std::optional<std::uint64_t> rank) {
    return run([&](CommandContext &made) { return runFavorite(made, "a.txt", rank, false); });
  };
  EXPECT_EQ(favorite(7), 0);
  EXPECT_EQ(request().kind, Kind::setFavoriteRank);
  EXPECT_EQ(request().favoriteRank, 7U);
  EXPECT_EQ(favorite(std::nullopt), 0);
  EXPECT_EQ(request(1).favoriteRank, std::nullopt);
}

TEST_F(NotesCommand, usedTakesADateOrNowOrNever) {
  EXPECT_EQ(used({"a.txt", "2026-01-31T12:00:00Z", false, false}), 0) << err.str();
  EXPECT_EQ(request().kind, Kind::setLastUsedDate);
  EXPECT_EQ(request().date, NSDate::dateWithNanosecondsSince1970(1'769'860'800'000'000'000));
  const NSDate before = NSDate::now();
  EXPECT_EQ(used({"a.txt", "", false, false}), 0);
  EXPECT_GE(request(1).date, before);
  EXPECT_EQ(used({"a.txt", "", true, false}), 0);
  EXPECT_FALSE(request(2).date);
  EXPECT_EQ(used({"a.txt", "yesterday", false, false}), 2);
  EXPECT_TRUE(said("yesterday: it is no date such as")) << err.str();
  EXPECT_EQ(host->requests.size(), 3U);
}

TEST_F(NotesCommand, aHostThatIsntThereIsSaid) {
  connecting->failure = NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable);
  EXPECT_EQ(tag("a.txt", {"new"}), 69);
}

TEST_F(NotesCommand, anAnswerThatNeverComesEndsTheCommandInTime) {
  const auto action = std::make_shared<ScriptedAction>();
  host->act = [&](const FPDActionRequest &) { return action; };
  EXPECT_EQ(run([&](CommandContext &made) {
              made.timeout = std::chrono::milliseconds(20);
              return runFavorite(made, "a.txt", 1, false);
            }),
            75);
}

}  // namespace
}  // namespace droxa::testing
