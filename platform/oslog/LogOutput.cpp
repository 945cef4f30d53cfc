#include "platform/oslog/LogOutput.h"

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <optional>
#include <utility>

#define SD_JOURNAL_SUPPRESS_LOCATION
#include <sys/stat.h>
#include <sys/uio.h>
#include <systemd/sd-journal.h>
#include <unistd.h>

namespace droxa {
namespace {

using StreamIdentity = std::pair<unsigned long long, unsigned long long>;  // device and inode

std::optional<StreamIdentity> journalStream() {
  const char *text = std::getenv("JOURNAL_STREAM");
  StreamIdentity identity;
  if (!text || std::sscanf(text, "%llu:%llu", &identity.first, &identity.second) != 2) return std::nullopt;
  return identity;
}

bool isJournalOnStderr() {
  static const std::optional<StreamIdentity> journal = journalStream();
  struct stat status {};
  return journal && fstat(STDERR_FILENO, &status) == 0 &&
         *journal == StreamIdentity(status.st_dev, status.st_ino);
}

int journalPriority(os_log_type_t type) {
  switch (type) {
    case os_log_type_t::debug:
      return 7;
    case os_log_type_t::info:
      return 6;
    case os_log_type_t::normal:
      return 5;
    case os_log_type_t::error:
      return 3;
    case os_log_type_t::fault:
      return 2;
  }
  return 5;
}

void writeToJournal(os_log_t handle, os_log_type_t type, const std::string &text) {
  std::string fields[] = {
      "MESSAGE=" + text,
      "PRIORITY=" + std::to_string(journalPriority(type)),
      std::string("SYSLOG_IDENTIFIER=") + program_invocation_short_name,
      "DROXA_SUBSYSTEM=" + (handle ? handle->subsystem : std::string()),
      "DROXA_CATEGORY=" + (handle ? handle->category : std::string()),
  };
  iovec vectors[std::size(fields)];
  for (std::size_t i = 0; i < std::size(fields); ++i) vectors[i] = {fields[i].data(), fields[i].size()};
  sd_journal_sendv(vectors, static_cast<int>(std::size(vectors)));
}

// "2026-01-31 12:00:00.123456 keld[42] error: "
std::string linePrefix(os_log_type_t type) {
  timespec now{};
  clock_gettime(CLOCK_REALTIME, &now);
  std::tm parts{};
  localtime_r(&now.tv_sec, &parts);
  char day[32];
  std::strftime(day, sizeof day, "%Y-%m-%d %H:%M:%S", &parts);
  char fraction[24];
  std::snprintf(fraction, sizeof fraction, ".%06ld", now.tv_nsec / 1000);
  return std::string(day) + fraction + " " + program_invocation_short_name + "[" + std::to_string(getpid()) +
         "] " + LogLevelName(type) + ": ";
}

// A line goes out in one call, so that lines of several threads and processes don't mix. A line that can't be
// written is lost: there is nowhere left to say so.
void writeToStderr(const std::string &line) {
  std::string_view rest = line;
  while (!rest.empty()) {
    const ssize_t written = write(STDERR_FILENO, rest.data(), rest.size());
    if (written < 0 && errno != EINTR) return;
    if (written > 0) rest.remove_prefix(static_cast<std::size_t>(written));
  }
}

std::string escapeOf(unsigned char byte) {
  switch (byte) {
    case '\n':
      return "\\n";
    case '\r':
      return "\\r";
    case '\t':
      return "\\t";
    default: {
      char text[8];
      std::snprintf(text, sizeof text, "\\x%02x", byte);
      return text;
    }
  }
}

}  // namespace

const char *LogLevelName(os_log_type_t type) {
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
  return "default";
}

std::string LogEscaped(std::string_view text) {
  std::string escaped;
  escaped.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    const auto next = i + 1 < text.size() ? static_cast<unsigned char>(text[i + 1]) : 0U;
    if (byte < 0x20 || byte == 0x7f) {
      escaped += escapeOf(byte);
    } else if (byte == 0xc2 && next >= 0x80 &&
               next <= 0x9f) {  // the second set of control characters, in UTF-8
      escaped += escapeOf(byte) + escapeOf(static_cast<unsigned char>(next));
      ++i;
    } else {
      escaped += text[i];
    }
  }
  return escaped;
}

void LogOutput(os_log_t handle, os_log_type_t type, const std::string &text) {
  if (isJournalOnStderr()) {
    writeToJournal(handle, type, text);
  } else {
    writeToStderr(linePrefix(type) + LogEscaped(text) + "\n");
  }
}

}  // namespace droxa
