#include <filesystem>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/entitlements/EntitlementFiles.h"
#include "platform/oslog/os_log.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

constexpr char kGrant[] =
    R"({"applications": [{"flatpak": "org.example.Writer", "entitlements": ["one", "two"]},
                         {"executable": "/usr/bin/writer", "entitlements": []}]})";

class EntitlementFilesTest : public testing::Test {
 protected:
  EntitlementFilesTest() { chmod(folder.path().c_str(), 0755); }
  std::string path(const std::string &name) const { return folder.path() + "/" + name; }
  void write(const std::string &name, const std::string &text, mode_t mode = 0644) const {
    folder.write(name, text);
    chmod(path(name).c_str(), mode);
  }
  // Why the only file is ignored; "" when it isn't, or grants something all the same.
  std::string whyIgnored() const {
    const EntitlementGrants read = files.read();
    EXPECT_TRUE(read.grants.empty());
    EXPECT_EQ(read.problems.size(), 1U);
    return read.problems.empty() ? "" : read.problems[0].why;
  }
  std::string whyIgnored(const std::string &text) const {
    write("a.json", text);
    return whyIgnored();
  }

  const TemporaryFolder folder;
  const EntitlementFiles files = EntitlementFiles(folder.path(), getuid());
  OSLogCapture capture;
};

TEST_F(EntitlementFilesTest, filesOfTheSystemAreRootsAndInEtc) {
  EXPECT_EQ(EntitlementFiles::processFiles().folder(), "/etc/droxa/entitlements.d");
  EXPECT_EQ(EntitlementFiles::processFiles().owner(), 0U);
}

TEST_F(EntitlementFilesTest, aFileGrantsApplicationsByIdentifierAndExecutable) {
  write("a.json", kGrant);
  const EntitlementGrants read = files.read();
  EXPECT_TRUE(read.problems.empty());
  ASSERT_EQ(read.grants.size(), 2U);
  EXPECT_EQ(read.grants[0].kind, EntitlementGrant::Kind::flatpak);
  EXPECT_EQ(read.grants[0].application, "org.example.Writer");
  EXPECT_EQ(read.grants[0].entitlements, (std::vector<std::string>{"one", "two"}));
  EXPECT_EQ(read.grants[0].file, path("a.json"));
  EXPECT_EQ(read.grants[1].kind, EntitlementGrant::Kind::executable);
  EXPECT_EQ(read.grants[1].application, "/usr/bin/writer");
  EXPECT_TRUE(capture.texts().empty());
}

TEST_F(EntitlementFilesTest, filesAreReadInTheOrderOfTheirNamesAndOthersLeftAlone) {
  write("b.json", R"({"applications": [{"flatpak": "b", "entitlements": []}]})");
  write("a.json", R"({"applications": [{"flatpak": "a", "entitlements": []}]})");
  write("c.json.bak", "not ours");
  write(".hidden.json", "not ours");
  const EntitlementGrants read = files.read();
  ASSERT_EQ(read.grants.size(), 2U);
  EXPECT_EQ(read.grants[0].application, "a");
  EXPECT_TRUE(read.problems.empty());
}

TEST_F(EntitlementFilesTest, withoutAFolderNothingIsGranted) {
  const EntitlementGrants read = EntitlementFiles(path("none"), getuid()).read();
  EXPECT_TRUE(read.grants.empty());
  EXPECT_TRUE(read.problems.empty());
}

TEST_F(EntitlementFilesTest, aFileThatOthersCanWriteIsIgnoredAndLogged) {
  for (const mode_t mode : {0664U, 0646U, 0666U}) {
    write("a.json", kGrant, mode);
    EXPECT_EQ(whyIgnored(), "others than its owner can write it");
  }
  EXPECT_TRUE(
      capture.contains("[ERROR] ignoring " + path("a.json") + ": others than its owner can write it"));
  write("a.json", kGrant, 0600);
  EXPECT_EQ(files.read().grants.size(), 2U);
}

TEST_F(EntitlementFilesTest, aFileOrFolderOfSomebodyElseIsIgnored) {
  write("a.json", kGrant);
  const EntitlementGrants read = EntitlementFiles(folder.path(), getuid() + 1).read();
  EXPECT_TRUE(read.grants.empty());
  ASSERT_EQ(read.problems.size(), 1U);
  EXPECT_EQ(read.problems[0].file, folder.path());
  EXPECT_EQ(read.problems[0].why, "it belongs to user " + std::to_string(getuid()) + ", not to user " +
                                      std::to_string(getuid() + 1));
}

TEST_F(EntitlementFilesTest, aFolderThatOthersCanWriteIsIgnoredWithAllThatIsInIt) {
  write("a.json", kGrant);
  chmod(folder.path().c_str(), 0777);
  EXPECT_EQ(whyIgnored(), "others than its owner can write it");
}

TEST_F(EntitlementFilesTest, whatIsNoPlainFileIsIgnored) {
  std::filesystem::create_symlink("/etc/passwd", path("a.json"));
  EXPECT_EQ(whyIgnored(), "it is a symbolic link");
  std::filesystem::remove(path("a.json"));
  ASSERT_EQ(mkfifo(path("a.json").c_str(), 0644), 0);
  EXPECT_EQ(whyIgnored(), "it isn't a file");
}

TEST_F(EntitlementFilesTest, aFileThatDoesntReadGrantsNothingAtAll) {
  EXPECT_EQ(whyIgnored("{"), "it isn't JSON");
  EXPECT_EQ(whyIgnored("[]"), "it needs \"applications\", a list");
  EXPECT_EQ(whyIgnored(R"({"applications": {}})"), "it needs \"applications\", a list");
  EXPECT_EQ(whyIgnored(R"({"applications": [1]})"), "an application isn't an object");
  EXPECT_EQ(whyIgnored(R"({"applications": [{"entitlements": []}]})"),
            "an application needs either \"flatpak\" or \"executable\", a text");
  EXPECT_EQ(whyIgnored(R"({"applications": [{"flatpak": "a", "executable": "/b", "entitlements": []}]})"),
            "an application needs either \"flatpak\" or \"executable\", a text");
  EXPECT_EQ(whyIgnored(R"({"applications": [{"executable": "b", "entitlements": []}]})"),
            "the executable \"b\" isn't an absolute path");
  EXPECT_EQ(whyIgnored(R"({"applications": [{"flatpak": "a"}]})"),
            "an application needs \"entitlements\", a list");
  EXPECT_EQ(whyIgnored(R"({"applications": [{"flatpak": "a", "entitlements": ["one"]},
                                            {"flatpak": "b", "entitlements": [2]}]})"),
            "an entitlement of b isn't a text");
  EXPECT_EQ(whyIgnored(std::string((1U << 20) + 1, ' ')), "it is larger than 1 MiB");
}

TEST_F(EntitlementFilesTest, oneBadFileLeavesTheOthers) {
  write("a.json", "{");
  write("b.json", kGrant);
  const EntitlementGrants read = files.read();
  EXPECT_EQ(read.grants.size(), 2U);
  EXPECT_EQ(read.problems.size(), 1U);
}

}  // namespace
}  // namespace droxa
