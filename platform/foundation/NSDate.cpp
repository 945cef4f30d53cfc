#include "platform/foundation/NSDate.h"

#include <chrono>
#include <cstdio>
#include <ctime>
#include <limits>

namespace droxa {
namespace {

constexpr std::int64_t kNanosecondsASecond = 1'000'000'000;

}  // namespace

NSDate NSDate::dateWithNanosecondsSince1970(std::int64_t nanoseconds) {
  NSDate date;
  date.nanoseconds_ = nanoseconds;
  return date;
}

NSDate NSDate::now() {
  const auto since1970 = std::chrono::system_clock::now().time_since_epoch();
  return dateWithNanosecondsSince1970(
      std::chrono::duration_cast<std::chrono::nanoseconds>(since1970).count());
}

NSDate NSDate::distantFuture() {
  return dateWithNanosecondsSince1970(std::numeric_limits<std::int64_t>::max());
}

std::string NSDate::description() const {
  if (!nanoseconds_) return "(null)";
  // Rounded down, so that the fraction of a date before 1970 counts forward too.
  std::int64_t seconds = *nanoseconds_ / kNanosecondsASecond;
  std::int64_t fraction = *nanoseconds_ % kNanosecondsASecond;
  if (fraction < 0) {
    fraction += kNanosecondsASecond;
    --seconds;
  }
  const std::time_t time = seconds;
  std::tm parts{};
  gmtime_r(&time, &parts);
  char day[32];
  std::strftime(day, sizeof day, "%Y-%m-%d %H:%M:%S", &parts);
  char text[64];
  std::snprintf(text, sizeof text, "%s.%09lld +0000", day, static_cast<long long>(fraction));
  return text;
}

}  // namespace droxa
