#pragma once

#include <cstddef>
#include <string>
#include <string_view>

namespace droxa::embedded {

// Bytes that nobody can guess, from the system. Throws CallFailed (internalError) when it gives none.
// Thread contract: may be called on any thread.
std::string RandomBytes(std::size_t count);

// Two lower-case digits a byte.
std::string HexOf(std::string_view bytes);
// "" unless the text is such digits.
std::string BytesOfHex(std::string_view hex);

}  // namespace droxa::embedded
