#pragma once

#include <string>

#include "platform/foundation/CGSize.h"

namespace droxa {

// "{12.00, 7.50}", for log messages. Any thread.
std::string qv_stringWithSize(CGSize size);

}  // namespace droxa
