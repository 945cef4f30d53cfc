// Writing pictures.

#include <csetjmp>
#include <png.h>

#include "platform/imaging/PNGImage.h"

namespace droxa {
namespace {

void Append(png_structp writer, png_bytep bytes, std::size_t length) {
  auto *file = static_cast<std::vector<std::uint8_t> *>(png_get_io_ptr(writer));
  file->insert(file->end(), bytes, bytes + length);
}

void Flush(png_structp /*writer*/) {}

// The library jumps back here when it fails, so nothing with a destructor is made in between. Small pictures,
// and many: the fastest compression that is still small.
bool Write(png_structp writer, png_infop info, const PNGImage &image, png_textp texts, int count) {
  constexpr int kCompression = 3;
  constexpr int kBits = 8;
  if (setjmp(png_jmpbuf(writer)) != 0) return false;
  png_set_compression_level(writer, kCompression);
  png_set_IHDR(writer, info, image.width(), image.height(), kBits, PNG_COLOR_TYPE_RGBA, PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (count > 0) png_set_text(writer, info, texts, count);
  png_write_info(writer, info);
  const std::uint8_t *row = image.pixels().data();
  for (std::uint32_t y = 0; y < image.height(); ++y, row += std::size_t{image.width()} * 4)
    png_write_row(writer, row);
  png_write_end(writer, nullptr);
  return true;
}

}  // namespace

NSData PNGImage::file(const PNGTexts &texts) const {
  std::vector<png_text> list(texts.size());
  PNGTexts kept = texts;  // the library takes them as if it changed them
  for (std::size_t i = 0; i < list.size(); ++i) {
    list[i] = {};
    list[i].compression = PNG_TEXT_COMPRESSION_NONE;
    list[i].key = kept[i].first.data();
    list[i].text = kept[i].second.data();
    list[i].text_length = kept[i].second.size();
  }
  std::vector<std::uint8_t> bytes;
  png_structp writer = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  if (!writer) return {};
  png_infop info = png_create_info_struct(writer);
  png_set_write_fn(writer, &bytes, Append, Flush);
  const bool isWritten = info && Write(writer, info, *this, list.data(), static_cast<int>(list.size()));
  png_destroy_write_struct(&writer, &info);
  return isWritten ? NSData::dataWithBytes(bytes) : NSData();
}

}  // namespace droxa
