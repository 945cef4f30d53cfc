#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

#include "platform/foundation/ReadFile.h"
#include "platform/imaging/DesktopThumbnails.h"
#include "tests/system/Drive.h"

namespace droxa::testing {
namespace {

namespace fs = std::filesystem;

// Pictures that one device has, and what another one shows of them.
class Thumbnails : public ::testing::Test {
 protected:
  static constexpr std::uint32_t kWidth = 1200, kHeight = 600;

  Thumbnails() {
    std::vector<std::uint8_t> pixels(std::size_t{kWidth} * kHeight * 4);
    std::uint32_t state = 1;
    for (std::uint8_t &part : pixels)
      part = static_cast<std::uint8_t>((state = state * 1664525 + 1013904223) >> 24);
    const NSData file = PNGImage(kWidth, kHeight, std::move(pixels)).file();
    picture.assign(reinterpret_cast<const char *>(file.bytes().data()), file.length());
  }
  void put(const std::string &name, const std::string &contents) const {
    std::ofstream(anna.documents() + "/" + name, std::ios::binary) << contents;
  }
  // Ben's device, once it lists the names and the cloud has the thumbnails.
  void startBen(const std::vector<std::string> &names) {
    ben.start({"--cloud", cloud, "--device", "ben"});
    for (const std::string &name : names) ASSERT_TRUE(ben.waitForName(name)) << name;
  }
  bool hasThumbnail(const std::string &name) {
    const Result result = ben.droxa({"thumbnail", name, "--size", "64", "--out", ben.home() + "/tried"});
    return result.output.find("1 of 1 document has") != std::string::npos;
  }
  std::string lookUp(const std::string &name) const {
    const std::string path = ben.documents() + "/" + name;
    const DesktopThumbnails cache(ben.cache() + "/thumbnails");
    return PNGTextOf(ReadFile(cache.fileFor(path, "large"), 1 << 24).bytes, "Thumb::URI").value_or("none");
  }

  Drive anna, ben;
  const std::string cloud = anna.home() + "/cloud";
  std::string picture;
};

TEST_F(Thumbnails, anotherDevicesPicturesAreShownWithoutBeingFetched) {
  anna.startKeld({"--cloud", cloud, "--device", "anna"});
  ASSERT_TRUE(eventually([&] { return fs::exists(anna.home() + "/run/keld.sock"); }, 60s));
  put("a.png", picture);
  put("b.txt", "no picture");
  fs::create_directories(ben.home() + "/config");
  std::ofstream(ben.home() + "/config/cloud.json") << nlohmann::json{{"cloud", cloud}, {"device", "ben"}};
  startBen({"a.png", "b.txt"});
  ASSERT_TRUE(eventually([&] { return hasThumbnail("a.png"); }, 60s));

  const std::string out = ben.home() + "/out";
  const Result written = ben.droxa({"thumbnail", "/", "--size", "200", "--out", out});
  EXPECT_EQ(written.status, 0) << written.errors;
  const auto small =
      PNGImage::read(NSData::dataWithString(ReadFile(out + "/a.png.png", 1 << 24).bytes), nullptr);
  ASSERT_TRUE(small) << written.output;
  EXPECT_EQ(small->width(), 200U);
  EXPECT_EQ(small->height(), 100U);
  EXPECT_NE(written.output.find("b.txt: no thumbnail"), std::string::npos) << written.output;

  EXPECT_EQ(ben.droxa({"thumbnail", "/", "--cache"}).status, 0);
  EXPECT_EQ(lookUp("a.png"), DesktopThumbnails::URIForPath(ben.documents() + "/a.png"));
  EXPECT_EQ(lookUp("b.txt"), "none");
  EXPECT_EQ(ben.contents("a.png")["contents"], "dataless");
}

}  // namespace
}  // namespace droxa::testing
