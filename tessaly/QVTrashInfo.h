#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "tessaly/QVFileObjectID.h"

// What is noted of an item in the trash, in `info/<name>.trashinfo` beside `files/<name>`: the layout of a
// trash folder that the file managers of the desktop share, with keys of our own that they pass over.

namespace droxa {

inline constexpr char QVTrashInfoSuffix[] = ".trashinfo";
inline constexpr std::size_t QVLongestTrashInfo = 65536;

struct QVTrashInfo {
  std::string path;          // absolute, where it was
  std::string deletionDate;  // "2026-01-31T12:00:00", local time; "" when not told
  // The folder that held it, so that it is found after it was renamed or moved. Its inode tells whether the
  // identifier still means the same folder.
  std::optional<QVFileObjectID> folder;
  std::uint64_t folderInode = 0;
  bool operator==(const QVTrashInfo &) const = default;
};

std::string QVEncodeTrashInfo(const QVTrashInfo &info);
// nullopt unless it is a trash-info file with an absolute path in it that has no ".." or NUL; what else makes
// no sense is passed over.
std::optional<QVTrashInfo> QVParseTrashInfo(std::string_view text);
std::string QVTrashDateNow();

}  // namespace droxa
