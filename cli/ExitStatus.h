#pragma once

#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// What `droxa` ends with; beyond these three, the values of sysexits.
inline constexpr int kExitSuccess = 0;
inline constexpr int kExitFailure = 1;
inline constexpr int kExitUsage = 2;

// 66: there is no such item; 69: a part of the system is away; 75: no answer in time; 77: nobody is signed
// in, or it may not be read; else 1.
int exitStatusForError(const NSError &error);

// What happened and what to do about it, without the name of what was asked.
std::string explanationOfError(const NSError &error);

}  // namespace droxa
