#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "platform/oslog/os_log.h"
#include "tessaly/QVLog.h"

namespace droxa {

inline const char *logLevelName(os_log_type_t type) {
  switch (type) {
    case os_log_type_t::debug:
      return "debug";
    case os_log_type_t::info:
      return "info";
    case os_log_type_t::normal:
      return "default";
    case os_log_type_t::error:
      return "error";
    case os_log_type_t::fault:
      return "fault";
  }
  return "?";
}

// What was logged through the Tessaly library's default handle, each line as "level: text", in order. A line
// of another handle bears its category in front.
inline std::vector<std::string> logLines(const OSLogCapture &capture) {
  std::vector<std::string> lines;
  for (const OSLogLine &line : capture.lines()) {
    const std::string handle = line.handle == qvc_default_log() ? "" : line.handle->category + " ";
    lines.push_back(handle + logLevelName(line.type) + ": " + line.text);
  }
  return lines;
}

// A section's tag as lines show it.
inline std::string hexTag(std::uint64_t tag) {
  return NSStringWithFormat("%llx", tag);
}

}  // namespace droxa
