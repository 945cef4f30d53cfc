#pragma once

#include <cstdint>
#include <optional>
#include <string>

namespace droxa {

// A point in time, in nanoseconds since 1970-01-01 00:00:00 UTC; a default-constructed date is nil.
// Thread contract: a value.
class NSDate {
 public:
  NSDate() = default;  // nil
  static NSDate dateWithNanosecondsSince1970(std::int64_t nanoseconds);
  static NSDate now();
  // The last date that there is: what never expires expires then.
  static NSDate distantFuture();

  explicit operator bool() const { return nanoseconds_.has_value(); }
  std::int64_t nanosecondsSince1970() const { return nanoseconds_.value_or(0); }

  bool operator==(const NSDate &) const = default;
  auto operator<=>(const NSDate &) const = default;

  std::string description() const;  // "2026-01-31 12:00:00.123456789 +0000"

 private:
  std::optional<std::int64_t> nanoseconds_;
};

}  // namespace droxa
