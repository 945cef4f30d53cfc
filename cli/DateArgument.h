#pragma once

#include <string>

#include "platform/foundation/NSDate.h"

namespace droxa {

// "2026-01-31", "2026-01-31 12:00", "2026-01-31T12:00:00", with a fraction of a second, and with "Z" or
// "+01:00" behind a time; without those in the local time zone. nil for anything else.
NSDate dateFromText(const std::string &text);

}  // namespace droxa
