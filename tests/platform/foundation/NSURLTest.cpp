#include <gtest/gtest.h>

#include "platform/foundation/NSURL.h"

namespace droxa {
namespace {

std::string pathOf(std::string_view path) {
  return NSURL::fileURLWithPath(path).path();
}

NSURL file(std::string_view path) {
  return NSURL::fileURLWithPath(path);
}

TEST(NSURL, nilAnswersNothing) {
  const NSURL nil;
  EXPECT_FALSE(nil);
  EXPECT_FALSE(nil.isFileURL());
  EXPECT_EQ(nil.path(), "");
  EXPECT_EQ(nil.absoluteString(), "");
  EXPECT_EQ(nil.lastPathComponent(), "");
  EXPECT_EQ(nil.description(), "(null)");
  EXPECT_FALSE(nil.URLByAppendingPathComponent("a"));
  EXPECT_FALSE(nil.URLByDeletingLastPathComponent());
  EXPECT_FALSE(nil.URLWithPhysicalProperty());
  EXPECT_FALSE(nil.hasPhysicalProperty());
  EXPECT_FALSE(nil.isEqualToOrBelow(nil));
  EXPECT_EQ(nil, NSURL());
  EXPECT_NE(nil, file("/"));
}

TEST(NSURL, normalisesThePathByText) {
  EXPECT_EQ(pathOf("/a/b"), "/a/b");
  EXPECT_EQ(pathOf("//a///b//"), "/a/b");
  EXPECT_EQ(pathOf("/a/./b/."), "/a/b");
  EXPECT_EQ(pathOf("/a/../b"), "/b");
  EXPECT_EQ(pathOf("/../../a"), "/a");
  EXPECT_EQ(pathOf("/a/.."), "/");
  EXPECT_EQ(pathOf("a/b"), "/a/b");
  EXPECT_EQ(pathOf("."), "/");
}

TEST(NSURL, namesOfDotsAreNames) {
  EXPECT_EQ(pathOf("/a/..."), "/a/...");
  EXPECT_EQ(pathOf("/a/..b"), "/a/..b");
  EXPECT_EQ(pathOf("/.hidden"), "/.hidden");
}

TEST(NSURL, refusesEmptyPathsAndNULBytes) {
  EXPECT_FALSE(file(""));
  EXPECT_FALSE(file(std::string_view("/a\0b", 4)));
  EXPECT_FALSE(file("/a").URLByAppendingPathComponent(std::string_view("b\0", 2)));
}

TEST(NSURL, keepsAnyOtherByteAndEncodesItInText) {
  const NSURL url = file("/a b\n\xff\xc3\xa9%");
  EXPECT_EQ(url.path(), "/a b\n\xff\xc3\xa9%");
  EXPECT_EQ(url.absoluteString(), "file:///a%20b%0A%FF%C3%A9%25");
  EXPECT_EQ(NSURL::URLWithString(url.absoluteString()), url);
  EXPECT_EQ(url.description(), url.absoluteString());
}

TEST(NSURL, readsFileURLs) {
  EXPECT_EQ(NSURL::URLWithString("file:///a%20b"), file("/a b"));
  EXPECT_EQ(NSURL::URLWithString("file://localhost/a"), file("/a"));
  EXPECT_EQ(NSURL::URLWithString("FILE:/a/b/"), file("/a/b"));
}

TEST(NSURL, refusesFileURLsThatNameNoLocalPath) {
  for (const char *text : {"file:", "file://", "file:a", "file://elsewhere/a", "file:///a%", "file:///a%zz",
                           "file:///a%00", "file:///a?b", "file:///a#b"}) {
    EXPECT_FALSE(NSURL::URLWithString(text)) << text;
  }
}

TEST(NSURL, refusesTextsWithoutAScheme) {
  for (const char *text : {"", "/a/b", "a", ":a", "1a:b", "a b:c", "é:a"}) {
    EXPECT_FALSE(NSURL::URLWithString(text)) << text;
  }
}

TEST(NSURL, keepsTheTextOfOtherSchemes) {
  const NSURL url = NSURL::URLWithString("HTTPS://example.com/a%20b?c#d");
  ASSERT_TRUE(url);
  EXPECT_FALSE(url.isFileURL());
  EXPECT_EQ(url.absoluteString(), "HTTPS://example.com/a%20b?c#d");
  EXPECT_EQ(url.path(), "//example.com/a%20b?c#d");
  EXPECT_EQ(url, NSURL::URLWithString("https://example.com/a%20b?c#d"));
  EXPECT_NE(url, NSURL::URLWithString("http://example.com/a%20b?c#d"));
}

TEST(NSURL, appendsToOtherSchemesInTheirText) {
  const NSURL url = NSURL::URLWithString("https://example.com/a");
  EXPECT_EQ(url.URLByAppendingPathComponent("b c").absoluteString(), "https://example.com/a/b%20c");
  EXPECT_EQ(url.URLByDeletingLastPathComponent().absoluteString(), "https://example.com");
  EXPECT_EQ(NSURL::URLWithString("mailto:x").URLByDeletingLastPathComponent().absoluteString(), "mailto:x");
}

TEST(NSURL, goesDownAndUp) {
  EXPECT_EQ(file("/a").URLByAppendingPathComponent("b").path(), "/a/b");
  EXPECT_EQ(file("/").URLByAppendingPathComponent("b").path(), "/b");
  EXPECT_EQ(file("/a").URLByAppendingPathComponent("").path(), "/a");
  EXPECT_EQ(file("/a/b").URLByDeletingLastPathComponent().path(), "/a");
  EXPECT_EQ(file("/").URLByDeletingLastPathComponent().path(), "/");
  EXPECT_EQ(file("/a/b").lastPathComponent(), "b");
  EXPECT_EQ(file("/").lastPathComponent(), "/");
}

TEST(NSURL, liesBelowAFolderByComponents) {
  EXPECT_TRUE(file("/a/b").isEqualToOrBelow(file("/a")));
  EXPECT_TRUE(file("/a/").isEqualToOrBelow(file("/a")));
  EXPECT_TRUE(file("/a").isEqualToOrBelow(file("/")));
  EXPECT_FALSE(file("/ab").isEqualToOrBelow(file("/a")));
  EXPECT_FALSE(file("/a").isEqualToOrBelow(file("/a/b")));
  EXPECT_FALSE(NSURL::URLWithString("x:/a/b").isEqualToOrBelow(file("/a")));
}

TEST(NSURL, thePhysicalPropertyDoesNotCountAndIsNotHandedDown) {
  const NSURL url = file("/a");
  const NSURL physical = url.URLWithPhysicalProperty();
  EXPECT_FALSE(url.hasPhysicalProperty());
  EXPECT_TRUE(physical.hasPhysicalProperty());
  EXPECT_TRUE(physical.URLWithPhysicalProperty().hasPhysicalProperty());
  EXPECT_EQ(url, physical);
  EXPECT_FALSE(physical.URLByAppendingPathComponent("b").hasPhysicalProperty());
}

}  // namespace
}  // namespace droxa
