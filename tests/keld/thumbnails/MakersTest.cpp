// What is made of documents, good ones and hostile ones, by the real makers.

#include "keld/thumbnails/PngCheck.h"
#include "keld/thumbnails/maker/MakerProtocol.h"
#include "tests/keld/thumbnails/ThumbnailFiles.h"

namespace droxa::keld {
namespace {

constexpr std::size_t kColourType = 25;  // in a PNG: 2 is RGB, 6 RGB with alpha

class Makers : public ThumbnailFiles {
 protected:
  static ThumbnailerOptions options() {
    ThumbnailerOptions made;
    made.program = THUMBNAILER;
    made.limits.wallMilliseconds = 60'000;  // the machine may be busy
    return made;
  }
  void refuses(const std::string &contents, const std::string &type, const std::string &why = "") {
    const ThumbnailResult result = make(thumbnailer, contents, type);
    EXPECT_EQ(result.outcome, Outcome::refused);
    EXPECT_NE(result.why.find(why), std::string::npos) << result.why;
    EXPECT_FALSE(result.why.empty());
    // The next document gets its own.
    const ThumbnailResult next = make(thumbnailer, draw("plain", 40, 30, "good.png"), "image/png");
    EXPECT_EQ(next.outcome, Outcome::made) << next.why;
  }
  void has(const ThumbnailResult &result, unsigned width, unsigned height) {
    ASSERT_EQ(result.outcome, Outcome::made) << result.why;
    EXPECT_EQ(result.width, width);
    EXPECT_EQ(result.height, height);
    const auto size = CheckPng(bytesOf(result));
    ASSERT_TRUE(size);
    EXPECT_EQ(size->width, width);
    EXPECT_EQ(size->height, height);
  }

  SandboxedThumbnailer thumbnailer{options()};
};

TEST_F(Makers, aPhotographIsTurnedUprightAndMadeSmall) {
  const std::string photograph = draw("photograph", 4000, 2000, "photograph.jpg");
  ASSERT_NE(photograph.find("A camera"), std::string::npos);
  const ThumbnailResult result = make(thumbnailer, photograph, "image/jpeg");
  has(result, 512, 1024);
  EXPECT_EQ(bytesOf(result).find("A camera"), std::string::npos);
}

TEST_F(Makers, aSmallPictureIsNotEnlarged) {
  has(make(thumbnailer, draw("plain", 64, 48, "small.png"), "image/png"), 64, 48);
}

TEST_F(Makers, whatIsTransparentStaysSo) {
  const ThumbnailResult result = make(thumbnailer, draw("clear", 2048, 512, "clear.png"), "image/png");
  has(result, 1024, 256);
  EXPECT_EQ(bytesOf(result)[kColourType], 6);
  EXPECT_NE(pixel("made.png", 512, 100).find(" "), std::string::npos);
}

TEST_F(Makers, coloursForPrintAndDeepOnesBecomeScreenColours) {
  const ThumbnailResult print = make(thumbnailer, draw("cmyk", 1500, 1000, "cmyk.jpg"), "image/jpeg");
  has(print, 1024, 683);
  EXPECT_EQ(bytesOf(print)[kColourType], 2);
  const ThumbnailResult deep = make(thumbnailer, draw("deep", 1500, 1000, "deep.png"), "image/png");
  has(deep, 1024, 683);
  EXPECT_EQ(bytesOf(deep)[kColourType - 1], 8) << "bits";
}

TEST_F(Makers, aColourProfileIsAppliedAndLeftOut) {
  const std::string profiled = draw("profiled", 300, 300, "profiled.png");
  ASSERT_NE(profiled.find("iCCP"), std::string::npos);
  const ThumbnailResult result = make(thumbnailer, profiled, "image/png");
  has(result, 300, 300);
  draw("plain", 300, 300, "plain.png");
  EXPECT_EQ(pixel("made.png", 150, 10), pixel("plain.png", 150, 10));
}

TEST_F(Makers, theFirstPageOfAPdfIsDrawnOnWhitePaper) {
  const std::string pdf = PdfOf("595 842", "1 0 0 rg 0 0 595 421 re f");
  has(make(thumbnailer, pdf, "application/pdf"), 724, 1024);
  EXPECT_EQ(pixel("made.png", 362, 100), "255 255 255\n");
  EXPECT_EQ(pixel("made.png", 362, 900), "255 0 0\n");
}

TEST_F(Makers, aDrawingIsMadeOfItsLines) {
  const std::string svg =
      "<svg xmlns='http://www.w3.org/2000/svg' width='2000' height='1000'>"
      "<rect width='2000' height='1000' fill='blue'/></svg>";
  has(make(thumbnailer, svg, "image/svg+xml"), 1024, 512);
  EXPECT_EQ(pixel("made.png", 100, 100), "0 0 255 255\n");
}

TEST_F(Makers, aBombIsSeenByItsHeader) {
  refuses(PngThatClaims(60'000, 60'000), "image/png", "60000 x 60000");
}

TEST_F(Makers, aHeaderThatLiesCostsTheThumbnail) {
  refuses(PngThatClaims(2000, 2000), "image/png");
}

TEST_F(Makers, aTruncatedPhotographHasNone) {
  const std::string whole = draw("photograph", 3000, 2000, "photograph.jpg");
  for (const std::size_t length : {whole.size() / 3, whole.size() - 200, std::size_t{20}, std::size_t{0}}) {
    SCOPED_TRACE(length);
    refuses(whole.substr(0, length), "image/jpeg");
  }
}

TEST_F(Makers, contentsThatAreNotWhatTheNameSaysHaveNone) {
  refuses(PdfOf("100 100", ""), "image/jpeg");
  refuses("<svg xmlns='http://www.w3.org/2000/svg' width='9' height='9'/>", "image/png",
          "aren't of the type");
  refuses(draw("plain", 10, 10, "plain.png"), "application/pdf");
  refuses("just text", "image/webp");
}

TEST_F(Makers, aBrokenPdfHasNone) {
  refuses("%PDF-1.4\n1 0 obj\n<<", "application/pdf");
  refuses(PdfOf("595 842", "").substr(0, 60), "application/pdf");
}

TEST_F(Makers, aPdfWithoutEndIsEnded) {
  ThumbnailerOptions brief = options();
  brief.limits.cpuSeconds = 1;
  SandboxedThumbnailer patient(brief);
  std::string contents;
  for (int line = 0; line < 400'000; ++line) contents += "0 0 m 595 842 l 300 1 200 700 9 9 c S f\n";
  const ThumbnailResult result = make(patient, PdfOf("595 842", contents), "application/pdf");
  EXPECT_EQ(result.outcome, Outcome::refused);
  EXPECT_NE(result.why.find("1 s of the processor"), std::string::npos) << result.why;
}

TEST_F(Makers, memoryIsLimited) {
  ThumbnailerOptions narrow = options();
  narrow.limits.memoryBytes = 1 << 20;
  SandboxedThumbnailer starved(narrow);
  EXPECT_EQ(make(starved, draw("plain", 2000, 2000, "plain.png"), "image/png").outcome, Outcome::refused);
}

TEST_F(Makers, withoutTheProgramNothingIsRefusedForGood) {
  ThumbnailerOptions missing;
  missing.program = at("no such program");
  SandboxedThumbnailer thumbnailerWithout(missing);
  const ThumbnailResult result = make(thumbnailerWithout, draw("plain", 9, 9, "plain.png"), "image/png");
  EXPECT_EQ(result.outcome, Outcome::unavailable);
  EXPECT_NE(result.why.find("no such program"), std::string::npos) << result.why;
}

}  // namespace
}  // namespace droxa::keld
