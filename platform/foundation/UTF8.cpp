#include "platform/foundation/UTF8.h"

#include <algorithm>
#include <cstdint>

namespace droxa {
namespace {

struct Form {
  std::size_t length;
  std::uint32_t bits;      // the first byte's part of the number
  std::uint32_t smallest;  // a smaller number would be an overlong form
};

Form FormOf(std::uint8_t first) {
  if (first < 0x80) return {1, first, 0};
  if (first >= 0xc2 && first < 0xe0) return {2, first & 0x1fU, 0x80};
  if (first >= 0xe0 && first < 0xf0) return {3, first & 0x0fU, 0x800};
  if (first >= 0xf0 && first < 0xf5) return {4, first & 0x07U, 0x10000};
  return {0, 0, 0};
}

}  // namespace

std::size_t UTF8LengthOfCharacter(std::string_view text) {
  if (text.empty()) return 0;
  const Form form = FormOf(static_cast<std::uint8_t>(text[0]));
  if (form.length == 0 || form.length > text.size()) return 0;
  std::uint32_t number = form.bits;
  for (std::size_t i = 1; i < form.length; ++i) {
    const auto byte = static_cast<std::uint8_t>(text[i]);
    if ((byte & 0xc0U) != 0x80) return 0;
    number = number << 6U | (byte & 0x3fU);
  }
  const bool isSurrogate = number >= 0xd800 && number < 0xe000;
  return number < form.smallest || number > 0x10ffff || isSurrogate ? 0 : form.length;
}

bool UTF8IsValid(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = UTF8LengthOfCharacter(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

std::string_view UTF8Prefix(std::string_view text, std::size_t bytes) {
  std::size_t end = 0;
  while (end < text.size()) {
    const std::size_t next = end + std::max<std::size_t>(UTF8LengthOfCharacter(text.substr(end)), 1);
    if (next > bytes) break;
    end = next;
  }
  return text.substr(0, end);
}

}  // namespace droxa
