#pragma once

#include <optional>
#include <string>

#include "platform/foundation/NSData.h"

namespace droxa {

// The picture of an icon that fits `side` pixels best: of that size, else the next larger one there is, else
// the largest. It is looked for in the user's icon theme, those that it inherits from, and "hicolor"; an
// absolute path is the picture itself. PNG pictures alone, as they are installed; nil when there is none.
// Reads files and the environment. Any thread.
NSData IconImageData(const std::string &iconName, int side);

// The name of the user's icon theme: the desktop's setting, else "hicolor".
std::string IconThemeName();

}  // namespace droxa
