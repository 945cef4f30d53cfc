#include <fcntl.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <unistd.h>

#include "tests/keld/sync/FaultyDrive.h"

namespace droxa::keld {
namespace {

class UsersTricks : public FaultyDrive {
 protected:
  void run(const std::string &command) { ASSERT_EQ(std::system(command.c_str()), 0) << command; }
  std::string quoted(const std::string &path) { return "'" + device.keld.at(path) + "'"; }
  void writeAt(const std::string &path, off_t offset, const std::string &text) {
    const int file = ::open(device.keld.at(path).c_str(), O_WRONLY | O_CLOEXEC);
    ASSERT_GE(file, 0);
    ASSERT_EQ(::pwrite(file, text.data(), text.size(), offset), static_cast<ssize_t>(text.size()));
    ::close(file);
  }
  void setDate(const std::string &path, std::int64_t seconds) {
    const timeval times[2] = {{seconds, 0}, {seconds, 0}};
    ASSERT_EQ(::utimes(device.keld.at(path).c_str(), times), 0);
  }
  // The document is what it was, and what was written stands beside it.
  void expectKeptBeside(const std::string &contents) {
    ASSERT_TRUE(eventually([&] { return conflictCopies().size() == 1; }));
    const std::string copy = conflictCopies()[0];
    EXPECT_TRUE(isInCloudSoon(copy));
    ASSERT_TRUE(eventually([&] { return device.exists("a") && device.keld.knows("a"); }));
    EXPECT_FALSE(device.waitForUploads());
    EXPECT_TRUE(hand.contents("a") == contents);
    EXPECT_TRUE(device.contents("a") == contents);
    EXPECT_EQ(hand.all().size(), 2U);
  }

  const std::string large = std::string(100'000, 'L');
};

TEST_F(UsersTricks, aCopyOfAPlaceholderIsADocumentOfItsOwn) {
  dataless("a", large);
  run("cp -a " + quoted("a") + " " + quoted("copy"));
  EXPECT_TRUE(isInCloudSoon("copy"));
  EXPECT_FALSE(device.waitForUploads());
  ASSERT_TRUE(hand.at("a"));
  EXPECT_NE(hand.at("a")->record, hand.at("copy")->record);
  EXPECT_TRUE(eventually([&] { return hand.contents("copy") == large; }));
  EXPECT_TRUE(device.contents("copy") == large);
  EXPECT_TRUE(device.contents("a") == large);
  device.keld.remove("a");
  EXPECT_TRUE(leavesCloudSoon("a"));
  EXPECT_TRUE(hand.at("copy"));
}

TEST_F(UsersTricks, aCopyOfAPresentDocumentIsADocumentOfItsOwn) {
  sent("a", "contents");
  run("cp -a " + quoted("a") + " " + quoted("copy"));
  EXPECT_TRUE(isInCloudSoon("copy"));
  writeAt("copy", 0, "CONTENTS");
  EXPECT_TRUE(eventually([&] { return hand.contents("copy") == "CONTENTS"; }));
  EXPECT_EQ(hand.contents("a"), "contents");
}

TEST_F(UsersTricks, aDocumentThatLeavesAndComesBackIsThere) {
  sent("own", "contents");
  dataless("far", large);
  for (const char *name : {"own", "far"}) {
    const std::string outside = folder.path() + "/" + name;
    std::filesystem::rename(device.keld.at(name), outside);
    EXPECT_TRUE(leavesCloudSoon(name));
    std::filesystem::rename(outside, device.keld.at(name));
    EXPECT_TRUE(isInCloudSoon(name));
  }
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(device.contents("own"), "contents");
  EXPECT_TRUE(device.contents("far") == large);
}

TEST_F(UsersTricks, aPlaceholderThatIsWrittenInPartIsRestoredAndWhatWasWrittenKept) {
  dataless("a", large);
  writeAt("a", 50'000, "in the middle");
  expectKeptBeside(large);
}

TEST_F(UsersTricks, aPlaceholderThatIsCutIsRestored) {
  dataless("a", large);
  ASSERT_EQ(::truncate(device.keld.at("a").c_str(), 500), 0);
  expectKeptBeside(large);
}

TEST_F(UsersTricks, aPlaceholderThatIsWrittenAnewIsTheNewVersion) {
  dataless("a", large);
  device.keld.write("a", "new");
  EXPECT_TRUE(eventually([&] { return hand.contents("a") == "new"; }));
  dataless("b", large);
  ASSERT_EQ(::truncate(device.keld.at("b").c_str(), 0), 0);
  EXPECT_TRUE(eventually([&] { return hand.contents("b").empty(); }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.all().size(), 2U);
}

TEST_F(UsersTricks, touchingChangesNoContents) {
  dataless("far", large);
  sent("own", "contents");
  const int uploads = cloud->count(Call::uploadAsset);
  setDate("far", 1'600'000'000);
  ::chmod(device.keld.at("far").c_str(), 0600);
  ::chmod(device.keld.at("own").c_str(), 0600);
  EXPECT_TRUE(eventually([&] {
    return (hand.at("far")->content.mode & 0777) == 0600 && (hand.at("own")->content.mode & 0777) == 0600;
  }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(cloud->count(Call::uploadAsset), uploads);
  EXPECT_TRUE(device.isDataless("far"));
  EXPECT_TRUE(device.contents("far") == large);
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UsersTricks, datesOfOtherCenturiesAreSent) {
  for (const std::int64_t date : {std::int64_t{0}, std::int64_t{-86400}, std::int64_t{4'000'000'000}}) {
    const std::string name = "date " + std::to_string(date);
    sent(name, "contents");
    setDate(name, date);
    EXPECT_TRUE(
        eventually([&] { return hand.at(name)->content.modified == date * std::int64_t{1'000'000'000}; }));
    EXPECT_FALSE(device.waitForUploads());
    EXPECT_FALSE(device.evict(name));
    EXPECT_EQ(device.contents(name), "contents");
  }
}

TEST_F(UsersTricks, aHardLinkIsADocumentOfItsOwn) {
  sent("a", "contents");
  std::filesystem::create_hard_link(device.keld.at("a"), device.keld.at("b"));
  EXPECT_TRUE(isInCloudSoon("b"));
  EXPECT_FALSE(device.waitForUploads());
  writeAt("b", 0, "CONTENTS");
  EXPECT_TRUE(eventually([&] { return hand.contents("b") == "CONTENTS"; }));
  EXPECT_TRUE(eventually([&] {
    (void)device.waitForUploads();
    return hand.contents("a") == "CONTENTS" || hand.contents("a") == "contents";
  }));
  device.keld.remove("b");
  EXPECT_TRUE(leavesCloudSoon("b"));
  EXPECT_TRUE(hand.at("a"));
  EXPECT_EQ(device.read("a"), "CONTENTS");
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UsersTricks, twoDocumentsThatSwapTheirNamesKeepTheirContents) {
  sent("a", "of a");
  sent("b", "of b!");
  device.keld.rename("a", "c");
  device.keld.rename("b", "a");
  device.keld.rename("c", "b");
  EXPECT_TRUE(eventually([&] { return hand.contents("a") == "of b!" && hand.contents("b") == "of a"; }));
  EXPECT_FALSE(device.waitForUploads());
  EXPECT_EQ(hand.all().size(), 2U);
  EXPECT_TRUE(conflictCopies().empty());
}

TEST_F(UsersTricks, anEditorThatSavesByRenamingIsNoConflict) {
  dataless("a", large);
  ASSERT_EQ(device.contents("a"), large);
  for (const char *text : {"first save", "second save", "third save"}) {
    device.keld.write("a.tmp", text);
    device.keld.rename("a.tmp", "a");
    EXPECT_FALSE(device.waitForUploads("a"));
    EXPECT_TRUE(eventually([&] { return hand.contents("a") == text; }));
  }
  EXPECT_EQ(hand.paths(), std::vector<std::string>{"a"});
}

}  // namespace
}  // namespace droxa::keld
