#pragma once

#include <string>
#include <string_view>

#include "platform/oslog/os_log.h"

namespace droxa {

// "debug", "info", "default", "error" or "fault".
const char *LogLevelName(os_log_type_t type);

// `text` as one printable line: control characters are written as escapes ("\n", "\x1b"), so that no text can
// pass for a line of its own or command a terminal. Any thread.
std::string LogEscaped(std::string_view text);

// Writes a line to the journal when stderr is connected to it, else to stderr. Any thread.
void LogOutput(os_log_t handle, os_log_type_t type, const std::string &text);

}  // namespace droxa
