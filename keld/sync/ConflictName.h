#pragma once

#include <cstdint>
#include <string>

namespace droxa::keld {

// The name of the copy that keeps what one device wrote when another one's version took the name:
// "notes (conflict, ada-laptop 2026-11-21).txt"; with a number from 2 on where that is taken. Cut short so
// that it stays a name: at most 255 bytes, no character of several bytes cut in two.
std::string ConflictName(const std::string &name, const std::string &device, std::int64_t nanoseconds,
                         unsigned number = 1);

// What is kept of something that another doesn't share any more: "name (no longer shared).ext", with a number
// from 2 on.
std::string NoLongerSharedName(const std::string &name, unsigned number);

}  // namespace droxa::keld
