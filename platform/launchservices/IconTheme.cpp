#include "platform/launchservices/IconTheme.h"

#include <algorithm>
#include <cstdlib>
#include <set>
#include <string_view>
#include <unistd.h>
#include <vector>

#include "platform/foundation/NSFileHandle.h"
#include "platform/foundation/ReadFile.h"
#include "platform/launchservices/ApplicationFolders.h"
#include "platform/launchservices/KeyFile.h"

namespace droxa {
namespace {

constexpr char kThemeGroup[] = "Icon Theme";
constexpr char kLastTheme[] = "hicolor";
constexpr std::size_t kLargestPicture = 4U << 20;
constexpr std::string_view kSignature("\x89PNG\r\n\x1a\n", 8);

struct Picture {
  int side = 0;  // of a square, in pixels
  std::string path;
};

// The better one of two for that side: what has enough pixels wins, and then what has the least to spare.
bool FitsBetter(int one, int other, int side) {
  const bool isEnough = one >= side;
  if (isEnough != (other >= side)) return isEnough;
  return isEnough ? one < other : one > other;
}

NSData ReadPicture(const std::string &path) {
  const FileContents contents = ReadFile(path, kLargestPicture);
  const bool isPicture = contents.code == 0 && std::string_view(contents.bytes).starts_with(kSignature);
  return isPicture ? NSData::dataWithString(contents.bytes) : NSData();
}

std::vector<std::string> ThemeFolders() {
  std::vector<std::string> folders{NSHomeDirectory() + "/.icons"};
  for (const std::string &folder : ApplicationDataFolders()) folders.push_back(folder + "/icons");
  return folders;
}

// All that a theme has of the icon; a theme may be spread over several folders, and the first that describes
// it counts.
std::vector<Picture> PicturesIn(const KeyFile &theme, const std::string &name, const std::string &icon) {
  std::vector<Picture> pictures;
  const std::vector<std::string> folders = ThemeFolders();
  for (const char *key : {"Directories", "ScaledDirectories"}) {
    for (const std::string &directory : theme.list(kThemeGroup, key, ',')) {
      const int side =
          theme.number(directory, "Size").value_or(0) * theme.number(directory, "Scale").value_or(1);
      if (side <= 0) continue;
      for (const std::string &folder : folders) {
        std::string path = folder;
        path.append("/").append(name).append("/").append(directory).append("/").append(icon).append(".png");
        if (access(path.c_str(), R_OK) == 0) pictures.push_back({side, std::move(path)});
      }
    }
  }
  return pictures;
}

std::optional<KeyFile> ThemeNamed(const std::string &name) {
  if (name.empty() || name.front() == '.' || name.find('/') != std::string::npos) return std::nullopt;
  for (const std::string &folder : ThemeFolders()) {
    std::string path = folder;
    if (auto theme = KeyFile::read(path.append("/").append(name).append("/index.theme"))) return theme;
  }
  return std::nullopt;
}

// The user's theme and its ancestors, nearest first.
std::vector<std::string> ThemesToSearch() {
  std::vector<std::string> themes;
  std::vector<std::string> waiting{IconThemeName()};
  std::set<std::string> seen{kLastTheme};
  for (std::size_t i = 0; i < waiting.size(); ++i) {
    const std::string name = waiting[i];
    if (!seen.insert(name).second) continue;
    themes.push_back(name);
    if (const auto theme = ThemeNamed(name)) {
      const auto parents = theme->list(kThemeGroup, "Inherits", ',');
      waiting.insert(waiting.end(), parents.begin(), parents.end());
    }
  }
  themes.emplace_back(kLastTheme);
  return themes;
}

// The best picture that is one: a damaged file is passed over.
NSData BestOf(std::vector<Picture> pictures, int side) {
  std::stable_sort(pictures.begin(), pictures.end(), [side](const Picture &one, const Picture &other) {
    return FitsBetter(one.side, other.side, side);
  });
  for (const Picture &picture : pictures)
    if (NSData data = ReadPicture(picture.path)) return data;
  return {};
}

}  // namespace

std::string IconThemeName() {
  const char *configured = std::getenv("XDG_CONFIG_HOME");
  const std::string folder = configured && configured[0] == '/' ? configured : NSHomeDirectory() + "/.config";
  if (const auto settings = KeyFile::read(folder + "/gtk-3.0/settings.ini")) {
    const std::string name = settings->text("Settings", "gtk-icon-theme-name");
    if (!name.empty()) return name;
  }
  if (const auto settings = KeyFile::read(folder + "/kdeglobals")) {
    const std::string name = settings->text("Icons", "Theme");
    if (!name.empty()) return name;
  }
  return kLastTheme;
}

NSData IconImageData(const std::string &iconName, int side) {
  if (iconName.empty()) return {};
  if (iconName.front() == '/') return ReadPicture(iconName);
  if (iconName.find('/') != std::string::npos) return {};
  for (const std::string &name : ThemesToSearch()) {
    const auto theme = ThemeNamed(name);
    if (!theme) continue;
    if (NSData data = BestOf(PicturesIn(*theme, name, iconName), side)) return data;
  }
  for (const std::string &folder : ApplicationDataFolders())
    if (NSData data = ReadPicture(folder + "/pixmaps/" + iconName + ".png")) return data;
  return {};
}

}  // namespace droxa
