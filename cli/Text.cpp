#include "cli/Text.h"

#include <array>
#include <cstdio>
#include <ctime>

namespace droxa {

namespace {

// The length of the well-formed sequence at the start of `text`; 0 when there is none.
std::size_t sequenceLength(std::string_view text) {
  const auto byte = [&](std::size_t index) {
    return index < text.size() ? static_cast<unsigned char>(text[index]) : 0U;
  };
  const auto follows = [&](std::size_t index, unsigned low = 0x80, unsigned high = 0xBF) {
    return byte(index) >= low && byte(index) <= high;
  };
  const unsigned first = byte(0);
  if (text.empty()) return 0;
  if (first < 0x80) return 1;
  if (first >= 0xC2 && first <= 0xDF) return follows(1) ? 2 : 0;
  if (first == 0xE0) return follows(1, 0xA0) && follows(2) ? 3 : 0;
  if (first == 0xED) return follows(1, 0x80, 0x9F) && follows(2) ? 3 : 0;
  if (first >= 0xE1 && first <= 0xEF) return follows(1) && follows(2) ? 3 : 0;
  if (first == 0xF0) return follows(1, 0x90) && follows(2) && follows(3) ? 4 : 0;
  if (first == 0xF4) return follows(1, 0x80, 0x8F) && follows(2) && follows(3) ? 4 : 0;
  if (first >= 0xF1 && first <= 0xF3) return follows(1) && follows(2) && follows(3) ? 4 : 0;
  return 0;
}

// The control characters: C0, delete, and C1, which UTF-8 writes as C2 80 to C2 9F.
bool isControl(std::string_view sequence) {
  const auto first = static_cast<unsigned char>(sequence[0]);
  if (sequence.size() == 1) return first < 0x20 || first == 0x7F;
  return sequence.size() == 2 && first == 0xC2 && static_cast<unsigned char>(sequence[1]) < 0xA0;
}

std::string formatted(const char *format, long long first, long long second = 0) {
  std::array<char, 64> text{};
  // NOLINTNEXTLINE(cert-err33-c): the texts below fit
  std::snprintf(text.data(), text.size(), format, first, second);
  return text.data();
}

std::string escapedByte(unsigned char byte) {
  switch (byte) {
    case '\n':
      return "\\n";
    case '\t':
      return "\\t";
    case '\r':
      return "\\r";
    default:
      return formatted("\\x%02llx", byte);
  }
}

constexpr std::int64_t kNanoseconds = 1'000'000'000;

std::string timeText(const char *format, std::int64_t nanoseconds, bool local) {
  // Rounded down, also before 1970.
  const std::time_t seconds =
      (nanoseconds - (nanoseconds % kNanoseconds + kNanoseconds) % kNanoseconds) / kNanoseconds;
  std::tm parts{};
  if (!(local ? localtime_r(&seconds, &parts) : gmtime_r(&seconds, &parts))) return "-";
  std::array<char, 64> text{};
  const std::size_t length = std::strftime(text.data(), text.size(), format, &parts);
  return {text.data(), length};
}

}  // namespace

bool isValidUTF8(std::string_view text) {
  while (!text.empty()) {
    const std::size_t length = sequenceLength(text);
    if (length == 0) return false;
    text.remove_prefix(length);
  }
  return true;
}

std::string escapedText(std::string_view text) {
  std::string result;
  while (!text.empty()) {
    const std::size_t length = sequenceLength(text);
    if (text[0] == '\\') {
      result += "\\\\";
    } else if (length > 0 && !isControl(text.substr(0, length))) {
      result += text.substr(0, length);
    } else {
      for (std::size_t index = 0; index < (length == 0 ? 1 : length); ++index)
        result += escapedByte(static_cast<unsigned char>(text[index]));
    }
    text.remove_prefix(length == 0 ? 1 : length);
  }
  return result;
}

std::string base64Text(std::string_view bytes) {
  static constexpr char kDigits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  std::string text;
  for (std::size_t index = 0; index < bytes.size(); index += 3) {
    std::uint32_t group = 0;
    for (std::size_t offset = 0; offset < 3; ++offset)
      group = group << 8U |
              (index + offset < bytes.size() ? static_cast<unsigned char>(bytes[index + offset]) : 0U);
    for (std::size_t digit = 0; digit < 4; ++digit)
      text += index + digit > bytes.size() ? '=' : kDigits[group >> (18 - 6 * digit) & 0x3FU];
  }
  return text;
}

std::string localTimeText(std::int64_t nanosecondsSince1970) {
  return nanosecondsSince1970 == 0 ? "-" : timeText("%Y-%m-%d %H:%M", nanosecondsSince1970, true);
}

std::string isoTimeText(std::int64_t nanosecondsSince1970) {
  const std::int64_t fraction = (nanosecondsSince1970 % kNanoseconds + kNanoseconds) % kNanoseconds;
  return timeText("%Y-%m-%dT%H:%M:%S", nanosecondsSince1970, false) + formatted(".%09lldZ", fraction);
}

std::string countText(std::uint64_t number, const std::string &one) {
  return std::to_string(number) + " " + one + (number == 1 ? "" : "s");
}

std::string durationText(std::int64_t nanoseconds) {
  const std::int64_t seconds = nanoseconds / kNanoseconds;
  if (seconds < 60) return formatted("%lld s", seconds < 0 ? 0 : seconds);
  if (seconds < 3600) return formatted("%lld min", seconds / 60);
  if (seconds < 86400) return formatted("%lld h %lld min", seconds / 3600, seconds / 60 % 60);
  return formatted("%lld d %lld h", seconds / 86400, seconds / 3600 % 24);
}

}  // namespace droxa
