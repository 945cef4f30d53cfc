#include <nlohmann/json.hpp>

#include "platform/foundation/Paths.h"
#include "tests/cli/ActionsFixture.h"

namespace droxa::testing {
namespace {

using Json = nlohmann::json;

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

}  // namespace
}  // namespace droxa::testing
