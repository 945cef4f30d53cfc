#pragma once

#include <string_view>

namespace droxa {

// Names of the replica that are the sync's own business: its private storage, folders in which replacements
// are prepared, and files that stand for documents. They are neither shown nor found nor made through the
// mount. Any thread.
bool isHiddenName(std::string_view name);

}  // namespace droxa
