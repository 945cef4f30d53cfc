#pragma once

#include "platform/foundation/NSError.h"

namespace droxa {

// How a method with an error out-pointer fails: logs `error` under the method's full name, and stores it
// where the caller gave an out-pointer. Any thread.
void QVReportError(const char *method, NSError *outPointer, const NSError &error);

}  // namespace droxa
