#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/oslog/LogFormat.h"

namespace droxa {

enum class os_log_type_t : std::uint8_t { info = 1, debug = 2, normal = 0, error = 0x10, fault = 0x11 };

// A named destination of log lines ("subsystem" and "category"); made once, lives as long as the process.
struct OSLog {
  std::string subsystem;
  std::string category;
};
using os_log_t = const OSLog *;

// The handle of that name; the same pointer for the same names. Any thread.
os_log_t os_log_create(std::string_view subsystem, std::string_view category);

// One line as it was logged.
struct OSLogLine {
  os_log_t handle;
  os_log_type_t type;
  std::string text;
};

// Where lines go: by default to stderr on a terminal or when it isn't the journal, to journald under systemd
// ($JOURNAL_STREAM names stderr). Levels below the threshold are dropped before they are formatted
// (OSLogSetThreshold; $DROXA_LOG = debug, info, default, error, fault; default "default").
void OSLogSetThreshold(os_log_type_t lowest);
bool OSLogIsEnabled(os_log_type_t type);

// Keeps every line of the process, of every level, while it lives; for tests. Captures nest: the newest gets
// the line. Thread contract: any thread; lines of one thread keep their order.
class OSLogCapture {
 public:
  OSLogCapture();
  ~OSLogCapture();
  OSLogCapture(const OSLogCapture &) = delete;
  OSLogCapture &operator=(const OSLogCapture &) = delete;
  std::vector<OSLogLine> lines() const;
  std::vector<std::string> texts() const;
  bool contains(std::string_view text) const;
  void clear();

 private:
  friend void OSLogWrite(os_log_t handle, os_log_type_t type, std::string text);
  static bool keep(const OSLogLine &line);  // by the newest capture; false when none lives
  struct State;
  const std::shared_ptr<State> state_;
};

// A line that a capture keeps goes nowhere else.
void OSLogWrite(os_log_t handle, os_log_type_t type, std::string text);

// Logs a line. The format takes %@ (a description; nil prints "(null)"), %s, %d, %u, %lu, %lld, %llu, %llx
// and
// %.Nf, and is checked against its arguments when the code is compiled.
template <class... Args>
void os_log_with_type(os_log_t handle, os_log_type_t type, LogFormat<std::type_identity_t<Args>...> format,
                      const Args &...args) {
  if (OSLogIsEnabled(type)) OSLogWrite(handle, type, format.print(args...));
}
template <class... Args>
void os_log_debug(os_log_t handle, LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  os_log_with_type<Args...>(handle, os_log_type_t::debug, format, args...);
}
template <class... Args>
void os_log_info(os_log_t handle, LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  os_log_with_type<Args...>(handle, os_log_type_t::info, format, args...);
}
template <class... Args>
void os_log(os_log_t handle, LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  os_log_with_type<Args...>(handle, os_log_type_t::normal, format, args...);
}
template <class... Args>
void os_log_error(os_log_t handle, LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  os_log_with_type<Args...>(handle, os_log_type_t::error, format, args...);
}
template <class... Args>
void os_log_fault(os_log_t handle, LogFormat<std::type_identity_t<Args>...> format, const Args &...args) {
  os_log_with_type<Args...>(handle, os_log_type_t::fault, format, args...);
}

}  // namespace droxa
