#include "tessaly/QVFileObjectID.h"

#include <charconv>

namespace droxa {

std::optional<QVFileObjectID> QVFileObjectID::fileObjectIDWithString(std::string_view string) {
  if (string.size() < 2 || (string[0] != 'd' && string[0] != 'i')) return std::nullopt;
  const std::string_view digits = string.substr(1);
  if (digits[0] < '1' || digits[0] > '9') return std::nullopt;  // no 0, no leading zero, no sign
  std::uint64_t number = 0;
  const char *end = digits.data() + digits.size();
  const auto [stop, problem] = std::from_chars(digits.data(), end, number);
  if (problem != std::errc() || stop != end) return std::nullopt;
  return QVFileObjectID(string[0], number);
}

std::string QVFileObjectID::asString() const {
  return kind_ + std::to_string(number_);
}

}  // namespace droxa
