#include "keld/sync/ConflictName.h"

#include <ctime>

namespace droxa::keld {

namespace {

constexpr std::size_t kLongestName = 255;
constexpr std::size_t kLongestExtension = 20;

// Without the last characters, so that at most `most` bytes are left.
std::string shortened(const std::string &text, std::size_t most) {
  if (text.size() <= most) return text;
  std::size_t length = most;
  while (length > 0 && (static_cast<unsigned char>(text[length]) & 0xC0U) == 0x80U) --length;
  return text.substr(0, length);
}

std::string dateOf(std::int64_t nanoseconds) {
  const std::time_t seconds = static_cast<std::time_t>(nanoseconds / 1'000'000'000);
  std::tm date = {};
  ::localtime_r(&seconds, &date);
  char text[32];
  const std::size_t length = std::strftime(text, sizeof text, "%Y-%m-%d", &date);
  return {text, length};
}

std::string withoutSeparators(std::string text) {
  for (char &c : text)
    if (c == '/' || static_cast<unsigned char>(c) < 0x20) c = '-';
  return text;
}

// The name with the suffix in front of its extension, cut where it would be too long.
std::string suffixed(const std::string &name, const std::string &suffix) {
  const std::size_t dot = name.rfind('.');
  const bool hasExtension = dot != std::string::npos && dot > 0 && name.size() - dot <= kLongestExtension;
  const std::string extension = hasExtension ? name.substr(dot) : std::string();
  const std::string stem = hasExtension ? name.substr(0, dot) : name;
  return shortened(stem, kLongestName - suffix.size() - extension.size()) + suffix + extension;
}

}  // namespace

std::string ConflictName(const std::string &name, const std::string &device, std::int64_t nanoseconds,
                         unsigned number) {
  std::string suffix = " (conflict, ";
  suffix += shortened(withoutSeparators(device), 60);
  suffix += " ";
  suffix += dateOf(nanoseconds);
  if (number > 1) suffix += " " + std::to_string(number);
  suffix += ")";
  return suffixed(name, suffix);
}

std::string NoLongerSharedName(const std::string &name, unsigned number) {
  return suffixed(name, number > 1 ? " (no longer shared " + std::to_string(number) + ")"
                                   : std::string(" (no longer shared)"));
}

}  // namespace droxa::keld
