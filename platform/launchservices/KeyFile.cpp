#include "platform/launchservices/KeyFile.h"

#include <charconv>

#include "platform/foundation/ReadFile.h"

namespace droxa {
namespace {

constexpr std::size_t kLargestFile = 1U << 20;

std::string_view Trimmed(std::string_view text) {
  constexpr std::string_view kBlanks = " \t\r";
  const std::size_t begin = text.find_first_not_of(kBlanks);
  if (begin == std::string_view::npos) return {};
  return text.substr(begin, text.find_last_not_of(kBlanks) - begin + 1);
}

std::string Unescaped(std::string_view text) {
  std::string result;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] != '\\' || i + 1 == text.size()) {
      result += text[i];
      continue;
    }
    const char escaped = text[++i];
    switch (escaped) {
      case 's':
        result += ' ';
        break;
      case 'n':
        result += '\n';
        break;
      case 't':
        result += '\t';
        break;
      case 'r':
        result += '\r';
        break;
      default:
        result += escaped;
    }
  }
  return result;
}

}  // namespace

std::optional<KeyFile> KeyFile::read(const std::string &path) {
  const FileContents contents = ReadFile(path, kLargestFile);
  if (contents.code != 0) return std::nullopt;
  return KeyFile(contents.bytes);
}

KeyFile::KeyFile(std::string_view text) {
  std::map<std::string, std::string> *group = nullptr;
  while (!text.empty()) {
    const std::size_t end = text.find('\n');
    const std::string_view line = Trimmed(text.substr(0, end));
    text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
    if (line.empty() || line.front() == '#') continue;
    if (line.front() == '[') {
      const bool isWhole = line.back() == ']';
      group = isWhole ? &groups_[std::string(line.substr(1, line.size() - 2))] : nullptr;
      continue;
    }
    const std::size_t equals = line.find('=');
    if (!group || equals == std::string_view::npos) continue;
    group->try_emplace(std::string(Trimmed(line.substr(0, equals))),
                       Unescaped(Trimmed(line.substr(equals + 1))));
  }
}

const std::string *KeyFile::value(const std::string &group, const std::string &key) const {
  const auto found = groups_.find(group);
  if (found == groups_.end()) return nullptr;
  const auto entry = found->second.find(key);
  return entry == found->second.end() ? nullptr : &entry->second;
}

std::string KeyFile::text(const std::string &group, const std::string &key) const {
  const std::string *found = value(group, key);
  return found ? *found : "";
}

std::optional<int> KeyFile::number(const std::string &group, const std::string &key) const {
  const std::string written = text(group, key);
  int result = 0;
  const char *end = written.data() + written.size();
  const auto [parsed, code] = std::from_chars(written.data(), end, result);
  return code == std::errc() && parsed == end ? std::optional(result) : std::nullopt;
}

bool KeyFile::isTrue(const std::string &group, const std::string &key) const {
  return text(group, key) == "true";
}

std::vector<std::string> KeyFile::list(const std::string &group, const std::string &key,
                                       char separator) const {
  std::vector<std::string> elements;
  const std::string written = text(group, key);
  for (std::size_t start = 0; start <= written.size();) {
    const std::size_t end = std::min(written.find(separator, start), written.size());
    const std::string_view element = Trimmed(std::string_view(written).substr(start, end - start));
    if (!element.empty()) elements.emplace_back(element);
    start = end + 1;
  }
  return elements;
}

}  // namespace droxa
