#pragma once

#include "platform/foundation/NSError.h"

namespace droxa {

// What a call gave: a value, or an error.
template <class Value>
struct CallResult {
  Value value{};
  NSError error;
};

}  // namespace droxa
