#include "platform/featureflags/feature_flags.h"

#include <cerrno>

#include "platform/foundation/Paths.h"
#include "platform/foundation/ReadFile.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa {
namespace {

constexpr std::size_t kLongestFlag = 64;

enum class Flag { unset, disabled, enabled };

struct Folders {
  std::string user;
  std::string system;
};

struct FoldersSetting {
  Mutex mutex;
  Folders folders GUARDED_BY(mutex);  // empty: the default one
};

// Never destroyed: threads may still ask while the process ends.
FoldersSetting &foldersSetting() {
  static auto *setting = new FoldersSetting;
  return *setting;
}

Folders folders() {
  Folders set;
  {
    FoldersSetting &setting = foldersSetting();
    const Lock lock(setting.mutex);
    set = setting.folders;
  }
  if (set.user.empty()) set.user = DroxaProcessHome().configuration() + "/feature-flags";
  if (set.system.empty()) set.system = "/etc/droxa/feature-flags";
  return set;
}

bool isName(std::string_view name) {
  return !name.empty() && name != "." && name != ".." &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

bool enables(std::string_view text) {
  constexpr std::string_view blanks = " \t\r\n";
  const std::size_t first = text.find_first_not_of(blanks);
  if (first == std::string_view::npos) return true;
  text = text.substr(first, text.find_last_not_of(blanks) - first + 1);
  return text == "1" || text == "true" || text == "yes" || text == "on";
}

// Anything that is there but isn't a readable, short file disables.
Flag readFlag(const std::string &path) {
  const FileContents contents = ReadFile(path, kLongestFlag);
  if (contents.code == ENOENT || contents.code == ENOTDIR) return Flag::unset;
  return contents.code == 0 && enables(contents.bytes) ? Flag::enabled : Flag::disabled;
}

}  // namespace

bool _os_feature_enabled_impl(std::string_view domain, std::string_view name) {
  if (!isName(domain) || !isName(name)) return false;
  const std::string file = "/" + std::string(domain) + "/" + std::string(name);
  const Folders where = folders();
  const Flag ofUser = readFlag(where.user + file);
  return (ofUser == Flag::unset ? readFlag(where.system + file) : ofUser) == Flag::enabled;
}

void OSFeatureFlagsSetFolders(std::string userFolder, std::string systemFolder) {
  FoldersSetting &setting = foldersSetting();
  const Lock lock(setting.mutex);
  setting.folders = {std::move(userFolder), std::move(systemFolder)};
}

}  // namespace droxa
