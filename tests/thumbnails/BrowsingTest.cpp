#include "extension/HostedExtension.h"
#include "fileproviderd/HostServices.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/ReadFile.h"
#include "platform/imaging/DesktopThumbnails.h"
#include "tessaly/QVErrors.h"
#include "tests/thumbnails/ThumbnailsFixture.h"
#include "tests/xpc/ConnectedPair.h"

namespace droxa {
namespace {

// The extension at the other end of a connection.
class ConnectedExtension final : public ExtensionConnecting {
 public:
  explicit ConnectedExtension(std::shared_ptr<NSXPCConnection> connection)
      : connection_(std::move(connection)) {}
  std::shared_ptr<NSFileProviderExtensionProtocol> extension(NSXPCErrorHandler handler, NSError *) override {
    return connection_->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
        std::move(handler));
  }
  void noteAnswer() override {}
  std::string describeEnd() override { return "as the test wants it"; }

 private:
  const std::shared_ptr<NSXPCConnection> connection_;
};

// What a person who looks at a folder sets going, from the host through the extension to the cloud.
class Browsing : public ThumbnailsTest {
 protected:
  Browsing() {
    pair.serve<NSFileProviderExtensionProtocol>(NSFileProviderExtensionInterface(),
                                                std::make_shared<HostedExtension>(extension));
    const std::string replica = DroxaProcessHome().replica();
    control = std::make_shared<ControlService>(
        calls, std::make_shared<FollowedContainers>(calls), std::make_shared<OpenListings>(), replica,
        [] { return FPDStatus(); },
        std::make_shared<DesktopThumbnailFiller>(calls, cache, std::vector<ShownFolder>{{replica, replica}}));
  }
  static std::string picture() {
    const NSData file = PNGImage(24, 16, std::vector<std::uint8_t>(std::size_t{24} * 16 * 4, 77)).file();
    return {reinterpret_cast<const char *>(file.bytes().data()), file.length()};
  }
  // As a file manager does it: page after page to the end.
  std::vector<NSFileProviderItemFields> browse() const {
    using Enumerator = std::shared_ptr<NSFileProviderRemoteEnumerator>;
    const Once<Enumerator, NSError> opened("enumerator");
    control->enumeratorForContainer(NSFileProviderRootContainerItemIdentifier, opened.completion());
    std::vector<NSFileProviderItemFields> all;
    for (NSData page = NSFileProviderInitialPageSortedByName(); page;) {
      const Once<NSFileProviderItems, NSData, NSError> listed("page");
      opened.value<0>()->enumerateItems(page, listed.completion());
      EXPECT_EQ(listed.value<2>(), NSError());
      for (const auto &item : listed.value<0>()) all.push_back(item->fields());
      page = listed.value<1>();
    }
    return all;
  }
  // By the cache's own rules.
  bool hasThumbnail(const NSFileProviderItemFields &item) const {
    const std::string path = daemon.url("").path() + "/" + item.filename;
    const std::int64_t modified = item.contentModificationDate.nanosecondsSince1970() / 1'000'000'000;
    const FileContents file = ReadFile(cache.fileFor(path, "large"), 1 << 20);
    return file.code == 0 && PNGTextOf(file.bytes, "Thumb::URI") == DesktopThumbnails::URIForPath(path) &&
           PNGTextOf(file.bytes, "Thumb::MTime") == std::to_string(modified);
  }

  ConnectedPair pair;
  const DesktopThumbnails cache{home.path() + "/thumbnails"};
  const std::shared_ptr<ExtensionCalls> calls =
      std::make_shared<ExtensionCalls>(std::make_shared<ConnectedExtension>(pair.client));
  std::shared_ptr<ControlService> control;
};

TEST_F(Browsing, aThousandPicturesWithoutContentsDownloadsNone) {
  constexpr int kPictures = 1000;
  const std::string bytes = picture();
  for (int i = 0; i < kPictures; ++i) addDocument("p" + std::to_string(i) + ".png", 100'000, bytes);
  daemon.log().clear();
  std::vector<NSFileProviderItemFields> pictures = browse();
  std::erase_if(pictures, [](const auto &item) { return item.kind != NSFileProviderItemKind::document; });
  ASSERT_EQ(pictures.size(), std::size_t{kPictures});
  EXPECT_TRUE(eventually([&] {
    return std::all_of(pictures.begin(), pictures.end(),
                       [this](const auto &item) { return hasThumbnail(item); });
  }));
  EXPECT_EQ(daemon.log().count("startDownloadAtURL"), 0U);
  EXPECT_EQ(daemon.downloadsStarted(), 0U);
}

TEST_F(Browsing, aClientGetsEveryAnswerAcrossTheProcesses) {
  const std::string with = addDocument("a.png", 1000, picture());
  const std::string without = addDocument("b.png", 0, std::nullopt);
  const std::string folder = daemon.addFolder("f").asString();
  const Once<std::shared_ptr<FPDThumbnails>, NSError> opened("thumbnails");
  control->fetchThumbnailsForItemIdentifiers({with, without, folder, "bogus", with}, {64, 64},
                                             opened.completion());
  std::map<std::string, FPDThumbnail> answers;
  for (bool isLast = false; !isLast;) {
    const Once<std::vector<FPDThumbnail>, bool, NSError> next("next");
    opened.value<0>()->nextWithReply(next.completion());
    for (const FPDThumbnail &thumbnail : next.value<0>())
      EXPECT_TRUE(answers.emplace(thumbnail.identifier, thumbnail).second) << thumbnail.identifier;
    isLast = next.value<1>();
    EXPECT_EQ(next.value<2>(), NSError());
  }
  EXPECT_EQ(answers.size(), 4U);
  EXPECT_EQ(answers[with].imageData, NSData::dataWithString(picture()));
  EXPECT_FALSE(answers[without].imageData);
  EXPECT_EQ(answers[without].error, NSError());
  EXPECT_EQ(answers[folder].error, NSError());
  EXPECT_TRUE(answers["bogus"].error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem));
}

TEST_F(Browsing, theDocumentsFolderThatIsListedIsTheDefaultOne) {
  const std::string documents = daemon.addFolder("Documents").asString();
  const Once<std::shared_ptr<const NSFileProviderItem>, NSError> found("the folder");
  control->defaultContainerForBundleIdentifier(std::nullopt, found.completion());
  ASSERT_TRUE(found.value<0>()) << found.value<1>().description();
  EXPECT_EQ(found.value<0>()->itemIdentifier(), documents);
  EXPECT_EQ(count("creating directory"), 0U);
}

TEST_F(Browsing, anUnknownApplicationIsToldAcrossTheProcesses) {
  const Once<std::shared_ptr<const NSFileProviderItem>, NSError> found("the folder");
  control->defaultContainerForBundleIdentifier("org.example.Nobody", found.completion());
  EXPECT_FALSE(found.value<0>());
  EXPECT_TRUE(found.value<1>().is(QVTessalyErrorDomain, QVErrorInvalidArgument));
}

}  // namespace
}  // namespace droxa
