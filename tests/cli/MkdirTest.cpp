#include <nlohmann/json.hpp>

#include "tests/cli/ActionsFixture.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;

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

}  // namespace
}  // namespace droxa::testing
