#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace droxa {

// The bytes of a path as a URL writes them: all but letters, digits, "-._~" and "/" become "%XX". Any thread.
std::string PercentEncodedPath(std::string_view path);
// The bytes that `text` stands for; nullopt for a "%" without two hexadecimal digits. Any thread.
std::optional<std::string> PercentDecoded(std::string_view text);

}  // namespace droxa
