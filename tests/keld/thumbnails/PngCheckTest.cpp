#include "keld/thumbnails/PngCheck.h"
#include "tests/keld/thumbnails/ThumbnailFiles.h"

namespace droxa::keld {
namespace {

TEST(PngCheck, tellsTheSizeOfAWholePng) {
  const auto size = CheckPng(PngThatClaims(30, 20));
  ASSERT_TRUE(size);
  EXPECT_EQ(size->width, 30U);
  EXPECT_EQ(size->height, 20U);
}

TEST(PngCheck, takesNoPartAndNothingMore) {
  const std::string png = PngThatClaims(30, 20);
  for (std::size_t length = 0; length < png.size(); ++length)
    EXPECT_FALSE(CheckPng(std::string_view(png).substr(0, length))) << length;
  EXPECT_FALSE(CheckPng(png + "x"));
  EXPECT_FALSE(CheckPng("x" + png));
}

TEST(PngCheck, takesNoTextAndNoSecondHeader) {
  const std::string png = PngThatClaims(30, 20);
  const std::size_t end = png.size() - 12;
  EXPECT_FALSE(CheckPng(png.substr(0, end) + PngChunk("tEXt", "who") + png.substr(end)));
  EXPECT_FALSE(CheckPng(png.substr(0, end) + png.substr(8, 25) + png.substr(end)));
  EXPECT_FALSE(CheckPng(png.substr(0, 8) + PngChunk("IEND", "")));
}

TEST(PngCheck, takesNoPictureWithoutASize) {
  EXPECT_FALSE(CheckPng(PngThatClaims(0, 20)));
  EXPECT_FALSE(CheckPng(PngThatClaims(20, 0)));
}

}  // namespace
}  // namespace droxa::keld
