#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"

namespace droxa {

// Texts of a PNG file, keyword and text.
using PNGTexts = std::vector<std::pair<std::string, std::string>>;

// A small picture in memory: rows of red, green, blue and opacity, eight bits each. Thread contract: a value.
class PNGImage {
 public:
  // The longest side and the most bytes of what is read. A file can't make more work than that: what it says
  // of its size is looked at before anything of it is decoded.
  static constexpr std::uint32_t kLongestSide = 2048;
  static constexpr std::size_t kMostBytes = 16U << 20;

  // nullopt, with `error` (may be null) set: it isn't a PNG file, is larger than that, or damaged.
  static std::optional<PNGImage> read(const NSData &data, NSError *error);
  PNGImage(std::uint32_t width, std::uint32_t height, std::vector<std::uint8_t> pixels);

  std::uint32_t width() const { return width_; }
  std::uint32_t height() const { return height_; }
  const std::vector<std::uint8_t> &pixels() const { return pixels_; }

  // The same picture with no side longer than `side`, each of its pixels the mean of those that it stands
  // for; never larger than it is, and at least one pixel wide and high.
  PNGImage scaledToFit(std::uint32_t side) const;
  // As a file, with the texts (latin-1 keywords of 1 to 79 bytes).
  NSData file(const PNGTexts &texts = {}) const;

 private:
  std::uint32_t width_;
  std::uint32_t height_;
  std::vector<std::uint8_t> pixels_;
};

// The text of that keyword among a PNG file's; nullopt when it has none, or isn't a PNG file. Reads the
// file's chunks, and decodes nothing.
std::optional<std::string> PNGTextOf(const std::string &file, const std::string &keyword);

}  // namespace droxa
