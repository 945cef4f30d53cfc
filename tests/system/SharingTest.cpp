#include <filesystem>

#include "tests/system/SharingFixture.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;
using Json = nlohmann::json;

const Json *participantOf(const Json &share, const std::string &account) {
  if (!share.contains("participants")) return nullptr;
  for (const Json &one : share["participants"])
    if (one["account"] == account) return &one;
  return nullptr;
}

// Two people with a home each, and what both see of one cloud.
class SharingOfTwo : public SharingTests {
 protected:
  void SetUp() override {
    SharingTests::SetUp();
    const std::string cloud = anna.home() + "/cloud of both";
    anna.start({"--cloud", cloud, "--account", "anna", "--device", "anna's"});
    bert.start({"--cloud", cloud, "--account", "bert", "--device", "bert's"});
  }

  // Where bert has what is at the link.
  std::string accept(const std::string &link) {
    const Json accepted = share(bert, {"accept", link});
    return accepted.value("path", std::string());
  }
  // anna shares it with bert; where bert has it.
  std::string shareWithBert(const std::string &item, bool readOnly = false) {
    share(anna, {"create", item});
    const Json shared = share(anna, readOnly ? std::vector<std::string>{"add", "--read-only", item, "bert"}
                                             : std::vector<std::string>{"add", item, "bert"});
    const Json *invited = participantOf(shared, "bert");
    EXPECT_TRUE(invited) << shared;
    return accept(shared.value("link", std::string()));
  }
  // What bert reads there, through the drive.
  std::string read(Drive &drive, const std::string &path) {
    const Result result = drive.droxa({"cat", path}, 90s);
    return result.status == 0 ? result.output : "can't be read: " + result.errors;
  }
  bool eventuallyReads(Drive &drive, const std::string &path, const std::string &contents) {
    return eventually([&] { return read(drive, path) == contents; }, kPatience);
  }
  static bool eventuallyGone(const std::string &path) {
    return eventually([&] { return !fs::exists(path); }, kPatience);
  }

  Drive anna;
  Drive bert;
};

TEST_F(SharingOfTwo, aDocumentGoesToWhoeverItIsSharedWithAndEditsGoBothWays) {
  makeDocument(anna, "letter.txt", "from anna");
  const std::string berts = shareWithBert("letter.txt");
  ASSERT_FALSE(berts.empty());
  EXPECT_EQ(read(bert, berts), "from anna");
  EXPECT_TRUE(bert.waitForName("letter.txt", fs::path(berts).parent_path().string()));

  const std::string annas = anna.documents() + "/letter.txt";
  writeFile(berts, "from bert, who had it");
  EXPECT_TRUE(eventuallyReads(anna, annas, "from bert, who had it"));
  writeFile(annas, "and back");
  EXPECT_TRUE(eventuallyReads(bert, berts, "and back"));
}

TEST_F(SharingOfTwo, theCommandTellsWhoWhatAndWhere) {
  makeDocument(anna, "letter.txt", "from anna");
  EXPECT_EQ(share(anna, {"letter.txt"})["shared"], false);
  const std::string berts = shareWithBert("letter.txt", true);
  ASSERT_FALSE(berts.empty());
  Json shared = share(anna, {"letter.txt"});
  EXPECT_EQ(shared["shared"], true);
  EXPECT_EQ(shared["title"], "letter.txt");
  EXPECT_EQ(shared["everyone"], "none");
  EXPECT_EQ(shared["link"], share(anna, {"link", "letter.txt"})["link"]);
  const Json *owner = participantOf(shared, "anna");
  ASSERT_TRUE(owner) << shared;
  EXPECT_EQ((*owner)["role"], "owner");
  const Json *other = participantOf(shared, "bert");
  ASSERT_TRUE(other) << shared;
  EXPECT_EQ((*other)["permission"], "read-only");
  EXPECT_EQ((*other)["status"], "accepted");
  // The other side sees the same share.
  Json seen = share(bert, {berts});
  EXPECT_EQ(seen["link"], shared["link"]);
  ASSERT_TRUE(participantOf(seen, "anna")) << seen;
  EXPECT_EQ((*participantOf(seen, "anna"))["role"], "owner");
}

TEST_F(SharingOfTwo, whatIsReadOnlyStaysAsTheOwnerHasItUntilItMayBeWritten) {
  makeDocument(anna, "letter.txt", "from anna");
  const std::string berts = shareWithBert("letter.txt", true);
  ASSERT_FALSE(berts.empty());
  ASSERT_EQ(read(bert, berts), "from anna");
  EXPECT_EQ(fs::status(berts).permissions() & fs::perms::owner_write, fs::perms::none);
  fs::permissions(berts, fs::perms::owner_write, fs::perm_options::add);
  writeFile(berts, "bert was here");
  EXPECT_TRUE(eventually(
      [&] {
        const Result wait = bert.droxa({"wait", berts}, 90s);
        return wait.status != 0 && wait.errors.find("you may only read this") != std::string::npos;
      },
      kPatience))
      << bert.droxa({"wait", berts}, 90s).errors;
  EXPECT_EQ(readFile(anna.documents() + "/letter.txt"), "from anna");

  share(anna, {"permission", "letter.txt", "bert", "read-write"});
  EXPECT_TRUE(eventuallyReads(anna, anna.documents() + "/letter.txt", "bert was here"));
}

TEST_F(SharingOfTwo, whatIsTakenBackGoesFromTheOthersDrive) {
  makeDocument(anna, "letter.txt", "from anna");
  makeDocument(anna, "second.txt", "as well");
  const std::string first = shareWithBert("letter.txt");
  ASSERT_FALSE(first.empty());
  const std::string second = shareWithBert("second.txt");
  ASSERT_FALSE(second.empty());
  ASSERT_TRUE(fs::exists(first));
  share(anna, {"remove", "letter.txt", "bert"});
  EXPECT_TRUE(eventuallyGone(first));
  EXPECT_TRUE(fs::exists(second));
  EXPECT_EQ(share(anna, {"letter.txt"})["shared"], true) << "the share itself stays";

  EXPECT_EQ(share(anna, {"remove", "second.txt"})["shared"], false);
  EXPECT_TRUE(eventuallyGone(second));
  EXPECT_EQ(readFile(anna.documents() + "/letter.txt"), "from anna");
  EXPECT_EQ(readFile(anna.documents() + "/second.txt"), "as well");
}

TEST_F(SharingOfTwo, whoeverLeavesLosesItAloneAndTheOwnerKeepsIt) {
  makeDocument(anna, "letter.txt", "from anna");
  const std::string berts = shareWithBert("letter.txt");
  ASSERT_FALSE(berts.empty());
  const Result left = bert.droxa({"share", "remove", berts}, 90s);
  EXPECT_EQ(left.status, 0) << left.errors;
  EXPECT_TRUE(eventuallyGone(berts));
  EXPECT_EQ(readFile(anna.documents() + "/letter.txt"), "from anna");
}

TEST_F(SharingOfTwo, aFolderIsSharedByWhoeverIsEntitledToAndWithAllThatComesIntoIt) {
  if (const std::string why = whyNotEntitled(); !why.empty()) GTEST_SKIP() << why;
  makeDocument(anna, "plans/one.txt", "one");
  expectRefused(anna, {"share", "create", "plans"}, kSharingProxy);
  expectRefused(anna, {"share", "create", "plans"}, "/etc/droxa/entitlements.d");
  entitleCommand(allSharingEntitlements());
  const std::string berts = shareWithBert("plans");
  ASSERT_FALSE(berts.empty());
  EXPECT_TRUE(eventuallyReads(bert, berts + "/one.txt", "one"));

  writeFile(anna.documents() + "/plans/two.txt", "two");
  EXPECT_TRUE(eventuallyReads(bert, berts + "/two.txt", "two"));
  writeFile(berts + "/three.txt", "three");
  EXPECT_TRUE(eventuallyReads(anna, anna.documents() + "/plans/three.txt", "three"));

  share(anna, {"remove", "plans"});
  EXPECT_TRUE(eventuallyGone(berts));
  EXPECT_TRUE(fs::exists(anna.documents() + "/plans/three.txt"));
}

TEST_F(SharingOfTwo, aLinkOpensNothingForWhoIsNeitherNamedNorEverybody) {
  makeDocument(anna, "letter.txt", "from anna");
  const std::string link = share(anna, {"create", "letter.txt"}).value("link", std::string());
  expectRefused(bert, {"share", "accept", link}, "");
  expectRefused(bert, {"share", "accept", "no link at all"}, "no link at all");
  share(anna, {"permission", "letter.txt", "--everyone", "read-only"});
  const std::string berts = accept(link);
  ASSERT_FALSE(berts.empty());
  EXPECT_EQ(read(bert, berts), "from anna");
}

}  // namespace
}  // namespace droxa::testing
