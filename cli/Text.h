#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace droxa {

bool isValidUTF8(std::string_view text);

// The text for a line of its own: control characters, bytes that aren't UTF-8, and the backslash are written
// as
// "\n", "\t", "\x1b", "\\"; everything else stays.
std::string escapedText(std::string_view text);

std::string base64Text(std::string_view bytes);

// "2026-01-31 12:00" in the local time zone; "-" for nanoseconds of 0.
std::string localTimeText(std::int64_t nanosecondsSince1970);
// "2026-01-31T12:00:00.123456789Z".
std::string isoTimeText(std::int64_t nanosecondsSince1970);
// "3 min", "2 h 5 min", "4 d 1 h": how long since.
std::string durationText(std::int64_t nanoseconds);

// "1 folder", "2 folders".
std::string countText(std::uint64_t number, const std::string &one);

}  // namespace droxa
