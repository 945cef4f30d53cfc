#include "platform/imaging/PNGImage.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cmath>
#include <cstring>
#include <png.h>
#include <string_view>

namespace droxa {
namespace {

constexpr std::size_t kChannels = 4;
constexpr std::string_view kSignature("\x89PNG\r\n\x1a\n", 8);

NSError NotAPicture(const std::string &why) {
  return NSError::errorWithPOSIXCode(EINVAL, "this is no picture that can be shown: " + why);
}

// The library's own, freed at the end of the scope.
struct Reading {
  Reading() { image.version = PNG_IMAGE_VERSION; }
  ~Reading() { png_image_free(&image); }
  Reading(const Reading &) = delete;
  Reading &operator=(const Reading &) = delete;
  png_image image{};
};

// What one pixel of a scaled row or column is made of: a range, whose first and last parts count in part.
struct Span {
  std::uint32_t first = 0;
  std::vector<float> weights;
};

std::vector<Span> SpansOf(std::uint32_t from, std::uint32_t to) {
  std::vector<Span> spans(to);
  const double ratio = static_cast<double>(from) / to;
  for (std::uint32_t i = 0; i < to; ++i) {
    const double begin = i * ratio;
    const double end = std::min((i + 1) * ratio, static_cast<double>(from));
    spans[i].first = static_cast<std::uint32_t>(begin);
    for (std::uint32_t at = spans[i].first; at < from && at < end; ++at) {
      const double part = std::min(end, at + 1.0) - std::max(begin, static_cast<double>(at));
      spans[i].weights.push_back(static_cast<float>(part / (end - begin)));
    }
  }
  return spans;
}

using Pixel = std::array<float, kChannels>;  // colours multiplied by the opacity

Pixel MultipliedAt(const std::uint8_t *pixel) {
  const float opacity = static_cast<float>(pixel[3]) / 255.0F;
  return {static_cast<float>(pixel[0]) * opacity, static_cast<float>(pixel[1]) * opacity,
          static_cast<float>(pixel[2]) * opacity, static_cast<float>(pixel[3])};
}

std::uint8_t Rounded(float value) {
  return static_cast<std::uint8_t>(std::clamp(std::lround(value), 0L, 255L));
}

void Store(const Pixel &pixel, std::uint8_t *stored) {
  const float opacity = pixel[3] / 255.0F;
  for (std::size_t channel = 0; channel < 3; ++channel)
    stored[channel] = opacity > 0 ? Rounded(pixel[channel] / opacity) : 0;
  stored[3] = Rounded(pixel[3]);
}

// The next chunk's kind and contents; the rest in `bytes`. False at the end, and where it doesn't read so.
bool TakeChunk(std::string_view *bytes, std::string_view *kind, std::string_view *contents) {
  constexpr std::size_t kAround = 12;
  if (bytes->size() < kAround) return false;
  std::size_t length = 0;
  for (std::size_t i = 0; i < 4; ++i) length = length << 8 | static_cast<std::uint8_t>((*bytes)[i]);
  if (length > bytes->size() - kAround) return false;
  *kind = bytes->substr(4, 4);
  *contents = bytes->substr(8, length);
  bytes->remove_prefix(length + kAround);
  return true;
}

}  // namespace

PNGImage::PNGImage(std::uint32_t width, std::uint32_t height, std::vector<std::uint8_t> pixels)
    : width_(width), height_(height), pixels_(std::move(pixels)) {}

std::optional<PNGImage> PNGImage::read(const NSData &data, NSError *error) {
  const auto fail = [error](const std::string &why) {
    if (error) *error = NotAPicture(why);
    return std::nullopt;
  };
  if (data.length() > kMostBytes) return fail("it has " + std::to_string(data.length()) + " bytes");
  Reading reading;
  png_image &image = reading.image;
  if (png_image_begin_read_from_memory(&image, data.bytes().data(), data.length()) == 0)
    return fail(image.message);
  if (image.width == 0 || image.height == 0 || image.width > kLongestSide || image.height > kLongestSide)
    return fail("it has " + std::to_string(image.width) + " x " + std::to_string(image.height) + " pixels");
  image.format = PNG_FORMAT_RGBA;
  std::vector<std::uint8_t> pixels(std::size_t{image.width} * image.height * kChannels);
  if (png_image_finish_read(&image, nullptr, pixels.data(), 0, nullptr) == 0) return fail(image.message);
  return PNGImage(image.width, image.height, std::move(pixels));
}

PNGImage PNGImage::scaledToFit(std::uint32_t side) const {
  const std::uint32_t longest = std::max(width_, height_);
  if (longest <= side) return *this;
  const auto scaled = [&](std::uint32_t length) {
    return std::max<std::uint32_t>(
        1, static_cast<std::uint32_t>((std::uint64_t{length} * side + longest / 2) / longest));
  };
  const std::vector<Span> columns = SpansOf(width_, scaled(width_));
  const std::vector<Span> rows = SpansOf(height_, scaled(height_));
  std::vector<std::uint8_t> pixels(columns.size() * rows.size() * kChannels);
  std::uint8_t *stored = pixels.data();
  for (const Span &row : rows) {
    for (const Span &column : columns) {
      Pixel sum{};
      for (std::size_t y = 0; y < row.weights.size(); ++y) {
        const std::uint8_t *from = &pixels_[((row.first + y) * width_ + column.first) * kChannels];
        for (std::size_t x = 0; x < column.weights.size(); ++x) {
          const Pixel pixel = MultipliedAt(from + x * kChannels);
          const float weight = row.weights[y] * column.weights[x];
          for (std::size_t channel = 0; channel < kChannels; ++channel)
            sum[channel] += pixel[channel] * weight;
        }
      }
      Store(sum, stored);
      stored += kChannels;
    }
  }
  return PNGImage(static_cast<std::uint32_t>(columns.size()), static_cast<std::uint32_t>(rows.size()),
                  std::move(pixels));
}

std::optional<std::string> PNGTextOf(const std::string &file, const std::string &keyword) {
  std::string_view bytes = file;
  if (!bytes.starts_with(kSignature)) return std::nullopt;
  bytes.remove_prefix(kSignature.size());
  std::string_view kind, contents;
  while (TakeChunk(&bytes, &kind, &contents)) {
    const std::size_t end = contents.find('\0');
    if (kind == "tEXt" && end != std::string_view::npos && contents.substr(0, end) == keyword)
      return std::string(contents.substr(end + 1));
  }
  return std::nullopt;
}

}  // namespace droxa
