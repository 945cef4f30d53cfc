#include "keld/TypeIdentifiers.h"

#include <algorithm>
#include <cctype>
#include <fstream>
#include <unordered_map>

namespace droxa::keld {

namespace {

struct TypeTable {
  std::unordered_map<std::string, std::string> bySuffix;  // without the first dot: "tar.gz", "txt"
  std::unordered_map<std::string, std::string> byName;    // "makefile"
};

std::string lowered(std::string_view text) {
  std::string result(text);
  std::transform(result.begin(), result.end(), result.begin(),
                 [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  return result;
}

// Lines of "weight:type:pattern[:flags]", the most weighty first.
bool readGlobs(const char *path, TypeTable &table) {
  std::ifstream file(path);
  std::string line;
  while (std::getline(file, line)) {
    if (line.empty() || line[0] == '#') continue;
    const std::size_t first = line.find(':');
    const std::size_t second = first == std::string::npos ? first : line.find(':', first + 1);
    if (second == std::string::npos) continue;
    const std::string type = line.substr(first + 1, second - first - 1);
    std::string pattern = line.substr(second + 1);
    pattern = pattern.substr(0, pattern.find(':'));
    const bool isSuffix = pattern.size() > 2 && pattern[0] == '*' && pattern[1] == '.';
    const std::string key =
        lowered(isSuffix ? std::string_view(pattern).substr(2) : std::string_view(pattern));
    if (key.find_first_of("*?[") != std::string::npos) continue;
    (isSuffix ? table.bySuffix : table.byName).emplace(key, type);
  }
  return !table.bySuffix.empty();
}

void useBuiltIn(TypeTable &table) {
  table.bySuffix = {{"txt", "text/plain"},
                    {"md", "text/markdown"},
                    {"html", "text/html"},
                    {"css", "text/css"},
                    {"csv", "text/csv"},
                    {"json", "application/json"},
                    {"xml", "application/xml"},
                    {"pdf", "application/pdf"},
                    {"zip", "application/zip"},
                    {"gz", "application/gzip"},
                    {"tar", "application/x-tar"},
                    {"jpg", "image/jpeg"},
                    {"jpeg", "image/jpeg"},
                    {"png", "image/png"},
                    {"gif", "image/gif"},
                    {"svg", "image/svg+xml"},
                    {"webp", "image/webp"},
                    {"mp3", "audio/mpeg"},
                    {"flac", "audio/flac"},
                    {"mp4", "video/mp4"},
                    {"mkv", "video/x-matroska"},
                    {"odt", "application/vnd.oasis.opendocument.text"},
                    {"ods", "application/vnd.oasis.opendocument.spreadsheet"},
                    {"docx", "application/vnd.openxmlformats-officedocument.wordprocessingml.document"},
                    {"xlsx", "application/vnd.openxmlformats-officedocument.spreadsheetml.sheet"}};
}

const TypeTable &table() {
  static const TypeTable types = [] {
    TypeTable made;
    if (!readGlobs("/usr/share/mime/globs2", made)) useBuiltIn(made);
    return made;
  }();
  return types;
}

}  // namespace

const std::string &TypeIdentifierForName(std::string_view name) {
  static const std::string unknown = kUnknownType;
  const TypeTable &types = table();
  const std::string key = lowered(name);
  if (const auto found = types.byName.find(key); found != types.byName.end()) return found->second;
  // The longest suffix decides: "tar.gz" before "gz". A leading dot begins no suffix.
  for (std::size_t dot = key.find('.', 1); dot != std::string::npos; dot = key.find('.', dot + 1)) {
    if (const auto found = types.bySuffix.find(key.substr(dot + 1)); found != types.bySuffix.end())
      return found->second;
  }
  return unknown;
}

}  // namespace droxa::keld
