#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <optional>
#include <sys/xattr.h>

#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/NSURLResources.h"
#include "platform/foundation/Paths.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class URLResources : public testing::Test {
 protected:
  URLResources() {
    DroxaSetProcessHome(DroxaHome(folder_.path() + "/home"));
    std::string problem;
    EXPECT_TRUE(DroxaProcessHome().create(&problem)) << problem;
    NSURLForgetPackageExtensions();
  }
  ~URLResources() override {
    DroxaSetProcessHome(before_);
    NSURLForgetPackageExtensions();
  }
  NSURL at(const std::string &name) const { return NSURL::fileURLWithPath(folder_.path() + "/" + name); }
  NSURL makeFolder(const std::string &name) const {
    std::filesystem::create_directories(at(name).path());
    return at(name);
  }
  NSURL makeFile(const std::string &name) const {
    std::ofstream(at(name).path()) << "contents";
    return at(name);
  }
  static std::optional<bool> value(const NSURL &url, const char *key) {
    bool value = false;
    NSError error;
    if (!getResourceValue(url, &value, key, &error)) {
      EXPECT_TRUE(error);
      return std::nullopt;
    }
    return value;
  }
  static bool isPackage(const NSURL &url) { return value(url, NSURLIsPackageKey).value_or(false); }

  const DroxaHome before_ = DroxaProcessHome();
  const TemporaryFolder folder_;
};

TEST_F(URLResources, whatIsThereIsReachable) {
  EXPECT_TRUE(checkResourceIsReachableAndReturnError(makeFile("a"), nullptr));
  EXPECT_TRUE(checkResourceIsReachableAndReturnError(makeFolder("f"), nullptr));
  std::filesystem::create_symlink("nowhere", at("link").path());
  EXPECT_TRUE(checkResourceIsReachableAndReturnError(at("link"), nullptr));
}

TEST_F(URLResources, whatIsNotThereIsNot) {
  NSError error;
  EXPECT_FALSE(checkResourceIsReachableAndReturnError(at("missing"), &error));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFileReadNoSuchFileError));
  EXPECT_TRUE(error.underlyingError().is(NSPOSIXErrorDomain, ENOENT));
  EXPECT_FALSE(checkResourceIsReachableAndReturnError(NSURL(), &error));
  EXPECT_FALSE(checkResourceIsReachableAndReturnError(NSURL::URLWithString("https://example.org"), nullptr));
}

TEST_F(URLResources, aDirectoryIsAFolderAndNoLinkToOne) {
  EXPECT_EQ(value(makeFolder("f"), NSURLIsDirectoryKey), true);
  EXPECT_EQ(value(makeFile("a"), NSURLIsDirectoryKey), false);
  std::filesystem::create_directory_symlink("f", at("link").path());
  EXPECT_EQ(value(at("link"), NSURLIsDirectoryKey), false);
  EXPECT_EQ(value(at("missing"), NSURLIsDirectoryKey), std::nullopt);
  EXPECT_EQ(value(at("f"), "NSURLNoSuchKey"), std::nullopt);
}

TEST_F(URLResources, aPackageIsAFolderWithAPackagesExtension) {
  EXPECT_TRUE(isPackage(makeFolder("a.rtfd")));
  EXPECT_TRUE(isPackage(makeFolder("b.Bundle")));
  EXPECT_FALSE(isPackage(makeFolder("c.txt")));
  EXPECT_FALSE(isPackage(makeFolder("rtfd")));
  EXPECT_FALSE(isPackage(makeFolder(".rtfd")));
  EXPECT_FALSE(isPackage(makeFile("d.rtfd")));
}

TEST_F(URLResources, theExtensionsAreReadFromTheConfiguration) {
  std::ofstream(DroxaProcessHome().configuration() + "/package-extensions")
      << "# shown as one document\n .sketch \nPROJ # and these\n\n";
  EXPECT_TRUE(isPackage(makeFolder("a.sketch")));
  EXPECT_TRUE(isPackage(makeFolder("a.proj")));
  EXPECT_FALSE(isPackage(makeFolder("a.rtfd")));
}

TEST_F(URLResources, aMarkedFolderIsAPackage) {
  const NSURL marked = makeFolder("marked");
  if (setxattr(marked.path().c_str(), "user.droxa.package", "", 0, 0) != 0)
    GTEST_SKIP() << "no extended attributes here";
  EXPECT_TRUE(isPackage(marked));
}

TEST_F(URLResources, withoutASyncServiceNothingIsEvicted) {
  NSError error;
  EXPECT_FALSE(NSFileManager::defaultManager()->evictUbiquitousItemAtURL(makeFile("a"), &error));
  EXPECT_TRUE(error.is(NSCocoaErrorDomain, NSFeatureUnsupportedError));
}

TEST_F(URLResources, withoutASyncServiceNothingIsShared) {
  bool isShared = true;
  EXPECT_TRUE(getResourceValue(NSURL::fileURLWithPath(folder_.path()), &isShared,
                               NSURLUbiquitousItemIsSharedKey, nullptr));
  EXPECT_FALSE(isShared);
  NSError error;
  EXPECT_FALSE(getResourceValue(NSURL::fileURLWithPath(folder_.path() + "/none"), &isShared,
                                NSURLUbiquitousItemIsSharedKey, &error));
  EXPECT_TRUE(error);
}

}  // namespace
}  // namespace droxa
