#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/imaging/PNGImage.h"
#include "tessaly/QVErrors.h"
#include "tests/thumbnails/ThumbnailsFixture.h"
#include "thumbnails/QVThumbnailFetching.h"

namespace droxa {
namespace {

constexpr char kWriter[] = "org.example.Writer";

class ContainerThumbnail : public ThumbnailsTest {
 protected:
  // An icon theme with pictures of these sizes.
  void installIcon(const std::string &name, const std::vector<int> &sizes) const {
    std::string index = "[Icon Theme]\nName=Hicolor\nDirectories=";
    std::string groups;
    for (const int size : sizes) {
      const std::string folder = std::to_string(size) + "x" + std::to_string(size) + "/apps";
      index += folder + ",";
      groups += "\n[" + folder + "]\nSize=" + std::to_string(size) + "\nType=Fixed\n";
      std::filesystem::create_directories(share + "/icons/hicolor/" + folder);
      std::ofstream(share + "/icons/hicolor/" + folder + "/" + name + ".png") << picture(size);
    }
    std::ofstream(share + "/icons/hicolor/index.theme") << index << "\n" << groups;
  }
  static std::string picture(int size) {
    return std::string("\x89PNG\r\n\x1a\n", 8) + "of " + std::to_string(size);
  }
  void installWriter() const {
    std::filesystem::create_directories(share + "/applications");
    std::ofstream(share + "/applications/" + kWriter + ".desktop")
        << "[Desktop Entry]\nType=Application\nName=Writer\nIcon=writer\nExec=/bin/true\n";
  }
  // The identifier of the folder that the container is shown as.
  std::string folderOfWriter() {
    daemon.addContainer(kWriter);
    return daemon.identifier(documentsOf(kWriter)).asString();
  }
};

TEST_F(ContainerThumbnail, anApplicationsFolderIsItsPlainIcon) {
  installWriter();
  installIcon("writer", {48, 128});
  const std::string folder = folderOfWriter();
  const auto answers = fetch({folder}, {100, 100});
  const ThumbnailAnswer answer = answers->of(folder);
  EXPECT_EQ(answer.data, NSData::dataWithString(picture(128)));
  EXPECT_EQ(answer.contentType, "com.quorva.fileprovider.qv-undecorated-container");
  EXPECT_EQ(answer.error, NSError());
  EXPECT_EQ(answers->done.value<0>(), NSError());
}

TEST_F(ContainerThumbnail, aLargerIconIsScaledDown) {
  installWriter();
  installIcon("writer", {128});
  const NSData large = PNGImage(128, 128, std::vector<std::uint8_t>(std::size_t{128} * 128 * 4, 7)).file();
  std::ofstream(share + "/icons/hicolor/128x128/apps/writer.png")
      .write(reinterpret_cast<const char *>(large.bytes().data()),
             static_cast<std::streamsize>(large.length()));
  const std::string folder = folderOfWriter();
  const auto scaled = PNGImage::read(fetch({folder}, {100, 100})->of(folder).data, nullptr);
  ASSERT_TRUE(scaled);
  EXPECT_EQ(scaled->width(), 100U);
}

TEST_F(ContainerThumbnail, theRootIsAFolderWithoutAContentType) {
  installIcon("folder", {64});
  const auto answers = fetch({NSFileProviderRootContainerItemIdentifier}, {64, 64});
  const ThumbnailAnswer answer = answers->of(NSFileProviderRootContainerItemIdentifier);
  EXPECT_EQ(answer.data, NSData::dataWithString(picture(64)));
  EXPECT_EQ(answer.contentType, std::nullopt);
}

TEST_F(ContainerThumbnail, withoutAnImageTheSizeIsToBlame) {
  installWriter();
  const std::string folder = folderOfWriter();
  const auto answers = fetch({folder}, {200, 80});
  const ThumbnailAnswer answer = answers->of(folder);
  EXPECT_FALSE(answer.data);
  EXPECT_EQ(answer.contentType, std::nullopt);
  EXPECT_EQ(answer.error, qv_fileProviderError(qvc_errorInvalidParameter("size", "{80.00, 80.00}")));
  EXPECT_EQ(answers->done.value<0>(), NSError());
  EXPECT_EQ(count("error: [ERROR] can't find image with size {80.00, 80.00} for " + std::string(kWriter)),
            1U);
}

TEST_F(ContainerThumbnail, theContainersAreAskedForOnceInARequest) {
  const std::string folder = folderOfWriter();
  QVContainerCache::forget();
  fetch({folder, NSFileProviderRootContainerItemIdentifier, folder});
  EXPECT_LE(daemon.log().count("getContainers"), 2U);
}

TEST_F(ContainerThumbnail, aContainerThatIsNotKnownIsNoSuchItem) {
  ThumbnailAnswers answers;
  QVThumbnailFetching::_fetchThumbnailForContainerID("unknown", "i7", {80, 80}, {}, answers.handler());
  EXPECT_EQ(answers.of("i7").error, fileProviderErrorForNonExistentItemWithIdentifier("i7"));
  EXPECT_EQ(count("error: [ERROR] can't find container with ID unknown"), 1U);
  QVThumbnailFetching::_fetchThumbnailForContainerID("unknown", "i7", {80, 80}, {}, nullptr);
  answers.done.completion()({});
}

TEST_F(ContainerThumbnail, theSizeIsASquareOfAtMost120) {
  const auto proper = QVThumbnailFetching::_properSizeForContainerThumbnail;
  EXPECT_EQ(proper({200, 80}), (CGSize{80, 80}));
  EXPECT_EQ(logged(),
            (Lines{"debug: [DEBUG] width (200.00) is greater than max width (120.00)",
                   "debug: [DEBUG] width (120.00) and height (80.00) should be equal for container's "
                   "thumbnail"}));
  clear();
  EXPECT_EQ(proper({300, 300}), (CGSize{120, 120}));
  EXPECT_EQ(logged(), (Lines{"debug: [DEBUG] width (300.00) is greater than max width (120.00)",
                             "debug: [DEBUG] height (300.00) is greater than max height (120.00)"}));
  clear();
  EXPECT_EQ(proper({120, 120}), (CGSize{120, 120}));
  EXPECT_EQ(proper({0, 0}), (CGSize{0, 0}));
  EXPECT_EQ(logged(), Lines{});
}

}  // namespace
}  // namespace droxa
