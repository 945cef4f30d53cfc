#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/launchservices/LSBundleProxy.h"
#include "tests/platform/EnvironmentVariable.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class LSBundleProxyTest : public testing::Test {
 protected:
  LSBundleProxyTest() {
    mkdir(entitlements.c_str(), 0755);
    chmod(entitlements.c_str(), 0755);
    EntitlementFiles::setProcessFiles(EntitlementFiles(entitlements, getuid()));
  }
  ~LSBundleProxyTest() override {
    EntitlementFiles::setProcessFiles(EntitlementFiles("/etc/droxa/entitlements.d", 0));
  }
  void install(const std::string &file, const std::string &keys, const std::string &where = "share") const {
    folder.write(where + "/applications/" + file, "[Desktop Entry]\nType=Application\nName=App\n" + keys);
  }
  void entitle(const std::string &application) const {
    folder.write("entitlements/a.json", R"({"applications": [)" + application + "]}");
    chmod((entitlements + "/a.json").c_str(), 0644);
  }
  static std::shared_ptr<const LSBundleProxy> find(const std::string &identifier) {
    return LSBundleProxy::bundleProxyForIdentifier(identifier);
  }

  const TemporaryFolder folder;
  const std::string entitlements = folder.path() + "/entitlements";
  const EnvironmentVariable home{"XDG_DATA_HOME", folder.path() + "/home"};
  const EnvironmentVariable shared{"XDG_DATA_DIRS", folder.path() + "/share"};
};

TEST_F(LSBundleProxyTest, anApplicationIsItsDesktopEntry) {
  install("org.example.Writer.desktop", "Icon=writer\nExec=/bin/sh -c \"true\" %U\n");
  const auto proxy = find("org.example.Writer");
  ASSERT_TRUE(proxy);
  EXPECT_EQ(proxy->bundleIdentifier(), "org.example.Writer");
  EXPECT_EQ(proxy->localizedName(), "App");
  EXPECT_EQ(proxy->iconName(), "writer");
  EXPECT_EQ(proxy->executable(), "/bin/sh");
  EXPECT_EQ(proxy->flatpak(), std::nullopt);
}

TEST_F(LSBundleProxyTest, whatFlatpakExportsIsFound) {
  install("org.example.Writer.desktop", "X-Flatpak=org.example.Writer\nExec=flatpak run x\n",
          "home/flatpak/exports/share");
  ASSERT_TRUE(find("org.example.Writer"));
  EXPECT_EQ(find("org.example.Writer")->flatpak(), "org.example.Writer");
}

TEST_F(LSBundleProxyTest, aHyphenMayStandForAFolder) {
  install("kde/writer-one.desktop", "Exec=sh\n");
  EXPECT_TRUE(find("kde-writer-one"));
  EXPECT_FALSE(find("kde-writer"));
}

TEST_F(LSBundleProxyTest, theUsersEntryDecidesAndMayHideTheOthers) {
  install("a.desktop", "Icon=theirs\n");
  install("a.desktop", "Icon=own\n", "home");
  EXPECT_EQ(find("a")->iconName(), "own");
  install("a.desktop", "Hidden=true\n", "home");
  EXPECT_FALSE(find("a"));
}

TEST_F(LSBundleProxyTest, whatIsNoApplicationIsNone) {
  folder.write("share/applications/link.desktop", "[Desktop Entry]\nType=Link\n");
  folder.write("share/applications/empty.desktop", "");
  const std::vector<std::string> none{
      "link", "empty", "missing", "", ".", "../applications/link", "a/b", std::string("a\0b", 3)};
  for (const std::string &identifier : none) EXPECT_FALSE(find(identifier)) << identifier;
  EXPECT_FALSE(find(std::string(1000, 'a')));
}

TEST_F(LSBundleProxyTest, valuesAreThoseThatAreAskedForAndGranted) {
  install("a.desktop", "X-Flatpak=org.example.A\n");
  entitle(R"({"flatpak": "org.example.A", "entitlements": ["plain", "other"],
              "values": {"list": ["x", "y"], "text": "z", "unasked": true}},
             {"flatpak": "org.example.B", "values": {"elses": true}})");
  const LSPropertyList values = find("a")->entitlementValuesForKeys({"plain", "list", "text", "elses"});
  ASSERT_TRUE(values.objectForKey("plain"));
  EXPECT_EQ(*values.objectForKey("plain"), EntitlementValue(true));
  EXPECT_EQ(*values.objectForKey("list"), EntitlementValue(std::vector<std::string>{"x", "y"}));
  EXPECT_EQ(*values.objectForKey("text"), EntitlementValue(std::string("z")));
  for (const char *key : {"other", "unasked", "elses"}) EXPECT_FALSE(values.objectForKey(key)) << key;
}

TEST_F(LSBundleProxyTest, anExecutableIsRecognisedByItsFile) {
  install("a.desktop", "Exec=/bin/sh\n");
  entitle(R"({"executable": "/usr/bin/../bin/sh", "values": {"text": "z"}})");
  EXPECT_TRUE(find("a")->entitlementValuesForKeys({"text"}).objectForKey("text"));
  entitle(R"({"executable": "/bin/cat", "values": {"text": "z"}})");
  EXPECT_FALSE(find("a")->entitlementValuesForKeys({"text"}).objectForKey("text"));
}

TEST_F(LSBundleProxyTest, aFileWithAValueThatMakesNoSenseGrantsNothing) {
  install("a.desktop", "X-Flatpak=org.example.A\n");
  for (const char *value : {"false", "7", "[1]", "{}", "\"\"", "null"}) {
    entitle(R"({"flatpak": "org.example.A", "values": {"text": "z", "wrong": )" + std::string(value) + "}}");
    EXPECT_FALSE(find("a")->entitlementValuesForKeys({"text"}).objectForKey("text")) << value;
  }
}

}  // namespace
}  // namespace droxa
