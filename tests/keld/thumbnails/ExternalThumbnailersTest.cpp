// Installed thumbnailers, in their confinement. Where nothing can confine them they aren't used, which is all
// there is to see then.

#include <cstdlib>
#include <filesystem>

#include "keld/thumbnails/ExternalThumbnailers.h"
#include "keld/thumbnails/ThumbnailTypes.h"
#include "tests/keld/thumbnails/ThumbnailFiles.h"

namespace droxa::keld {
namespace {

class External : public ThumbnailFiles {
 protected:
  External() {
    ::setenv("XDG_DATA_HOME", (folder.path() + "/data").c_str(), 1);
    ::setenv("XDG_DATA_DIRS", "/nonexistent", 1);
  }
  ~External() override {
    ::unsetenv("XDG_DATA_HOME");
    ::unsetenv("XDG_DATA_DIRS");
  }
  void SetUp() override {
    if (!CanConfineThumbnailers()) GTEST_SKIP() << "nothing can confine a thumbnailer here";
  }
  static ThumbnailerOptions options() {
    ThumbnailerOptions made;
    made.program = THUMBNAILER;
    made.limits.wallMilliseconds = 60'000;
    return made;
  }
  // The shell script is the thumbnailer of a type; $1 is the document, $2 the thumbnail, $3 the size.
  void install(const std::string &type, const std::string &script) {
    folder.write(
        "data/thumbnailers/" + type + ".thumbnailer",
        "[Thumbnailer Entry]\nExec=/bin/sh -c \"" + script + "\" sh %i %o %s\nMimeType=film/" + type + "\n");
  }
  ThumbnailResult film(const std::string &type, const std::string &contents) {
    return make(thumbnailer, contents, "film/" + type);
  }

  SandboxedThumbnailer thumbnailer{options()};
};

TEST_F(External, whatOneMakesBecomesAThumbnail) {
  install("good", "test $3 = 1024 && cp $1 $2");
  const ThumbnailResult result = film("good", draw("photograph", 3000, 2000, "frame.jpg"));
  ASSERT_EQ(result.outcome, Outcome::made) << result.why;
  EXPECT_EQ(result.width, 683U);
  EXPECT_EQ(result.height, 1024U);
  EXPECT_EQ(bytesOf(result).substr(1, 3), "PNG");
}

TEST_F(External, aTypeWithoutOneHasNoThumbnail) {
  EXPECT_FALSE(CanMakeThumbnailOfType("film/unknown"));
  EXPECT_EQ(film("unknown", "x").outcome, Outcome::refused);
  install("known", "true");
  EXPECT_TRUE(CanMakeThumbnailOfType("film/known"));
}

TEST_F(External, oneThatFailsOrMakesGarbageCostsTheThumbnail) {
  install("failing", "exit 3");
  EXPECT_EQ(film("failing", "x").outcome, Outcome::refused);
  install("silent", "true");
  EXPECT_EQ(film("silent", "x").outcome, Outcome::refused);
  install("garbage", "echo garbage > $2");
  EXPECT_EQ(film("garbage", "x").outcome, Outcome::refused);
  install("talking", "cat $1");
  EXPECT_EQ(film("talking", draw("plain", 9, 9, "plain.png")).outcome, Outcome::refused)
      << "that isn't its file";
}

TEST_F(External, itSeesNobodysDocumentsAndNoNetwork) {
  folder.write("secret", "mine");
  folder.write("good.png", draw("plain", 9, 9, "plain.png"));
  const std::string unless = " && exit 1; cp $1 $2";
  install("reading", "cat " + at("secret") + unless);
  EXPECT_EQ(film("reading", read("good.png")).outcome, Outcome::made);
  install("listing", "ls /home /root /etc/passwd" + unless);
  EXPECT_EQ(film("listing", read("good.png")).outcome, Outcome::made);
  install("writing", "touch /usr/new" + unless);
  EXPECT_EQ(film("writing", read("good.png")).outcome, Outcome::made);
  install("spoiling", "sh -c 'echo spoilt > $1'; cp $1 $2");
  EXPECT_EQ(film("spoiling", read("good.png")).outcome, Outcome::made);
  EXPECT_EQ(read("contents"), read("good.png"));
  install("connecting", "test $(grep -c : /proc/net/dev) -gt 1" + unless);
  EXPECT_EQ(film("connecting", read("good.png")).outcome, Outcome::made);
}

TEST_F(External, oneThatHangsIsEndedWithAllItStarted) {
  ThumbnailerOptions brief = options();
  brief.limits.wallMilliseconds = 700;
  SandboxedThumbnailer impatient(brief);
  install("hanging", "sleep 1000 & sleep 1000");
  const ThumbnailResult result = make(impatient, "x", "film/hanging");
  EXPECT_EQ(result.outcome, Outcome::refused);
  EXPECT_NE(result.why.find("within 700 ms"), std::string::npos) << result.why;
}

TEST_F(External, oneThatFillsTheDiskFillsItsOwn) {
  install("filling", "cat /dev/zero > $2; exit 0");
  EXPECT_EQ(film("filling", "x").outcome, Outcome::refused);
}

}  // namespace
}  // namespace droxa::keld
