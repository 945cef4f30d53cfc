#include <fstream>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "platform/imaging/DesktopThumbnails.h"
#include "tests/platform/EnvironmentVariable.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class DesktopThumbnailsTest : public testing::Test {
 protected:
  const PNGImage picture{1024, 256, std::vector<std::uint8_t>(std::size_t{1024} * 256 * 4, 100)};
  const DesktopThumbnailSubject subject{"/home/vera/a.jpg", 1700000000, 42};
  const TemporaryFolder folder;
  const DesktopThumbnails cache{folder.path() + "/thumbnails"};
};

// The name that the cache's own description gives as its example.
TEST_F(DesktopThumbnailsTest, aFileIsNamedAfterTheURI) {
  EXPECT_EQ(cache.fileFor("/home/jens/photos/me.png", "normal"),
            folder.path() + "/thumbnails/normal/c6ee772d9e49320e97ec29a7eb5b1697.png");
}

TEST_F(DesktopThumbnailsTest, aURIIsWrittenAsTheDesktopsProgramsDo) {
  EXPECT_EQ(DesktopThumbnails::URIForPath("/a b/ä#?;%[x]~(1)!'*&=:@+$,.jpg"),
            "file:///a%20b/%C3%A4%23%3F%3B%25%5Bx%5D~(1)!'*&=:@+$,.jpg");
}

TEST_F(DesktopThumbnailsTest, theUsersCacheIsWhereTheEnvironmentSays) {
  const EnvironmentVariable set("XDG_CACHE_HOME", "/some/where");
  EXPECT_EQ(DesktopThumbnails::userFolder(), "/some/where/thumbnails");
  const EnvironmentVariable relative("XDG_CACHE_HOME", "where");
  EXPECT_TRUE(DesktopThumbnails::userFolder().ends_with("/.cache/thumbnails"));
}

TEST_F(DesktopThumbnailsTest, whatIsStoredIsThereInEverySize) {
  EXPECT_FALSE(cache.hasAll(subject));
  EXPECT_EQ(cache.store(subject, picture), NSError());
  EXPECT_TRUE(cache.hasAll(subject));
  struct stat status {};
  ASSERT_EQ(stat(cache.fileFor(subject.path, "xx-large").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
}

TEST_F(DesktopThumbnailsTest, anotherStateOfTheDocumentHasNone) {
  EXPECT_EQ(cache.store(subject, picture), NSError());
  DesktopThumbnailSubject later = subject;
  later.modifiedSeconds += 1;
  EXPECT_FALSE(cache.hasAll(later));
  EXPECT_EQ(cache.store(later, picture), NSError());
  EXPECT_TRUE(cache.hasAll(later));
  EXPECT_FALSE(cache.hasAll(subject));
}

TEST_F(DesktopThumbnailsTest, oneThatSomebodyElseMadeIsLeftAlone) {
  EXPECT_EQ(cache.store(subject, picture), NSError());
  const std::string file = cache.fileFor(subject.path, "normal");
  struct stat before {
  }, after{};
  ASSERT_EQ(stat(file.c_str(), &before), 0);
  EXPECT_EQ(cache.store(subject, picture), NSError());
  ASSERT_EQ(stat(file.c_str(), &after), 0);
  EXPECT_EQ(before.st_ino, after.st_ino);
}

TEST_F(DesktopThumbnailsTest, aDamagedFileIsReplaced) {
  EXPECT_EQ(cache.store(subject, picture), NSError());
  std::ofstream(cache.fileFor(subject.path, "large")) << "damaged";
  EXPECT_FALSE(cache.hasAll(subject));
  EXPECT_EQ(cache.store(subject, picture), NSError());
  EXPECT_TRUE(cache.hasAll(subject));
}

TEST_F(DesktopThumbnailsTest, aCacheThatCannotBeWrittenIsAnError) {
  folder.write("thumbnails", "a file in the folder's place");
  EXPECT_TRUE(cache.store(subject, picture));
  EXPECT_FALSE(cache.hasAll(subject));
}

}  // namespace
}  // namespace droxa
