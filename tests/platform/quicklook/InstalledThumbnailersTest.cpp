#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <gtest/gtest.h>

#include "platform/quicklook/InstalledThumbnailers.h"
#include "platform/quicklook/QLThumbnailStoreRetrievalOperation.h"
#include "tests/platform/TemporaryFolder.h"

namespace droxa {
namespace {

class InstalledThumbnailersTest : public testing::Test {
 protected:
  InstalledThumbnailersTest() {
    ::setenv("XDG_DATA_HOME", (folder.path() + "/user").c_str(), 1);
    ::setenv("XDG_DATA_DIRS", (folder.path() + "/one:relative:" + folder.path() + "/two").c_str(), 1);
  }
  ~InstalledThumbnailersTest() override {
    ::unsetenv("XDG_DATA_HOME");
    ::unsetenv("XDG_DATA_DIRS");
  }
  void install(const std::string &where, const std::string &name, const std::string &lines) {
    folder.write(where + "/thumbnailers/" + name, "[Thumbnailer Entry]\n" + lines + "\n");
    // The clock of the file system may be coarser than the test is quick.
    stamp_ += std::chrono::seconds(2);
    for (const std::string &path : {where + "/thumbnailers", where + "/thumbnailers/" + name})
      std::filesystem::last_write_time(folder.path() + "/" + path, stamp_);
  }
  std::string programFor(const std::string &type) {
    const auto found = installed.forType(type);
    return found ? found->command[0] : "";
  }
  static bool answers(const std::string &type) {
    return QLThumbnailStoreRetrievalOperation::canMostRecentClientsGenerateThumbnailsForUTI(type);
  }

  const TemporaryFolder folder;
  InstalledThumbnailers installed;

 private:
  std::filesystem::file_time_type stamp_ = std::filesystem::file_time_type::clock::now();
};

TEST_F(InstalledThumbnailersTest, areFoundByTheTypesOfTheirFiles) {
  install("two", "film.thumbnailer",
          "TryExec=true\nExec=true --size %s %u %o\nMimeType=video/mp4;video/webm;");
  EXPECT_TRUE(answers("video/mp4"));
  EXPECT_TRUE(answers("video/webm"));
  EXPECT_FALSE(answers("video/x-matroska"));
  EXPECT_FALSE(answers(""));
  const auto found = installed.forType("video/webm");
  ASSERT_TRUE(found);
  EXPECT_EQ(found->command.size(), 5U);
  EXPECT_EQ(found->command[0].substr(found->command[0].rfind('/')), "/true");
  EXPECT_EQ(found->command[3], "%u");
}

TEST_F(InstalledThumbnailersTest, theUsersComeFirst) {
  install("two", "film.thumbnailer", "Exec=/bin/true\nMimeType=video/mp4");
  EXPECT_EQ(programFor("video/mp4"), "/bin/true");
  install("user", "film.thumbnailer", "Exec=/bin/false\nMimeType=video/mp4");
  EXPECT_EQ(programFor("video/mp4"), "/bin/false");
}

TEST_F(InstalledThumbnailersTest, whatTheUserPutsInTheWayOfOneHidesIt) {
  install("two", "film.thumbnailer", "Exec=/bin/true\nMimeType=video/mp4");
  install("user", "film.thumbnailer", "Exec=/bin/true\nMimeType=nothing/at-all");
  EXPECT_EQ(programFor("video/mp4"), "");
}

TEST_F(InstalledThumbnailersTest, malformedFilesArePassedOver) {
  install("one", "a.thumbnailer", "Exec=\nMimeType=video/mp4");
  install("one", "b.thumbnailer", "Exec=/bin/true");
  install("one", "c.thumbnailer", "Exec=\"/bin/true %u\nMimeType=video/mp4");
  install("one", "d.thumbnailer", "no entry at all");
  folder.write("one/thumbnailers/e.thumbnailer", "Exec=/bin/true\nMimeType=video/mp4\n");
  folder.write("one/thumbnailers/f.thumbnailer", std::string("\0\xff\n[", 4));
  install("one", "g.desktop", "Exec=/bin/true\nMimeType=video/mp4");
  std::filesystem::create_directories(folder.path() + "/one/thumbnailers/h.thumbnailer");
  EXPECT_EQ(programFor("video/mp4"), "");
  install("one", "z.thumbnailer",
          "[Other]\nExec=/bin/true\n[Thumbnailer Entry]\nExec=/bin/false\nMimeType=video/mp4");
  EXPECT_EQ(programFor("video/mp4"), "/bin/false");
}

TEST_F(InstalledThumbnailersTest, oneWhoseProgramIsMissingIsNone) {
  install("one", "a.thumbnailer", "TryExec=no-such-program\nExec=/bin/true\nMimeType=video/mp4");
  install("one", "b.thumbnailer", "TryExec=true\nExec=/no/such/program %u\nMimeType=video/mp4");
  EXPECT_EQ(programFor("video/mp4"), "");
}

TEST_F(InstalledThumbnailersTest, aChangeIsSeen) {
  EXPECT_EQ(programFor("video/mp4"), "");
  install("one", "a.thumbnailer", "Exec=/bin/true\nMimeType=video/mp4");
  EXPECT_EQ(programFor("video/mp4"), "/bin/true");
  install("one", "a.thumbnailer", "Exec=/bin/true\nMimeType=video/webm");
  EXPECT_EQ(programFor("video/mp4"), "");
  EXPECT_EQ(programFor("video/webm"), "/bin/true");
  std::filesystem::remove(folder.path() + "/one/thumbnailers/a.thumbnailer");
  EXPECT_EQ(programFor("video/webm"), "");
}

TEST_F(InstalledThumbnailersTest, wordsInQuotesStayTogether) {
  install("one", "a.thumbnailer", "Exec=/bin/true \"two words\" a\\ b %i \"\"\nMimeType=video/mp4");
  const auto found = installed.forType("video/mp4");
  ASSERT_TRUE(found);
  EXPECT_EQ(found->command, (std::vector<std::string>{"/bin/true", "two words", "a b", "%i", ""}));
}

}  // namespace
}  // namespace droxa
