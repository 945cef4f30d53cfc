#include <algorithm>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <unistd.h>
#include <vector>

#include "fileproviderd/mount/HiddenNames.h"
#include "fileproviderd/mount/Operations.h"

namespace droxa::requests {

namespace {

// Where the folders of the other containers stand in the root's listing: after what is in the folder itself.
constexpr off_t kFixedBase = 0x7ffffffffffff000;

// A folder that a program reads, page by page as it asks.
// Thread contract: the kernel sends the requests of one open folder one at a time.
struct OpenFolder {
  DIR *stream = nullptr;
  off_t offset = 0;                // of the next entry
  const dirent *kept = nullptr;    // read, and there was no room for it
  std::vector<std::string> fixed;  // of the root alone

  ~OpenFolder() {
    if (stream) ::closedir(stream);
  }
};

OpenFolder &folderOf(const fuse_file_info *info) {
  return *reinterpret_cast<OpenFolder *>(info->fh);
}

// The next entry from the stream or the fixed ones; null at the end.
struct Entry {
  const char *name = nullptr;
  mode_t type = 0;
  std::uint64_t inode = 0;
  off_t next = 0;
};

void moveTo(OpenFolder &folder, off_t offset) {
  if (offset == folder.offset) return;
  folder.kept = nullptr;
  folder.offset = offset;
  if (offset == 0)
    ::rewinddir(folder.stream);
  else if (offset < kFixedBase)
    ::seekdir(folder.stream, offset);
}

bool takeFixed(OpenFolder &folder, Entry *entry) {
  const auto index = static_cast<std::size_t>(folder.offset - kFixedBase);
  if (index >= folder.fixed.size()) return false;
  *entry = {folder.fixed[index].c_str(), S_IFDIR, static_cast<std::uint64_t>(kFixedBase) + index,
            folder.offset + 1};
  return true;
}

// An errno. The entry is taken when folder.offset is set to entry->next.
int nextEntry(MountedDrive &drive, NodeId node, OpenFolder &folder, Entry *entry) {
  *entry = {};
  while (folder.offset < kFixedBase) {
    errno = 0;
    const dirent *read = folder.kept ? folder.kept : ::readdir(folder.stream);
    if (!read && errno != 0) return errno;
    if (!read) {
      folder.offset = kFixedBase;
      break;
    }
    folder.kept = read;
    // Some file systems have the last entry followed by the greatest offset that there is.
    const off_t next = std::min<off_t>(read->d_off, kFixedBase);
    const bool isSelf = std::strcmp(read->d_name, ".") == 0 || std::strcmp(read->d_name, "..") == 0;
    if (isSelf || !drive.isOwnName(node, read->d_name)) {
      *entry = {read->d_name, static_cast<mode_t>(DTTOIF(read->d_type)), read->d_ino, next};
      return 0;
    }
    folder.kept = nullptr;
    folder.offset = next;
  }
  takeFixed(folder, entry);
  return 0;
}

bool isDots(const char *name) {
  return std::strcmp(name, ".") == 0 || std::strcmp(name, "..") == 0;
}

// What is known of an entry without a look at it.
fuse_entry_param plainEntry(const Entry &entry) {
  fuse_entry_param plain{};
  plain.attr.st_ino = entry.inode;
  plain.attr.st_mode = entry.type;
  return plain;
}

void fill(fuse_req_t request, NodeId node, std::size_t size, off_t offset, OpenFolder &folder, bool isPlus) {
  MountedDrive &drive = driveOf(request);
  std::vector<char> buffer(size);
  std::size_t used = 0;
  Entry entry;
  int error = 0;
  moveTo(folder, offset);
  while ((error = nextEntry(drive, node, folder, &entry)) == 0 && entry.name) {
    fuse_entry_param told = plainEntry(entry);
    const std::size_t needed = isPlus ? fuse_add_direntry_plus(request, nullptr, 0, entry.name, nullptr, 0)
                                      : fuse_add_direntry(request, nullptr, 0, entry.name, nullptr, 0);
    if (needed > size - used) break;
    struct stat status;
    if (isPlus && !isDots(entry.name) && drive.look(node, entry.name, &status) == 0)
      told = entryFor(drive, node, entry.name, status);
    if (isPlus)
      fuse_add_direntry_plus(request, buffer.data() + used, size - used, entry.name, &told, entry.next);
    else
      fuse_add_direntry(request, buffer.data() + used, size - used, entry.name, &told.attr, entry.next);
    used += needed;
    folder.offset = entry.next;
    folder.kept = nullptr;
  }
  if (used == 0 && error != 0)
    fuse_reply_err(request, error);
  else
    fuse_reply_buf(request, buffer.data(), used);
}

}  // namespace

void openFolder(fuse_req_t request, fuse_ino_t node, fuse_file_info *info) {
  MountedDrive &drive = driveOf(request);
  int error = 0;
  const SharedDescriptor path = drive.folder(node, &error);
  const int opened = path ? ::openat(path->get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC) : -1;
  auto folder = std::make_unique<OpenFolder>();
  folder->stream = opened >= 0 ? ::fdopendir(opened) : nullptr;
  if (!folder->stream) {
    if (path) error = errno;
    if (opened >= 0) ::close(opened);
    fuse_reply_err(request, error);
    return;
  }
  if (node == kRootNode)
    for (const auto &[name, place] : drive.roots->folders()) folder->fixed.push_back(name);
  const bool isWatched = drive.watch.isWatched(node);
  info->cache_readdir = isWatched;
  info->keep_cache = isWatched;
  info->fh = reinterpret_cast<std::uint64_t>(folder.get());
  if (fuse_reply_open(request, info) == -ENOENT) return;
  static_cast<void>(folder.release());
  if (drive.folderOpened)
    if (const std::string place = drive.replicaPath(node); !place.empty()) drive.folderOpened(place);
}

void readFolder(fuse_req_t request, fuse_ino_t node, std::size_t size, off_t offset, fuse_file_info *info) {
  fill(request, node, size, offset, folderOf(info), false);
}

void readFolderPlus(fuse_req_t request, fuse_ino_t node, std::size_t size, off_t offset,
                    fuse_file_info *info) {
  fill(request, node, size, offset, folderOf(info), true);
}

void closeFolder(fuse_req_t request, fuse_ino_t /*node*/, fuse_file_info *info) {
  delete &folderOf(info);
  fuse_reply_err(request, 0);
}

void syncFolder(fuse_req_t request, fuse_ino_t /*node*/, int dataOnly, fuse_file_info *info) {
  const int descriptor = ::dirfd(folderOf(info).stream);
  const int result = dataOnly != 0 ? ::fdatasync(descriptor) : ::fsync(descriptor);
  fuse_reply_err(request, result == 0 ? 0 : errno);
}

}  // namespace droxa::requests
