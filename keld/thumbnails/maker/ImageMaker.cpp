#include <cstring>
#include <glib-object.h>
#include <memory>
#include <string_view>
#include <vips/vips.h>

#include "keld/thumbnails/maker/Makers.h"

namespace droxa::keld {

namespace {

struct Unref {
  void operator()(void *object) const { g_object_unref(object); }
};
template <class T>
using Object = std::unique_ptr<T, Unref>;

constexpr const char *kPhotographLoaders[] = {"VipsForeignLoadJpeg",  "VipsForeignLoadPng",
                                              "VipsForeignLoadWebp",  "VipsForeignLoadTiff",
                                              "VipsForeignLoadNsgif", "VipsForeignLoadHeif"};
constexpr char kDrawingLoader[] = "VipsForeignLoadSvg";
constexpr char kStrict[] = "[fail_on=error]";  // half an image is none

[[noreturn]] void refuse() {
  std::string why = vips_error_buffer();
  vips_error_clear();
  while (!why.empty() && why.back() == '\n') why.pop_back();
  for (char &character : why)
    if (character == '\n') character = ';';
  throw MakerRefusal(why.empty() ? "it can't be read" : why);
}

Object<VipsImage> take(VipsImage *image) {
  if (!image) refuse();
  return Object<VipsImage>(image);
}

bool isOf(std::string_view loader, std::string_view family) {
  return loader.substr(0, family.size()) == family;
}

// The contents decide whether they are what the name says; they don't get to a reader that the name doesn't
// ask for.
void checkKind(VipsSource *source, MakerKind kind) {
  const char *loader = vips_foreign_find_load_source(source);
  if (!loader) refuse();
  bool isKind = kind == MakerKind::drawing && isOf(loader, kDrawingLoader);
  if (kind == MakerKind::image)
    for (const char *family : kPhotographLoaders) isKind = isKind || isOf(loader, family);
  if (!isKind) throw MakerRefusal("its contents aren't of the type that its name says");
}

struct Header {
  std::uint64_t width = 0, height = 0;
  bool hasColoursOfItsOwn = false;  // that have to be turned into those of screens
};

Header readHeader(VipsSource *source) {
  const auto header = take(vips_image_new_from_source(source, "", "access", VIPS_ACCESS_SEQUENTIAL, nullptr));
  return {static_cast<std::uint64_t>(vips_image_get_width(header.get())),
          static_cast<std::uint64_t>(vips_image_get_height(header.get())),
          vips_image_get_typeof(header.get(), VIPS_META_ICC_NAME) != 0 ||
              vips_image_get_interpretation(header.get()) == VIPS_INTERPRETATION_CMYK};
}

void checkSize(const Header &header, const MakerLimits &limits) {
  if (header.width * header.height <= limits.pixels) return;
  throw MakerRefusal("it has " + std::to_string(header.width) + " x " + std::to_string(header.height) +
                     " pixels, more than a thumbnail is made of (" +
                     std::to_string(limits.pixels / 1'000'000) + " megapixels)");
}

// Whatever depth and colours the image has, a thumbnail has eight bits of grey or sRGB.
Object<VipsImage> inEightBits(Object<VipsImage> image) {
  const VipsInterpretation colours = vips_image_get_interpretation(image.get());
  const bool isPlain = colours == VIPS_INTERPRETATION_sRGB || colours == VIPS_INTERPRETATION_B_W;
  if (isPlain && vips_image_get_format(image.get()) == VIPS_FORMAT_UCHAR) return image;
  VipsImage *converted = nullptr;
  if (vips_colourspace(image.get(), &converted, VIPS_INTERPRETATION_sRGB, nullptr) != 0) refuse();
  image = take(converted);
  converted = nullptr;
  if (vips_cast(image.get(), &converted, VIPS_FORMAT_UCHAR, nullptr) != 0) refuse();
  return take(converted);
}

std::string asPNG(VipsImage *image) {
  void *bytes = nullptr;
  std::size_t size = 0;
  // The fastest that is still small: documents are many.
  if (vips_pngsave_buffer(image, &bytes, &size, "strip", TRUE, "compression", 3, nullptr) != 0) refuse();
  std::string png(static_cast<const char *>(bytes), size);
  g_free(bytes);
  return png;
}

}  // namespace

bool PrepareImageMaker() {
  if (VIPS_INIT("droxa-thumbnailer") != 0) return false;
  vips_concurrency_set(1);  // documents are made beside one another
  vips_cache_set_max(0);
  vips_operation_block_set("VipsForeignLoad", TRUE);
  for (const char *loader : kPhotographLoaders) vips_operation_block_set(loader, FALSE);
  vips_operation_block_set(kDrawingLoader, FALSE);
  return true;
}

std::string MakeImageThumbnail(const MakerJob &job) {
  const Object<VipsSource> source(vips_source_new_from_descriptor(job.contents));
  if (!source) refuse();
  checkKind(source.get(), job.kind);
  const Header header = readHeader(source.get());
  checkSize(header, job.limits);
  VipsImage *small = nullptr;
  const int side = static_cast<int>(kThumbnailSide);
  // A profile that isn't needed would shift the colours.
  const int problem =
      header.hasColoursOfItsOwn
          ? vips_thumbnail_source(source.get(), &small, side, "height", side, "size", VIPS_SIZE_DOWN,
                                  "option_string", kStrict, "export_profile", "srgb", nullptr)
          : vips_thumbnail_source(source.get(), &small, side, "height", side, "size", VIPS_SIZE_DOWN,
                                  "option_string", kStrict, nullptr);
  if (problem != 0) refuse();
  return asPNG(inEightBits(take(small)).get());
}

}  // namespace droxa::keld
