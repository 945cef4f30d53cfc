// Draws a picture for a test: picture_maker FORM WIDTH HEIGHT FILE. Forms: photograph (a JPEG that a camera
// turned by a quarter says so about itself), cmyk (a JPEG), deep (a PNG of 16 bits), clear (a PNG, half
// transparent), profiled (a PNG in Display P3), plain (a PNG). Or, with `pixel FILE X Y`, prints the bands of
// one pixel of it.

#include <cstdlib>
#include <cstring>
#include <iostream>
#include <string>
#include <vector>
#include <vips/vips.h>

namespace {

[[noreturn]] void fail() {
  std::cerr << vips_error_buffer();
  std::exit(1);
}

VipsImage *ramp(int width, int height, int bands) {
  VipsImage *image = nullptr, *single = nullptr;
  if (vips_grey(&single, width, height, "uchar", TRUE, nullptr) != 0) fail();
  std::vector<VipsImage *> same(static_cast<std::size_t>(bands), single);
  if (vips_bandjoin(same.data(), &image, bands, nullptr) != 0) fail();
  return image;
}

VipsImage *called(VipsImage *image, VipsInterpretation interpretation) {
  VipsImage *named = nullptr;
  if (vips_copy(image, &named, "interpretation", interpretation, nullptr) != 0) fail();
  return named;
}

int printPixel(char **argv) {
  VipsImage *image = vips_image_new_from_file(argv[2], nullptr);
  double *bands = nullptr;
  int count = 0;
  if (!image || vips_getpoint(image, &bands, &count, std::atoi(argv[3]), std::atoi(argv[4]), nullptr) != 0)
    fail();
  for (int band = 0; band < count; ++band) std::cout << bands[band] << (band + 1 < count ? " " : "\n");
  return 0;
}

int draw(const std::string &form, int width, int height, const char *file) {
  int problem = 0;
  if (form == "photograph") {
    VipsImage *image = called(ramp(width, height, 3), VIPS_INTERPRETATION_sRGB);
    vips_image_set_int(image, VIPS_META_ORIENTATION, 6);
    vips_image_set_string(image, "exif-ifd0-Make", "A camera (A camera, ASCII, 9 components, 9 bytes)");
    problem = vips_jpegsave(image, file, nullptr);
  } else if (form == "cmyk") {
    problem = vips_jpegsave(called(ramp(width, height, 4), VIPS_INTERPRETATION_CMYK), file, nullptr);
  } else if (form == "deep") {
    VipsImage *deep = nullptr;
    if (vips_cast(ramp(width, height, 3), &deep, VIPS_FORMAT_USHORT, "shift", TRUE, nullptr) != 0) fail();
    problem = vips_pngsave(called(deep, VIPS_INTERPRETATION_RGB16), file, nullptr);
  } else if (form == "clear") {
    problem = vips_pngsave(called(ramp(width, height, 4), VIPS_INTERPRETATION_sRGB), file, nullptr);
  } else if (form == "profiled") {
    VipsImage *image = called(ramp(width, height, 3), VIPS_INTERPRETATION_sRGB);
    VipsImage *profiled = nullptr;
    if (vips_icc_transform(image, &profiled, "p3", "input_profile", "srgb", nullptr) != 0) fail();
    problem = vips_pngsave(profiled, file, nullptr);
  } else {
    problem = vips_pngsave(called(ramp(width, height, 3), VIPS_INTERPRETATION_sRGB), file, nullptr);
  }
  if (problem != 0) fail();
  return 0;
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 5 || VIPS_INIT(argv[0]) != 0) return 2;
  if (std::strcmp(argv[1], "pixel") == 0) return printPixel(argv);
  return draw(argv[1], std::atoi(argv[2]), std::atoi(argv[3]), argv[4]);
}
