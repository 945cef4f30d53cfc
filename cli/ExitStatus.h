#pragma once

#include <string>

#include "platform/foundation/NSError.h"

namespace droxa {

// What `droxa` ends with; beyond these, the values of sysexits.
inline constexpr int kExitSuccess = 0;
inline constexpr int kExitFailure = 1;
inline constexpr int kExitUsage = 2;
inline constexpr int kExitInterrupted = 130;  // Ctrl-C, as a shell tells it

// 66: there is no such item; 69: a part of the system is away; 73: the disk or the cloud is full, or can't be
// written; 74: the disk failed, or what came isn't what the cloud promised; 75: no answer in time, or the
// cloud can't be reached; 77: nobody is signed in, or it may not be read or changed; else 1.
int exitStatusForError(const NSError &error);

// What happened and what to do about it, without the name of what was asked.
std::string explanationOfError(const NSError &error);

}  // namespace droxa
