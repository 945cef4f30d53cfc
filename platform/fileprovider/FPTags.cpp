#include "platform/fileprovider/FPTags.h"

#include <algorithm>
#include <array>
#include <optional>
#include <span>
#include <string_view>

#include "platform/foundation/UTF8.h"

// Tag data: "dxtg", the version (1), and each tag as its colour (one byte), the length of its label in bytes
// (two, the higher first) and the label. A later version may only add what this reader would stop at.

namespace droxa {
namespace {

constexpr std::array<std::uint8_t, 5> kHeader = {'d', 'x', 't', 'g', 1};
constexpr std::size_t kTagHead = 3;
constexpr std::uint8_t kLastColor = 7;

bool IsLabel(std::string_view text) {
  if (text.empty() || text.size() > 0xffff || !UTF8IsValid(text)) return false;
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<std::uint8_t>(text[i]);
    if (byte < 0x20 || byte == 0x7f) return false;
    // U+0080 to U+009F, the other control characters.
    if (byte == 0xc2 && static_cast<std::uint8_t>(text[i + 1]) < 0xa0) return false;
  }
  return true;
}

// Takes the next tag off the bytes; none when they can't be understood.
std::optional<FPTag> NextTag(std::span<const std::uint8_t> &bytes) {
  if (bytes.size() < kTagHead || bytes[0] > kLastColor) return std::nullopt;
  const std::size_t length = static_cast<std::size_t>(bytes[1]) << 8U | bytes[2];
  if (bytes.size() - kTagHead < length) return std::nullopt;
  const auto text = bytes.subspan(kTagHead, length);
  FPTag tag{std::string(text.begin(), text.end()), bytes[0]};
  if (!IsLabel(tag.label)) return std::nullopt;
  bytes = bytes.subspan(kTagHead + length);
  return tag;
}

}  // namespace

std::vector<FPTag> FPGetTagsFromTagsData(const NSData &tagData) {
  auto bytes = tagData.bytes();
  if (bytes.size() < kHeader.size() || !std::equal(kHeader.begin(), kHeader.end(), bytes.begin())) return {};
  bytes = bytes.subspan(kHeader.size());
  std::vector<FPTag> tags;
  while (auto tag = NextTag(bytes)) tags.push_back(*std::move(tag));
  return tags;
}

NSData FPGetTagsDataFromTags(const std::vector<FPTag> &tags) {
  std::vector<std::uint8_t> bytes(kHeader.begin(), kHeader.end());
  for (const FPTag &tag : tags) {
    if (!IsLabel(tag.label)) continue;
    bytes.push_back(tag.color > kLastColor ? std::uint8_t{0} : tag.color);
    bytes.push_back(static_cast<std::uint8_t>(tag.label.size() >> 8U));
    bytes.push_back(static_cast<std::uint8_t>(tag.label.size()));
    bytes.insert(bytes.end(), tag.label.begin(), tag.label.end());
  }
  return bytes.size() == kHeader.size() ? NSData() : NSData::dataWithBytes(bytes);
}

}  // namespace droxa
