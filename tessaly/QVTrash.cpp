#include "tessaly/QVTrash.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdio>
#include <fcntl.h>
#include <memory>
#include <optional>
#include <string>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

#include "platform/foundation/UTF8.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileErrors.h"
#include "tessaly/QVPhysicalURL.h"
#include "tessaly/QVQueryItem.h"
#include "tessaly/QVTrashInfo.h"

namespace droxa {

namespace {

constexpr unsigned kMostNumbers = 100'000;
// With which both "<name>.trashinfo" and ".<name>.droxafault" are names that a file can have.
constexpr std::size_t kLongestName = 240;

class Descriptor {
 public:
  explicit Descriptor(int number) : number_(number) {}
  ~Descriptor() {
    if (number_ >= 0) ::close(number_);
  }
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  int get() const { return number_; }
  explicit operator bool() const { return number_ >= 0; }

 private:
  const int number_;
};

std::shared_ptr<const QVContainer> trashContainer() {
  const auto containers = QVContainer::allContainersByContainerID();
  const auto trash = containers.find(QVUbiquitousTrashContainerID);
  return trash == containers.end() ? nullptr : trash->second;
}

NSURL infoFolder(const QVContainer &trash) {
  return trash.url().URLByAppendingPathComponent(QVTrashInfoFolderName);
}

int openFolder(const std::string &path) {
  if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) return -1;
  return ::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC);
}

// As the daemon takes it before it removes notes. Whoever holds it too long is passed over: all that can be
// lost is a note.
void lockShared(int folder) {
  for (int attempt = 0; attempt < 200; ++attempt) {
    if (::flock(folder, LOCK_SH | LOCK_NB) == 0) return;
    std::this_thread::sleep_for(std::chrono::milliseconds(5));
  }
}

// "name.ext", "name 2.ext", …, short enough for all that is derived from it.
std::string numberedName(const std::string &name, unsigned number, bool isFolder) {
  if (number == 1 && name.size() <= kLongestName) return name;
  std::size_t dot = isFolder ? std::string::npos : name.rfind('.');
  if (dot == 0 || dot == std::string::npos || name.size() - dot > 32) dot = name.size();
  const std::string ending = (number == 1 ? "" : " " + std::to_string(number)) + name.substr(dot);
  const std::string_view base = std::string_view(name).substr(0, dot);
  return std::string(UTF8Prefix(base, kLongestName - ending.size())) + ending;
}

// One item on its way into the trash.
struct Move {
  NSURL source;            // the document's
  NSURL physical;          // what is on the disk
  bool isPromise = false;  // a promise stands for it
  bool isFolder = false;
  int files = -1, info = -1;  // the trash's folders, open
};

std::string physicalName(const Move &move, const std::string &name) {
  return move.isPromise ? QVPromiseNameForName(name).value_or(name) : name;
}

bool isTaken(const Move &move, const std::string &name) {
  struct stat status {};
  if (::fstatat(move.files, name.c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0) return true;
  const auto promise = QVPromiseNameForName(name);
  return promise && ::fstatat(move.files, promise->c_str(), &status, AT_SYMLINK_NOFOLLOW) == 0;
}

// Writes the whole note, durably; the file is there already and empty. 0 or an errno.
int writeNote(int file, const std::string &text) {
  for (std::size_t at = 0; at < text.size();) {
    const ssize_t written = ::write(file, text.data() + at, text.size() - at);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return written == 0 ? EIO : errno;
    at += static_cast<std::size_t>(written);
  }
  return ::fsync(file) == 0 ? 0 : errno;
}

// EEXIST when the name is taken by another note, or another item. The note is durable before the item comes;
// the move itself is one step, which a power failure leaves done or not, like any other move.
int moveAs(const Move &move, const std::string &name, const std::string &note) {
  const std::string noteName = name + QVTrashInfoSuffix;
  const Descriptor file(
      ::openat(move.info, noteName.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0600));
  if (!file) return errno;
  int error = isTaken(move, name) ? EEXIST : writeNote(file.get(), note);
  if (error == 0 && ::fsync(move.info) != 0) error = errno;
  if (error == 0 && ::renameat2(AT_FDCWD, move.physical.path().c_str(), move.files,
                                physicalName(move, name).c_str(), RENAME_NOREPLACE) != 0)
    error = errno;
  if (error != 0) ::unlinkat(move.info, noteName.c_str(), 0);
  return error;
}

NSError checkIsItem(const NSURL &url, const QVContainer &trash) {
  const auto refuse = [&](const std::string &why) {
    return qvc_error(QVErrorInvalidArgument, url.path() + ": " + why);
  };
  if (!url.isFileURL() || !qv_isInSyncedLocation(url))
    return refuse("isn't in the drive; it stays where it is");
  if (url.isEqualToOrBelow(trash.url())) return refuse("is in the trash already");
  if (qv_isInTessalyPrivateStorages(url)) return refuse("is private to the container's owner and no item");
  if (qv_containerIDIfIsDocumentsContainerURL(url))
    return refuse("holds a container's documents and must stay");
  return NSError();
}

// The folder's identifier is asked of the daemon; without it the path alone leads back.
QVTrashInfo noteOf(const NSURL &url) {
  QVTrashInfo info;
  info.path = url.path();
  info.deletionDate = QVTrashDateNow();
  const NSURL folder = url.URLByDeletingLastPathComponent();
  struct stat status {};
  if (::stat(folder.path().c_str(), &status) != 0) return info;
  const auto item = QVQueryItem::askDaemonQueryItemForURL(folder, false, nullptr);
  if (!item || !item->fileObjectID().isFolderOrAliasID()) return info;
  info.folder = item->fileObjectID();
  info.folderInode = status.st_ino;
  return info;
}

NSError moveFailure(int error, const NSURL &url) {
  if (error == EXDEV)
    return QVFileError(
        error, url.path(),
        "is on another file system than the trash and can't be moved there; delete it instead");
  return QVFileError(error, url.path(), "can't be moved to the trash");
}

NSError moveUnderFreeName(const Move &move, const NSURL &filesURL, NSURL *resultingURL) {
  const std::string note = QVEncodeTrashInfo(noteOf(move.source));
  lockShared(move.info);
  for (unsigned number = 1; number <= kMostNumbers; ++number) {
    const std::string name = numberedName(move.source.lastPathComponent(), number, move.isFolder);
    const int error = moveAs(move, name, note);
    if (error == EEXIST) continue;
    if (error != 0) return moveFailure(error, move.source);
    *resultingURL = filesURL.URLByAppendingPathComponent(name);
    return NSError();
  }
  return moveFailure(EEXIST, move.source);
}

std::optional<QVTrashInfo> readNote(const std::string &path) {
  const Descriptor file(::open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file || ::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode) ||
      status.st_size > static_cast<off_t>(QVLongestTrashInfo))
    return std::nullopt;
  std::string text(static_cast<std::size_t>(status.st_size), '\0');
  const ssize_t length = ::read(file.get(), text.data(), text.size());
  if (length < 0) return std::nullopt;
  text.resize(static_cast<std::size_t>(length));
  return QVParseTrashInfo(text);
}

// Where the folder that held it is now; nil when it is gone, or is in the trash itself.
NSURL folderOf(const QVTrashInfo &info, const QVContainer &trash) {
  if (!info.folder) return NSURL();
  const NSURL folder = qv_documentURLFromFileObjectID(*info.folder, nullptr);
  struct stat status {};
  if (!folder || folder.isEqualToOrBelow(trash.url()) || ::stat(folder.path().c_str(), &status) != 0)
    return NSURL();
  // After the item database was built anew, the identifier may mean another folder.
  return S_ISDIR(status.st_mode) && status.st_ino == info.folderInode ? folder : NSURL();
}

}  // namespace

NSError QVMoveToTrash(const NSURL &url, NSURL *resultingURL) {
  const auto trash = trashContainer();
  if (!trash) return qvc_error(QVErrorNoSuchItem, "the drive's trash isn't known; is the daemon running?");
  if (const NSError error = checkIsItem(url, *trash)) return error;
  Move move;
  move.source = url;
  move.physical = QVPhysicalURL(url);
  move.isPromise = !(move.physical == url);
  struct stat status {};
  if (::lstat(move.physical.path().c_str(), &status) != 0)
    return QVFileError(errno, url.path(), "can't be moved to the trash");
  move.isFolder = S_ISDIR(status.st_mode);
  const Descriptor files(openFolder(trash->documentsURL().path()));
  if (!files) return QVFileError(errno, trash->documentsURL().path(), "can't open the trash");
  const Descriptor info(openFolder(infoFolder(*trash).path()));
  if (!info) return QVFileError(errno, infoFolder(*trash).path(), "can't open the trash's notes");
  move.files = files.get();
  move.info = info.get();
  return moveUnderFreeName(move, trash->documentsURL(), resultingURL);
}

NSURL QVPutBackURL(const NSURL &url, NSError *error) {
  const auto fail = [&](const NSError &problem) {
    if (error) *error = problem;
    return NSURL();
  };
  const auto trash = trashContainer();
  const NSURL files = trash ? trash->documentsURL() : NSURL();
  if (!files || !url.isEqualToOrBelow(files) || url == files)
    return fail(qvc_error(QVErrorInvalidArgument, url.path() + ": isn't in the trash"));
  // What is noted is noted of the outermost item; what is below it was below it before.
  const std::string below = url.path().substr(files.path().size() + 1);
  const std::size_t slash = std::min(below.find('/'), below.size());
  const auto info = readNote(infoFolder(*trash).path() + "/" + below.substr(0, slash) + QVTrashInfoSuffix);
  const auto nothingNoted = [&](const std::string &why) {
    return fail(NSError(NSCocoaErrorDomain, NSFileReadNoSuchFileError,
                        {{NSLocalizedDescriptionKey, url.path() + ": " + why + "; choose a folder for it"}}));
  };
  if (!info) return nothingNoted("nobody has noted where it came from");
  const NSURL path = NSURL::fileURLWithPath(info->path);
  const NSURL folder = folderOf(*info, *trash);
  const NSURL place = folder ? folder.URLByAppendingPathComponent(path.lastPathComponent()) : path;
  if (!qv_isInSyncedLocation(place) || qv_isInTessalyPrivateStorages(place) ||
      place.isEqualToOrBelow(trash->url()))
    return nothingNoted("it came from " + path.path() + ", which is no place in the drive");
  return NSURL::fileURLWithPath(place.path() + below.substr(slash));
}

}  // namespace droxa
