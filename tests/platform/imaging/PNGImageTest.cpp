#include <gtest/gtest.h>

#include "platform/imaging/PNGImage.h"

namespace droxa {
namespace {

// Red where x is even, transparent where it is odd.
PNGImage striped(std::uint32_t width, std::uint32_t height) {
  std::vector<std::uint8_t> pixels;
  for (std::uint32_t i = 0; i < width * height; ++i) {
    const bool isOdd = i % width % 2 == 1;
    const std::uint8_t values[] = {static_cast<std::uint8_t>(isOdd ? 0 : 255), 0, 0,
                                   static_cast<std::uint8_t>(isOdd ? 0 : 255)};
    pixels.insert(pixels.end(), std::begin(values), std::end(values));
  }
  return {width, height, std::move(pixels)};
}
std::string textOf(const NSData &data) {
  return {reinterpret_cast<const char *>(data.bytes().data()), data.length()};
}

TEST(PNGImage, whatIsWrittenIsRead) {
  const PNGImage image = striped(7, 5);
  const auto read = PNGImage::read(image.file(), nullptr);
  ASSERT_TRUE(read);
  EXPECT_EQ(read->width(), 7U);
  EXPECT_EQ(read->height(), 5U);
  EXPECT_EQ(read->pixels(), image.pixels());
}

TEST(PNGImage, textsAreKept) {
  const std::string file =
      textOf(striped(2, 2).file({{"Thumb::URI", "file:///a%20b"}, {"Thumb::Size", "7"}}));
  EXPECT_EQ(PNGTextOf(file, "Thumb::URI"), "file:///a%20b");
  EXPECT_EQ(PNGTextOf(file, "Thumb::Size"), "7");
  EXPECT_EQ(PNGTextOf(file, "Thumb"), std::nullopt);
  EXPECT_EQ(PNGTextOf(file.substr(0, 40), "Thumb::Size"), std::nullopt);
  EXPECT_EQ(PNGTextOf("", "Thumb::Size"), std::nullopt);
}

TEST(PNGImage, scalingKeepsTheProportionsAndMixesWhatIsSeen) {
  const PNGImage half = striped(8, 4).scaledToFit(4);
  EXPECT_EQ(half.width(), 4U);
  EXPECT_EQ(half.height(), 2U);
  // Half opaque, and as red as the half that is seen.
  EXPECT_EQ(half.pixels()[0], 255);
  EXPECT_EQ(half.pixels()[3], 128);
}

TEST(PNGImage, nothingIsScaledUpOrAway) {
  EXPECT_EQ(striped(8, 4).scaledToFit(100).width(), 8U);
  const PNGImage line = striped(1000, 1).scaledToFit(10);
  EXPECT_EQ(line.width(), 10U);
  EXPECT_EQ(line.height(), 1U);
  EXPECT_EQ(striped(3, 300).scaledToFit(128).height(), 128U);
}

TEST(PNGImage, aLargePictureIsRefusedByItsHeader) {
  NSError error;
  EXPECT_FALSE(PNGImage::read(striped(PNGImage::kLongestSide + 1, 1).file(), &error));
  EXPECT_NE(error.localizedDescription().find("2049 x 1"), std::string::npos);
}

TEST(PNGImage, whatIsNoPictureIsRefusedWithAReason) {
  const std::string whole = textOf(striped(30, 30).file());
  std::string damaged = whole;
  for (std::size_t i = 50; i < 80 && i < damaged.size(); ++i) damaged[i] = static_cast<char>(~damaged[i]);
  for (const std::string &bytes : {std::string(), std::string("GIF89a"), whole.substr(0, 60), damaged}) {
    NSError error;
    EXPECT_FALSE(PNGImage::read(NSData::dataWithString(bytes), &error)) << bytes.size();
    EXPECT_TRUE(error);
  }
  EXPECT_FALSE(PNGImage::read(NSData(), nullptr));
}

}  // namespace
}  // namespace droxa
