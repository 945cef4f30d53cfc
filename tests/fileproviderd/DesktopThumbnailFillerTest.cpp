#include <atomic>
#include <filesystem>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include "fileproviderd/DesktopThumbnailFiller.h"
#include "platform/foundation/ReadFile.h"
#include "tests/fileproviderd/ScriptedExtension.h"
#include "tests/platform/TemporaryFolder.h"
#include "tests/support/Eventually.h"
#include "tests/support/Once.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;

NSData picture(std::uint32_t width, std::uint32_t height) {
  return PNGImage(width, height, std::vector<std::uint8_t>(std::size_t{width} * height * 4, 200)).file();
}

// All that an extension has, at once, whatever is asked for.
class ReadyThumbnails final : public FPDThumbnails {
 public:
  void nextWithReply(FPDThumbnailsReply reply) override {
    reply({{"d1", picture(1024, 512), std::nullopt, {}},
           {"d2", picture(10, 10), std::nullopt, {}},
           {"without", {}, std::nullopt, {}},
           {"no picture", NSData::dataWithString("no picture at all"), std::nullopt, {}}},
          true, {});
  }
  void getProgress(FPDProgressCompletion completion) override { completion(0, -1); }
  void cancel() override {}
};

class DesktopThumbnailFillerTest : public ::testing::Test {
 protected:
  DesktopThumbnailFillerTest() {
    extension->paths["i1"] = "/replica/Pictures";
    extension->thumbnails = std::make_shared<ReadyThumbnails>();
  }
  static NSFileProviderItemFields document(const std::string &identifier, const std::string &name) {
    NSFileProviderItemFields fields;
    fields.itemIdentifier = identifier;
    fields.parentItemIdentifier = "i1";
    fields.filename = name;
    fields.documentSize = 5000;
    fields.contentModificationDate = NSDate::dateWithNanosecondsSince1970(1'700'000'000'900'000'000);
    fields.isDownloaded = false;
    return fields;
  }
  void list(const std::vector<NSFileProviderItemFields> &fields) const {
    NSFileProviderItems items;
    for (const auto &one : fields) items.push_back(std::make_shared<NSFileProviderPlainItem>(one));
    filler->itemsWereListed("i1", items);
  }
  // As a program of the desktop looks a thumbnail up, by the cache's own rules.
  std::string lookUp(const std::string &path, const std::string &size) const {
    const FileContents file = ReadFile(cache.fileFor(path, size), 1 << 24);
    if (file.code != 0) return "none";
    if (PNGTextOf(file.bytes, "Thumb::URI") != DesktopThumbnails::URIForPath(path)) return "of another";
    return PNGTextOf(file.bytes, "Thumb::MTime") == "1700000000" ? "valid" : "out of date";
  }
  std::size_t requests() const {
    std::size_t count = 0;
    while (extension->asked.size() > 0)
      if (extension->asked.take().starts_with("thumbnails")) ++count;
    return count;
  }
  bool isFilled(const std::string &path) const {
    return eventually([&] { return lookUp(path, "xx-large") == "valid"; });
  }

  const TemporaryFolder folder;
  const DesktopThumbnails cache{folder.path() + "/thumbnails"};
  const std::shared_ptr<ScriptedExtension> extension = std::make_shared<ScriptedExtension>();
  const std::shared_ptr<ScriptedConnecting> connecting = std::make_shared<ScriptedConnecting>(extension);
  const std::shared_ptr<DesktopThumbnailFiller> filler = std::make_shared<DesktopThumbnailFiller>(
      std::make_shared<ExtensionCalls>(connecting), cache,
      std::vector<ShownFolder>{{"/replica", "/replica"}, {"/replica", "/mnt/drive"}});
};

TEST_F(DesktopThumbnailFillerTest, whatIsListedHasAThumbnailInEverySizeWhereverItIsSeen) {
  list({document("d1", "a b.jpg")});
  for (const std::string path : {"/replica/Pictures/a b.jpg", "/mnt/drive/Pictures/a b.jpg"}) {
    ASSERT_TRUE(isFilled(path)) << path;
    for (const char *size : {"normal", "large", "x-large"}) EXPECT_EQ(lookUp(path, size), "valid") << size;
  }
  const FileContents file = ReadFile(cache.fileFor("/replica/Pictures/a b.jpg", "large"), 1 << 24);
  EXPECT_EQ(PNGTextOf(file.bytes, "Thumb::Size"), "5000");
  const auto image = PNGImage::read(NSData::dataWithString(file.bytes), nullptr);
  ASSERT_TRUE(image);
  EXPECT_EQ(image->width(), 256U);
  EXPECT_EQ(image->height(), 128U);
}

// A mount comes and goes while the host runs.
TEST_F(DesktopThumbnailFillerTest, whatIsMountedIsAskedForEachTime) {
  const auto mounted = std::make_shared<std::atomic<bool>>(false);
  filler->setMountedFolders([mounted] {
    return *mounted ? std::vector<ShownFolder>{{"/replica/Pictures", "/home/anna/Drive"}}
                    : std::vector<ShownFolder>();
  });
  list({document("d1", "a.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/a.jpg"));
  EXPECT_EQ(lookUp("/home/anna/Drive/a.jpg", "normal"), "none");
  *mounted = true;
  list({document("d1", "a.jpg")});
  EXPECT_TRUE(isFilled("/home/anna/Drive/a.jpg"));
}

TEST_F(DesktopThumbnailFillerTest, aProgramThatOpensEveryFolderIsNotFollowedEverywhere) {
  for (int i = 0; i < 1000; ++i) filler->folderWasOpened("/replica/folder " + std::to_string(i));
  ASSERT_TRUE(eventually([&] { return extension->asked.size() > 0; }));
  list({document("d1", "a.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/a.jpg")) << "what came after is done after";
  std::size_t folders = 0;
  while (extension->asked.size() > 0)
    if (extension->asked.take().starts_with("identifier")) ++folders;
  EXPECT_GE(folders, 1U);
  EXPECT_LE(folders, 100U);
}

TEST_F(DesktopThumbnailFillerTest, theFilesAreForTheUserAlone) {
  list({document("d1", "a.jpg")});
  ASSERT_TRUE(isFilled("/replica/Pictures/a.jpg") && isFilled("/mnt/drive/Pictures/a.jpg"));
  struct stat status {};
  ASSERT_EQ(stat(cache.fileFor("/replica/Pictures/a.jpg", "normal").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0600U);
  ASSERT_EQ(stat((folder.path() + "/thumbnails/normal").c_str(), &status), 0);
  EXPECT_EQ(status.st_mode & 07777, 0700U);
  std::size_t files = 0;
  for (const auto &entry : fs::recursive_directory_iterator(folder.path())) files += entry.is_regular_file();
  EXPECT_EQ(files, 8U) << "nothing unfinished is left";
}

TEST_F(DesktopThumbnailFillerTest, noDocumentIsFetchedForIt) {
  list({document("d1", "a.jpg")});
  ASSERT_TRUE(isFilled("/replica/Pictures/a.jpg"));
  while (extension->asked.size() > 0) EXPECT_FALSE(extension->asked.take().starts_with("start"));
}

TEST_F(DesktopThumbnailFillerTest, aValidThumbnailIsLeftAloneAndOneOfAnotherStateIsReplaced) {
  list({document("d1", "a.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/a.jpg"));
  EXPECT_EQ(requests(), 1U);
  list({document("d1", "a.jpg")});
  auto changed = document("d2", "b.jpg");
  list({changed});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/b.jpg"));
  EXPECT_EQ(requests(), 1U) << "the second listing of the first one asked for nothing";
  changed.contentModificationDate = NSDate::dateWithNanosecondsSince1970(1'800'000'000'000'000'000);
  list({changed});
  EXPECT_TRUE(eventually([&] { return lookUp("/mnt/drive/Pictures/b.jpg", "xx-large") == "out of date"; }));
}

TEST_F(DesktopThumbnailFillerTest, whatIsHereAndWhatIsNoDocumentIsNotAskedFor) {
  auto here = document("d1", "a.jpg");
  here.isDownloaded = true;
  auto below = document("i2", "folder");
  below.kind = NSFileProviderItemKind::folder;
  auto empty = document("d3", "empty");
  empty.documentSize = 0;
  list({here, below, empty});
  list({document("d1", "b.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/b.jpg"));
  EXPECT_EQ(requests(), 1U);
}

TEST_F(DesktopThumbnailFillerTest, aDocumentWithoutAThumbnailIsAskedForOnce) {
  list({document("without", "a.jpg")});
  list({document("without", "a.jpg")});
  list({document("d2", "b.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/b.jpg"));
  EXPECT_EQ(requests(), 2U);
  EXPECT_EQ(lookUp("/replica/Pictures/a.jpg", "normal"), "none");
}

TEST_F(DesktopThumbnailFillerTest, bytesThatAreNoPictureAreNotKept) {
  list({document("no picture", "a.jpg")});
  list({document("d2", "b.jpg")});
  ASSERT_TRUE(isFilled("/mnt/drive/Pictures/b.jpg"));
  EXPECT_EQ(lookUp("/replica/Pictures/a.jpg", "normal"), "none");
}

TEST_F(DesktopThumbnailFillerTest, aWholeContainerIsFilledWhenItIsAskedFor) {
  const Once<NSError> done("done");
  filler->fillContainer("i1", done.completion());
  const auto enumerator = extension->enumerators.take();
  ASSERT_TRUE(enumerator);
  const EnumeratorCall call = enumerator->calls.take();
  ASSERT_TRUE(call.page);
  call.page({std::make_shared<NSFileProviderPlainItem>(document("d1", "a.jpg"))}, NSData(), NSError());
  EXPECT_EQ(done.value<0>(), NSError());
  EXPECT_EQ(lookUp("/replica/Pictures/a.jpg", "xx-large"), "valid");
}

}  // namespace
}  // namespace droxa::testing
