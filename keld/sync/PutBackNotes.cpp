#include "keld/sync/PutBackNotes.h"

#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/foundation/NSDate.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVTrashInfo.h"

namespace droxa::keld {

namespace {

constexpr std::int64_t kSecond = 1'000'000'000;
constexpr char kDateFormat[] = "%Y-%m-%dT%H:%M:%S";
constexpr char kUnfinishedName[] = ".from-the-cloud";

std::string infoFolder() {
  return std::string(QVUbiquitousTrashContainerID) + "/" + QVTrashInfoFolderName;
}

std::int64_t nanosecondsOf(const std::string &date) {
  std::tm parts{};
  parts.tm_isdst = -1;
  const char *const end = ::strptime(date.c_str(), kDateFormat, &parts);
  const std::time_t seconds = end && *end == '\0' ? std::mktime(&parts) : -1;
  return seconds < 0 ? NSDate::now().nanosecondsSince1970() : std::int64_t{seconds} * kSecond;
}

std::string dateOf(std::int64_t nanoseconds) {
  const std::time_t seconds = nanoseconds / kSecond;
  std::tm parts{};
  std::array<char, 64> text{};
  if (!::localtime_r(&seconds, &parts)) return "";
  std::strftime(text.data(), text.size(), kDateFormat, &parts);
  return text.data();
}

std::optional<QVTrashInfo> readNote(int folder, const std::string &name) {
  const OwnedDescriptor file(
      ::openat(folder, (name + QVTrashInfoSuffix).c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (!file) return std::nullopt;
  std::string text(QVLongestTrashInfo, '\0');
  const ssize_t length = ::read(file.get(), text.data(), text.size());
  if (length <= 0) return std::nullopt;
  text.resize(static_cast<std::size_t>(length));
  return QVParseTrashInfo(text);
}

bool writeNote(int folder, const std::string &name, const std::string &text) {
  const OwnedDescriptor file(
      ::openat(folder, kUnfinishedName, O_WRONLY | O_CREAT | O_TRUNC | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!file) return false;
  const bool isWritten = ::write(file.get(), text.data(), text.size()) == static_cast<ssize_t>(text.size()) &&
                         ::fsync(file.get()) == 0;
  return isWritten && ::renameat(folder, kUnfinishedName, folder, (name + QVTrashInfoSuffix).c_str()) == 0;
}

}  // namespace

std::optional<PutBack> PutBackNotes::read(const std::string &name, const SyncRow &row) const {
  PutBack putBack;
  int code = 0;
  const OwnedDescriptor folder = files_.openFolder(infoFolder(), &code);
  const auto info = folder ? readNote(folder.get(), name) : std::nullopt;
  if (info) {
    const std::size_t slash = info->path.rfind('/');
    putBack.name = info->path.substr(slash + 1);
    putBack.parent = recordOfFolder(info->path.substr(0, slash), info->folder ? info->folder->number() : 0,
                                    info->folderInode);
    putBack.trashed = nanosecondsOf(info->deletionDate);
    if (!putBack.parent.empty()) return putBack;
  }
  const bool wasElsewhere = !row.tag.empty() && row.parent != ContainerRecord(QVUbiquitousTrashContainerID);
  if (!wasElsewhere) return std::nullopt;
  return PutBack{row.parent, row.name, info ? putBack.trashed : NSDate::now().nanosecondsSince1970()};
}

// By its number, as long as that means the same folder; else by where it was. "" when the cloud has no such
// folder.
std::string PutBackNotes::recordOfFolder(const std::string &path, std::uint64_t number,
                                         std::uint64_t inode) const {
  auto folder = number != 0 ? files_.item(number) : std::nullopt;
  if (folder && folder->facts.inode != inode) folder.reset();
  if (!folder) {
    const std::string replica = files_.replicaPath() + "/";
    ItemRecord there;
    if (path.compare(0, replica.size(), replica) != 0) return "";
    if (!files_.itemAtPath(path.substr(replica.size()), &there)) return "";
    folder = there;
  }
  ItemRecord within;
  within.parent = folder->id;
  const std::string record = files_.parentRecord(within);
  return record == ContainerRecord(QVUbiquitousTrashContainerID) ? "" : record;
}

void PutBackNotes::write(const std::string &name, const PutBack &putBack) const {
  QVTrashInfo info;
  info.deletionDate = dateOf(putBack.trashed);
  const auto known = files_.folderPath(putBack.parent);
  // A folder that is gone leads to the drive's own.
  const std::string path =
      known ? *known : files_.folderPath(ContainerRecord(QVUbiquitousDefaultContainerID)).value_or("");
  info.path = files_.absolute(path + "/" + putBack.name);
  ItemRecord folder;
  if (known && files_.itemAtPath(path, &folder)) {
    info.folder = QVFileObjectID::folderOrAliasID(folder.id);
    info.folderInode = folder.facts.inode;
  }
  ::mkdir(files_.absolute(infoFolder()).c_str(), 0700);
  int code = 0;
  const OwnedDescriptor notes = files_.openFolder(infoFolder(), &code);
  if (!notes || !writeNote(notes.get(), name, QVEncodeTrashInfo(info)))
    os_log_error(qvc_default_log(), "[ERROR] can't note where %s in the trash was: %s", name,
                 std::string(std::strerror(errno)));
}

}  // namespace droxa::keld
