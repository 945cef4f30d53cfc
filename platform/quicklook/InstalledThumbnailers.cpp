#include "platform/quicklook/InstalledThumbnailers.h"

#include <algorithm>
#include <cstdlib>
#include <fstream>
#include <set>
#include <sstream>
#include <unistd.h>
#include <utility>

#include "platform/quicklook/QLThumbnailStoreRetrievalOperation.h"

namespace droxa {

namespace {

namespace fs = std::filesystem;

constexpr std::size_t kLongestLine = 64 << 10;

std::string environment(const char *name, std::string otherwise) {
  const char *value = std::getenv(name);
  return value && *value ? std::string(value) : std::move(otherwise);
}

std::vector<std::string> split(const std::string &text, char separator) {
  std::vector<std::string> parts;
  std::istringstream stream(text);
  for (std::string part; std::getline(stream, part, separator);)
    if (!part.empty()) parts.push_back(part);
  return parts;
}

// The first goes before the others.
std::vector<std::string> thumbnailerFolders() {
  std::vector<std::string> folders{environment("XDG_DATA_HOME", environment("HOME", "") + "/.local/share")};
  for (const std::string &folder : split(environment("XDG_DATA_DIRS", "/usr/local/share:/usr/share"), ':'))
    folders.push_back(folder);
  std::vector<std::string> result;
  for (const std::string &folder : folders)
    if (folder[0] == '/') result.push_back(folder + "/thumbnailers");
  return result;
}

std::string trimmed(const std::string &text) {
  const std::size_t begin = text.find_first_not_of(" \t\r");
  if (begin == std::string::npos) return "";
  return text.substr(begin, text.find_last_not_of(" \t\r") - begin + 1);
}

// As desktop entries quote: words are split at spaces, "…" holds one together, a backslash keeps the next
// character. nullopt when a quotation doesn't end.
std::optional<std::vector<std::string>> wordsOf(const std::string &line) {
  std::vector<std::string> words;
  std::string word;
  bool isQuoted = false, isWord = false;
  for (std::size_t index = 0; index < line.size(); ++index) {
    const char character = line[index];
    if (character == '"') {
      isQuoted = !isQuoted;
      isWord = true;
    } else if (character == '\\' && index + 1 < line.size()) {
      word.push_back(line[++index]);
      isWord = true;
    } else if (character == ' ' && !isQuoted) {
      if (isWord) words.push_back(std::exchange(word, ""));
      isWord = false;
    } else {
      word.push_back(character);
      isWord = true;
    }
  }
  if (isQuoted) return std::nullopt;
  if (isWord) words.push_back(word);
  return words;
}

// "" when there is no such program.
std::string programPath(const std::string &name) {
  if (name.empty()) return "";
  if (name.find('/') != std::string::npos) return ::access(name.c_str(), X_OK) == 0 ? name : "";
  for (const std::string &folder : split(environment("PATH", "/usr/local/bin:/usr/bin:/bin"), ':')) {
    const std::string path = folder + "/" + name;
    if (::access(path.c_str(), X_OK) == 0) return path;
  }
  return "";
}

std::map<std::string, std::string> readEntry(const std::string &path) {
  std::map<std::string, std::string> values;
  std::ifstream file(path);
  bool isInGroup = false;
  for (std::string line; std::getline(file, line);) {
    line = trimmed(line);
    if (line.empty() || line[0] == '#' || line.size() > kLongestLine) continue;
    if (line[0] == '[') {
      isInGroup = line == "[Thumbnailer Entry]";
      continue;
    }
    const std::size_t equals = line.find('=');
    if (isInGroup && equals != std::string::npos)
      values.emplace(trimmed(line.substr(0, equals)), trimmed(line.substr(equals + 1)));
  }
  return values;
}

std::vector<std::string> thumbnailerFilesIn(const std::string &folder) {
  std::vector<std::string> names;
  std::error_code problem;
  for (fs::directory_iterator each(folder, problem), end; !problem && each != end; each.increment(problem))
    if (each->path().extension() == ".thumbnailer") names.push_back(each->path().filename().string());
  std::sort(names.begin(), names.end());
  return names;
}

}  // namespace

std::optional<std::pair<InstalledThumbnailer, std::vector<std::string>>> ReadThumbnailerFile(
    const std::string &path) {
  auto values = readEntry(path);
  auto words = wordsOf(values["Exec"]);
  const std::vector<std::string> types = split(values["MimeType"], ';');
  if (!words || words->empty() || types.empty()) return std::nullopt;
  const std::string tried = values["TryExec"];
  if (!tried.empty() && programPath(tried).empty()) return std::nullopt;
  words->front() = programPath(words->front());
  if (words->front().empty()) return std::nullopt;
  return std::make_pair(InstalledThumbnailer{std::move(*words)}, types);
}

InstalledThumbnailers &InstalledThumbnailers::shared() {
  static InstalledThumbnailers installed;
  return installed;
}

std::optional<InstalledThumbnailer> InstalledThumbnailers::forType(const std::string &mimeType) {
  const std::vector<std::string> folders = thumbnailerFolders();
  const Lock lock(mutex_);
  if (!isCurrent(folders)) read(folders);
  const auto found = byType_.find(mimeType);
  if (found == byType_.end()) return std::nullopt;
  return found->second;
}

namespace {

fs::file_time_type changed(const std::string &path) {
  std::error_code problem;
  return fs::last_write_time(path, problem);
}

}  // namespace

// A file that is written over in place leaves its folder's date as it is.
bool InstalledThumbnailers::isCurrent(const std::vector<std::string> &folders) const {
  return folders == folders_ && std::all_of(stamp_.begin(), stamp_.end(), [](const auto &stamped) {
           return changed(stamped.first) == stamped.second;
         });
}

void InstalledThumbnailers::stamp(const std::string &path) {
  stamp_.emplace_back(path, changed(path));
}

void InstalledThumbnailers::read(const std::vector<std::string> &folders) {
  folders_ = folders;
  stamp_.clear();
  byType_.clear();
  std::set<std::string> seen;
  for (const std::string &folder : folders) {
    stamp(folder);
    for (const std::string &name : thumbnailerFilesIn(folder)) {
      const std::string path = folder + "/" + name;
      stamp(path);
      if (!seen.insert(name).second) continue;
      const auto described = ReadThumbnailerFile(path);
      if (!described) continue;
      for (const std::string &type : described->second) byType_.emplace(trimmed(type), described->first);
    }
  }
}

bool QLThumbnailStoreRetrievalOperation::canMostRecentClientsGenerateThumbnailsForUTI(
    const std::string &mimeType) {
  return InstalledThumbnailers::shared().forType(mimeType).has_value();
}

}  // namespace droxa
