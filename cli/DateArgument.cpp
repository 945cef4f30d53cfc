#include "cli/DateArgument.h"

#include <ctime>
#include <optional>
#include <string_view>

namespace droxa {

namespace {

constexpr std::int64_t kNanoseconds = 1'000'000'000;

// Reads a text from its start.
class Reader {
 public:
  explicit Reader(std::string_view text) : text_(text) {}

  // So many digits.
  std::optional<int> number(std::size_t digits, int smallest, int largest) {
    if (text_.size() < digits) return std::nullopt;
    int value = 0;
    for (std::size_t index = 0; index < digits; ++index) {
      if (!isDigit(text_[index])) return std::nullopt;
      value = value * 10 + (text_[index] - '0');
    }
    text_.remove_prefix(digits);
    return value >= smallest && value <= largest ? std::optional(value) : std::nullopt;
  }
  bool take(char character) {
    if (text_.empty() || text_.front() != character) return false;
    text_.remove_prefix(1);
    return true;
  }
  // Nanoseconds from up to nine digits.
  std::optional<std::int64_t> fraction() {
    std::int64_t value = 0;
    std::int64_t unit = kNanoseconds;
    for (; !text_.empty() && isDigit(text_.front()); text_.remove_prefix(1)) {
      unit /= 10;
      if (unit == 0) return std::nullopt;
      value += unit * (text_.front() - '0');
    }
    return unit == kNanoseconds ? std::nullopt : std::optional(value);
  }
  bool isAtEnd() const { return text_.empty(); }

 private:
  static bool isDigit(char character) { return character >= '0' && character <= '9'; }
  std::string_view text_;
};

bool readDay(Reader &reader, std::tm &parts) {
  const auto year = reader.number(4, 1677, 2262);
  if (!year || !reader.take('-')) return false;
  const auto month = reader.number(2, 1, 12);
  if (!month || !reader.take('-')) return false;
  const auto day = reader.number(2, 1, 31);
  if (!day) return false;
  parts.tm_year = *year - 1900;
  parts.tm_mon = *month - 1;
  parts.tm_mday = *day;
  return true;
}

bool readTime(Reader &reader, std::tm &parts, std::int64_t &nanoseconds) {
  const auto hour = reader.number(2, 0, 23);
  if (!hour || !reader.take(':')) return false;
  const auto minute = reader.number(2, 0, 59);
  if (!minute) return false;
  parts.tm_hour = *hour;
  parts.tm_min = *minute;
  if (!reader.take(':')) return true;
  const auto second = reader.number(2, 0, 60);
  if (!second) return false;
  parts.tm_sec = *second;
  if (!reader.take('.')) return true;
  const auto fraction = reader.fraction();
  if (!fraction) return false;
  nanoseconds = *fraction;
  return true;
}

// Seconds to the east; nullopt twice over for what is no zone and for none.
bool readZone(Reader &reader, std::optional<int> &zone) {
  if (reader.isAtEnd()) return true;
  if (reader.take('Z')) {
    zone = 0;
    return true;
  }
  const int sign = reader.take('+') ? 1 : reader.take('-') ? -1 : 0;
  const auto hours = reader.number(2, 0, 14);
  if (sign == 0 || !hours) return false;
  (void)reader.take(':');
  const auto minutes = reader.number(2, 0, 59);
  if (!minutes) return false;
  zone = sign * (*hours * 3600 + *minutes * 60);
  return true;
}

}  // namespace

NSDate dateFromText(const std::string &text) {
  Reader reader(text);
  std::tm parts{};
  std::int64_t nanoseconds = 0;
  std::optional<int> zone;
  if (!readDay(reader, parts)) return {};
  if (reader.take('T') || reader.take(' ')) {
    if (!readTime(reader, parts, nanoseconds) || !readZone(reader, zone)) return {};
  }
  if (!reader.isAtEnd()) return {};
  const int day = parts.tm_mday;
  parts.tm_isdst = -1;
  const std::time_t seconds = zone ? timegm(&parts) - *zone : mktime(&parts);
  if (parts.tm_mday != day) return {};  // the 31st of a shorter month
  std::int64_t whole = 0;
  if (__builtin_mul_overflow(static_cast<std::int64_t>(seconds), kNanoseconds, &whole) ||
      __builtin_add_overflow(whole, nanoseconds, &whole)) {
    return {};
  }
  return NSDate::dateWithNanosecondsSince1970(whole);
}

}  // namespace droxa
