#include "platform/foundation/NSData.h"

#include <algorithm>

namespace droxa {
namespace {

constexpr std::size_t kBytesShown = 24;

}  // namespace

NSData NSData::dataWithBytes(std::span<const std::uint8_t> bytes) {
  NSData data;
  data.bytes_ = std::make_shared<const std::vector<std::uint8_t>>(bytes.begin(), bytes.end());
  return data;
}

NSData NSData::dataWithBytes(const void *bytes, std::size_t length) {
  return dataWithBytes(std::span(static_cast<const std::uint8_t *>(bytes), length));
}

NSData NSData::dataWithString(std::string_view text) {
  return dataWithBytes(text.data(), text.size());
}

std::span<const std::uint8_t> NSData::bytes() const {
  return bytes_ ? std::span<const std::uint8_t>(*bytes_) : std::span<const std::uint8_t>();
}

bool NSData::operator==(const NSData &other) const {
  if (bytes_ == other.bytes_) return true;
  return bytes_ && other.bytes_ && *bytes_ == *other.bytes_;
}

std::string NSData::description() const {
  if (!bytes_) return "(null)";
  std::string text = "{length = " + std::to_string(bytes_->size()) + ", bytes = 0x";
  const std::size_t shown = std::min(bytes_->size(), kBytesShown);
  for (const std::uint8_t byte : bytes().first(shown)) {
    text += "0123456789abcdef"[byte >> 4];
    text += "0123456789abcdef"[byte & 15];
  }
  return text + (shown < bytes_->size() ? " ...}" : "}");
}

}  // namespace droxa
