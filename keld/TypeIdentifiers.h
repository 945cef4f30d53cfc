#pragma once

#include <string>
#include <string_view>

namespace droxa::keld {

inline constexpr char kUnknownType[] = "application/octet-stream";

// The MIME type of a document, by its name: by the desktop's type database (/usr/share/mime/globs2) where it
// is installed, else by a table of the usual ones. Any thread.
const std::string &TypeIdentifierForName(std::string_view name);

}  // namespace droxa::keld
