#include "tests/cli/ActionsFixture.h"

namespace droxa::testing {
namespace {

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

// So that what goes there can be put back.
TEST_F(MvCommand, intoTheTrashTrashes) {
  for (const char *trash : {".Trash", "/.Trash", ".Trash/"}) {
    host->requests.clear();
    EXPECT_EQ(mv({"a.txt"}, trash), 0) << err.str();
    EXPECT_EQ(request().kind, Kind::trash) << trash;
    EXPECT_EQ(request().identifier, "d1") << trash;
    EXPECT_EQ(request().parentIdentifier, std::nullopt) << trash;
  }
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

}  // namespace
}  // namespace droxa::testing
