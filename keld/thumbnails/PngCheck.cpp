#include "keld/thumbnails/PngCheck.h"

#include <algorithm>
#include <array>

namespace droxa::keld {

namespace {

constexpr std::string_view kSignature = "\x89PNG\r\n\x1a\n";
constexpr std::array<std::string_view, 9> kChunks{"IHDR", "PLTE", "IDAT", "IEND", "tRNS",
                                                  "pHYs", "sRGB", "gAMA", "bKGD"};
constexpr std::size_t kChunkFrame = 12;  // length, type and checksum
constexpr std::uint32_t kHeaderSize = 13;

std::uint32_t number(std::string_view bytes) {
  std::uint32_t value = 0;
  for (std::size_t index = 0; index < 4; ++index)
    value = value << 8 | static_cast<unsigned char>(bytes[index]);
  return value;
}

}  // namespace

std::optional<PngSize> CheckPng(std::string_view bytes) {
  if (bytes.substr(0, kSignature.size()) != kSignature) return std::nullopt;
  bytes.remove_prefix(kSignature.size());
  std::optional<PngSize> size;
  bool hasPixels = false;
  while (bytes.size() >= kChunkFrame) {
    const std::uint32_t length = number(bytes);
    const std::string_view type = bytes.substr(4, 4);
    const bool isKnown = std::find(kChunks.begin(), kChunks.end(), type) != kChunks.end();
    if (!isKnown || length > bytes.size() - kChunkFrame || (type == "IHDR") == size.has_value())
      return std::nullopt;
    if (type == "IHDR") {
      if (length != kHeaderSize) return std::nullopt;
      size = PngSize{number(bytes.substr(8)), number(bytes.substr(12))};
    }
    hasPixels = hasPixels || type == "IDAT";
    bytes.remove_prefix(kChunkFrame + length);
    if (type != "IEND") continue;
    if (!bytes.empty() || !hasPixels || size->width == 0 || size->height == 0) return std::nullopt;
    return size;
  }
  return std::nullopt;
}

}  // namespace droxa::keld
