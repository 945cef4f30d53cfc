#include <gtest/gtest.h>

#include "platform/launchservices/IconTheme.h"
#include "platform/launchservices/KeyFile.h"
#include "tests/platform/EnvironmentVariable.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class IconThemeTest : public testing::Test {
 protected:
  static std::string picture(const std::string &what) { return std::string("\x89PNG\r\n\x1a\n", 8) + what; }
  // "16" or "16@2" for each size.
  void theme(const std::string &name, const std::string &inherits, const std::vector<int> &sizes) const {
    std::string index = "[Icon Theme]\nInherits=" + inherits + "\nDirectories=", groups;
    for (const int size : sizes) {
      index += std::to_string(size) + "/apps,";
      groups += "[" + std::to_string(size) + "/apps]\nSize=" + std::to_string(size) + "\n";
    }
    folder.write("share/icons/" + name + "/index.theme", index + "\n" + groups);
  }
  void icon(const std::string &themeName, int size, const std::string &name) const {
    folder.write("share/icons/" + themeName + "/" + std::to_string(size) + "/apps/" + name + ".png",
                 picture(themeName + std::to_string(size)));
  }
  static std::string found(const std::string &name, int side) {
    const NSData data = IconImageData(name, side);
    return data ? std::string(reinterpret_cast<const char *>(data.bytes().data()) + 8, data.length() - 8)
                : "none";
  }

  const TemporaryFolder folder;
  const EnvironmentVariable home{"XDG_DATA_HOME", folder.path() + "/home"};
  const EnvironmentVariable shared{"XDG_DATA_DIRS", folder.path() + "/share"};
  const EnvironmentVariable settings{"XDG_CONFIG_HOME", folder.path() + "/config"};
};

TEST_F(IconThemeTest, theSizeIsTheSameElseTheNextLargerElseTheLargest) {
  theme("hicolor", "", {16, 48, 128});
  for (const int size : {16, 48, 128}) icon("hicolor", size, "a");
  EXPECT_EQ(found("a", 48), "hicolor48");
  EXPECT_EQ(found("a", 49), "hicolor128");
  EXPECT_EQ(found("a", 1), "hicolor16");
  EXPECT_EQ(found("a", 500), "hicolor128");
  EXPECT_EQ(found("b", 48), "none");
}

TEST_F(IconThemeTest, theUsersThemeComesFirstThenThoseItInheritsThenTheLast) {
  folder.write("config/gtk-3.0/settings.ini", "[Settings]\ngtk-icon-theme-name=Mine\n");
  theme("Mine", "Parent", {32});
  theme("Parent", "Mine", {32});  // round and round
  theme("hicolor", "", {32});
  for (const char *name : {"Mine", "Parent", "hicolor"}) icon(name, 32, std::string("in") + name);
  icon("Parent", 32, "inMine");
  EXPECT_EQ(found("inMine", 32), "Mine32");
  EXPECT_EQ(found("inParent", 32), "Parent32");
  EXPECT_EQ(found("inhicolor", 32), "hicolor32");
}

TEST_F(IconThemeTest, aFileThatIsNoPictureIsPassedOver) {
  theme("hicolor", "", {32, 64});
  icon("hicolor", 64, "a");
  folder.write("share/icons/hicolor/32/apps/a.png", "not a picture");
  EXPECT_EQ(found("a", 32), "hicolor64");
}

TEST_F(IconThemeTest, anAbsolutePathIsThePictureItself) {
  folder.write("icon.png", picture("itself"));
  EXPECT_EQ(found(folder.path() + "/icon.png", 32), "itself");
  EXPECT_EQ(found(folder.path() + "/missing.png", 32), "none");
  EXPECT_EQ(found("../share/icon", 32), "none");
  EXPECT_EQ(found("", 32), "none");
}

TEST_F(IconThemeTest, picturesOfNoThemeAreTheLastResort) {
  folder.write("share/pixmaps/a.png", picture("unthemed"));
  EXPECT_EQ(found("a", 32), "unthemed");
}

TEST(KeyFile, readsGroupsKeysAndLists) {
  const KeyFile file(
      "# a comment\nlost=1\n[One]\nkey = a\\sb\nkey=second\nlist=x; y;;\nnumber=12\nnot=1x\n"
      "[broken\nkey=lost\n[Two]\nyes=true\n");
  EXPECT_EQ(file.text("One", "key"), "a b");
  EXPECT_EQ(file.list("One", "list", ';'), (std::vector<std::string>{"x", "y"}));
  EXPECT_EQ(file.number("One", "number"), 12);
  EXPECT_EQ(file.number("One", "not"), std::nullopt);
  EXPECT_TRUE(file.isTrue("Two", "yes"));
  EXPECT_EQ(file.value("One", "missing"), nullptr);
  EXPECT_EQ(file.value("Three", "key"), nullptr);
  EXPECT_FALSE(KeyFile::read("/nonexistent"));
}

}  // namespace
}  // namespace droxa
