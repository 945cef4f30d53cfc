#include "tessaly/QVErrors.h"
#include "tests/thumbnails/ThumbnailsFixture.h"

namespace droxa {
namespace {

// Documents that the cloud has no thumbnail of.
class DownloadForThumbnail : public ThumbnailsTest {
 protected:
  // A thumbnailer for the type that the fake daemon gives its documents.
  void installThumbnailer() {
    const std::string type = daemon.item("a")->fields().typeIdentifier;
    std::filesystem::create_directories(share + "/thumbnailers");
    std::ofstream(share + "/thumbnailers/test.thumbnailer")
        << "[Thumbnailer Entry]\nTryExec=/bin/true\nExec=/bin/true %i %o\nMimeType=" << type << ";\n";
  }
  std::size_t downloads() const {
    return daemon.log().count("startDownloadAtURL(" + daemon.url("a").path() + ", options 4)");
  }
  static std::string found() { return "debug: [DEBUG] no thumbnail found for a non-empty file"; }
  std::string downloading() const {
    return "debug: [DEBUG] downloading file at " + daemon.url("a").path() +
           " because quicklook can generate its thumbnail";
  }
  // What every such document is answered.
  void expectNothing(const ThumbnailAnswers &answers, const std::string &identifier) {
    EXPECT_FALSE(answers.of(identifier).data);
    EXPECT_EQ(answers.of(identifier).error, NSError());
    EXPECT_EQ(answers.done.value<0>(), NSError());
  }
};

TEST_F(DownloadForThumbnail, aSmallOneWhoseTypeTheDesktopCanShowIsDownloaded) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(downloads(), 1U);
  EXPECT_EQ(count(found()), 1U);
  EXPECT_EQ(count(downloading()), 1U);
}

TEST_F(DownloadForThumbnail, theAnswerWaitsForTheStartOfTheDownloadAndNotForItsEnd) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  daemon.replies().hold("download");
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_TRUE(daemon.isDownloading("a"));
  EXPECT_EQ(daemon.interests("a"), 1U) << "kept without anybody who waits";
  daemon.replies().release("download");
  EXPECT_TRUE(eventually([&] { return daemon.interests("a") == 0; }));
}

TEST_F(DownloadForThumbnail, aDownloadThatCannotBeStartedIsLoggedAndNoErrorOfTheItem) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  const NSError refused = qvc_error(QVErrorShuttingDown, "not now");
  daemon.replies().failNext("startDownloadAtURL", refused);
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(count("error: [ERROR] can't start downloading " + daemon.url("a").description() + ": " +
                  refused.description()),
            1U);
}

TEST_F(DownloadForThumbnail, aDaemonThatGoesMeanwhileDoesNotHoldTheAnswerBack) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  daemon.replies().failNextInTransport("startDownloadAtURL",
                                       NSError(NSCocoaErrorDomain, NSXPCConnectionInterrupted));
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(count("error: [ERROR] can't start downloading"), 1U);
}

TEST_F(DownloadForThumbnail, aTypeThatTheDesktopCannotShowIsNotDownloaded) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(downloads(), 0U);
  EXPECT_EQ(count(found()), 1U);
  EXPECT_EQ(count(downloading()), 0U);
}

TEST_F(DownloadForThumbnail, theLargestThatIsDownloadedIsASetting) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  setDefaults(R"({"minFileSizeForThumbnailTransfer": 999})");
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(downloads(), 0U);
  setDefaults(R"({"minFileSizeForThumbnailTransfer": 1000})");
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(downloads(), 1U);
}

TEST_F(DownloadForThumbnail, anEmptyDocumentHasNoThumbnail) {
  const std::string identifier = addDocument("a", 0, std::nullopt);
  installThumbnailer();
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(count("debug: [DEBUG] empty record for " + identifier), 1U);
  EXPECT_EQ(downloads(), 0U);
}

TEST_F(DownloadForThumbnail, aDocumentThatHasGoneMeanwhileIsNotDownloaded) {
  const std::string identifier = addDocument("a", 1000, std::nullopt);
  installThumbnailer();
  daemon.remove("a");
  expectNothing(*fetch({identifier}), identifier);
  EXPECT_EQ(downloads(), 0U);
}

}  // namespace
}  // namespace droxa
