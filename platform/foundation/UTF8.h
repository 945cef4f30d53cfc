#pragma once

#include <cstddef>
#include <string_view>

namespace droxa {

// The length of the well-formed UTF-8 character that `text` begins with (1 to 4); 0 when there is none: an
// empty text, a cut or overlong form, a surrogate, or a number beyond U+10FFFF.
std::size_t UTF8LengthOfCharacter(std::string_view text);
bool UTF8IsValid(std::string_view text);
// The longest beginning of at most `bytes` bytes that cuts no character in two. Bytes that aren't UTF-8 count
// as characters of their own.
std::string_view UTF8Prefix(std::string_view text, std::size_t bytes);

}  // namespace droxa
