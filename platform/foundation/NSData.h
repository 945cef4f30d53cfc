#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace droxa {

// Immutable bytes behind a cheap handle; a default-constructed handle is nil, which differs from empty.
// Thread contract: a value; handles to the same bytes may be used on any threads.
class NSData {
 public:
  NSData() = default;  // nil
  static NSData dataWithBytes(std::span<const std::uint8_t> bytes);
  static NSData dataWithBytes(const void *bytes, std::size_t length);
  static NSData dataWithString(std::string_view text);  // the text's bytes, no terminator

  explicit operator bool() const { return bytes_ != nullptr; }
  std::size_t length() const { return bytes_ ? bytes_->size() : 0; }
  std::span<const std::uint8_t> bytes() const;

  // Two nil handles are equal; nil and empty are not.
  bool operator==(const NSData &other) const;

  std::string description() const;  // "{length = 3, bytes = 0x010203}", at most 24 bytes shown

 private:
  std::shared_ptr<const std::vector<std::uint8_t>> bytes_;
};

}  // namespace droxa
