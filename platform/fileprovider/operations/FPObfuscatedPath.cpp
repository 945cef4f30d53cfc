#include <algorithm>
#include <cstdint>
#include <string_view>

#include "platform/fileprovider/FPURLOperations.h"
#include "platform/foundation/UTF8.h"

namespace droxa {
namespace {

// A character that can stand in a line of a log; "?" for a control character or a byte that isn't UTF-8.
std::string Shown(std::string_view character) {
  const auto first = static_cast<std::uint8_t>(character[0]);
  const bool isControl =
      first < 0x20 || first == 0x7f || (first == 0xc2 && static_cast<std::uint8_t>(character[1]) < 0xa0);
  return isControl ? "?" : std::string(character);
}

std::string FirstCharacter(std::string_view name) {
  const std::size_t length = UTF8LengthOfCharacter(name);
  return length == 0 ? "?" : Shown(name.substr(0, length));
}

std::string LastCharacter(std::string_view name) {
  for (std::size_t length = 1; length <= 4 && length <= name.size(); ++length) {
    const std::string_view end = name.substr(name.size() - length);
    if (UTF8LengthOfCharacter(end) == length) return Shown(end);
  }
  return "?";
}

// One or two characters would be the whole name.
std::string Obfuscated(std::string_view name) {
  const std::string length = "(" + std::to_string(name.size()) + ")";
  if (name.empty() || UTF8Prefix(name, 2) == name) return name.empty() ? "" : length;
  return FirstCharacter(name) + length + LastCharacter(name);
}

}  // namespace

std::string fp_obfuscatedPath(const std::string &path) {
  std::string result;
  std::size_t start = 0;
  while (start <= path.size()) {
    const std::size_t end = std::min(path.find('/', start), path.size());
    result += Obfuscated(std::string_view(path).substr(start, end - start));
    if (end < path.size()) result += '/';
    start = end + 1;
  }
  return result;
}

}  // namespace droxa
