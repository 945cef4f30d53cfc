// From a document that is written to the thumbnail on its record, with the makers that keld itself would use.

#include <algorithm>

#include "keld/thumbnails/PngCheck.h"
#include "tests/keld/sync/FaultyDrive.h"
#include "tests/keld/thumbnails/ThumbnailFiles.h"
#include "tests/support/LogLines.h"

namespace droxa::keld {
namespace {

class WholeWay : public ThumbnailFiles {
 protected:
  WholeWay() : hand(folder.path() + "/cloud", "hand"), device(folder.path() + "/cloud", "anna") {}

  void send(const std::string &path, const std::string &contents) {
    device.keld.write(path, contents);
    const NSError error = device.waitForUploads(path);
    ASSERT_FALSE(error) << error.description();
    ASSERT_EQ(hand.contents(path), contents);
  }
  std::optional<PngSize> thumbnailOf(const std::string &path) {
    const auto document = hand.at(path);
    if (!document) return std::nullopt;
    const CKFetchReply reply = hand.cloud->fetchRecords({RecordID(document->record)}, std::nullopt, {});
    const CKAsset *asset = reply.results[0].record.get<CKAsset>(kQVRecordKeyThumbnail1024x1024);
    if (!asset) return std::nullopt;
    std::string png;
    EXPECT_FALSE(hand.cloud->readAsset(asset->reference(), 0,
                                       [&](std::span<const std::uint8_t> more) {
                                         png.append(more.begin(), more.end());
                                         return NSError();
                                       },
                                       nullptr, {}));
    return CheckPng(png);
  }
  void getsSoon(const std::string &path, unsigned width, unsigned height) {
    ASSERT_TRUE(eventually([&] { return thumbnailOf(path).has_value(); })) << path;
    EXPECT_EQ(thumbnailOf(path)->width, width);
    EXPECT_EQ(thumbnailOf(path)->height, height);
  }

  static std::ptrdiff_t linesWith(const OSLogCapture &log, const std::string &text) {
    const auto lines = logLines(log);
    return std::count_if(lines.begin(), lines.end(),
                         [&](const std::string &line) { return line.find(text) != std::string::npos; });
  }

  CloudHand hand;
  Device device;
};

TEST_F(WholeWay, documentsGetThumbnailsOfTheirShape) {
  send("photograph.jpg", draw("photograph", 3000, 1500, "photograph.jpg"));
  send("letter.pdf", PdfOf("595 842", "0 0 100 100 re f"));
  send("icon.png", draw("clear", 32, 16, "icon.png"));
  getsSoon("photograph.jpg", 512, 1024);
  getsSoon("letter.pdf", 724, 1024);
  getsSoon("icon.png", 32, 16);
}

TEST_F(WholeWay, hostileDocumentsGoUpWithoutOne) {
  const OSLogCapture log;
  send("bomb.png", PngThatClaims(60'000, 60'000));
  send("broken.pdf", "%PDF-1.4\n1 0 obj\n<<");
  send("text.jpg", "just text");
  send("icon.png", draw("clear", 32, 16, "icon.png"));
  getsSoon("icon.png", 32, 16);
  EXPECT_TRUE(eventually([&] { return device.keld.daemon().sync().store().countThumbnails() == 0; }));
  for (const char *path : {"bomb.png", "broken.pdf", "text.jpg"}) {
    EXPECT_FALSE(thumbnailOf(path)) << path;
    EXPECT_EQ(linesWith(log, std::string(path) + " has no thumbnail: "), 1) << path;
  }
}

}  // namespace
}  // namespace droxa::keld
