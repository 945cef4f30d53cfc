#include "keld/FolderReading.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <unistd.h>

namespace droxa::keld {

namespace {

std::int64_t nanoseconds(const struct statx_timestamp &time) {
  return static_cast<std::int64_t>(time.tv_sec) * 1'000'000'000 + static_cast<std::int64_t>(time.tv_nsec);
}

std::optional<FileFacts> factsOf(const struct statx &status, std::uint64_t ownDevice) {
  FileFacts facts;
  if (S_ISREG(status.stx_mode)) {
    facts.kind = NSFileProviderItemKind::document;
  } else if (S_ISDIR(status.stx_mode)) {
    facts.kind = NSFileProviderItemKind::folder;
  } else if (S_ISLNK(status.stx_mode)) {
    facts.kind = NSFileProviderItemKind::symbolicLink;
  } else {
    return std::nullopt;
  }
  facts.mode = status.stx_mode;
  facts.inode = status.stx_ino;
  const std::uint64_t device = makedev(status.stx_dev_major, status.stx_dev_minor);
  facts.device = device == ownDevice ? 0 : device;
  facts.links = status.stx_nlink;
  facts.size = status.stx_size;
  facts.birth = (status.stx_mask & STATX_BTIME) ? nanoseconds(status.stx_btime) : 0;
  facts.modified = nanoseconds(status.stx_mtime);
  facts.changed = nanoseconds(status.stx_ctime);
  return facts;
}

}  // namespace

OwnedDescriptor::~OwnedDescriptor() {
  if (descriptor_ >= 0) ::close(descriptor_);
}

OwnedDescriptor &OwnedDescriptor::operator=(OwnedDescriptor &&other) noexcept {
  if (this != &other) {
    if (descriptor_ >= 0) ::close(descriptor_);
    descriptor_ = other.release();
  }
  return *this;
}

int OwnedDescriptor::release() {
  const int descriptor = descriptor_;
  descriptor_ = -1;
  return descriptor;
}

void NameList::add(std::string_view name) {
  slices_.push_back({static_cast<std::uint32_t>(bytes_.size()), static_cast<std::uint32_t>(name.size())});
  bytes_.append(name);
}

void NameList::sort() {
  const std::string_view bytes = bytes_;
  std::sort(slices_.begin(), slices_.end(), [bytes](const Slice &a, const Slice &b) {
    return bytes.substr(a.offset, a.length) < bytes.substr(b.offset, b.length);
  });
  const auto end = std::unique(slices_.begin(), slices_.end(), [bytes](const Slice &a, const Slice &b) {
    return bytes.substr(a.offset, a.length) == bytes.substr(b.offset, b.length);
  });
  slices_.erase(end, slices_.end());
}

std::optional<FileFacts> ReadFileFacts(int folder, const std::string &name, std::uint64_t ownDevice) {
  struct statx status;
  const int flags = AT_SYMLINK_NOFOLLOW | AT_STATX_DONT_SYNC | AT_NO_AUTOMOUNT;
  if (::statx(folder, name.c_str(), flags, STATX_BASIC_STATS | STATX_BTIME, &status) != 0)
    return std::nullopt;
  return factsOf(status, ownDevice);
}

std::optional<FileFacts> ReadFolderFacts(int folder, std::uint64_t ownDevice) {
  struct statx status;
  if (::statx(folder, "", AT_EMPTY_PATH | AT_STATX_DONT_SYNC, STATX_BASIC_STATS | STATX_BTIME, &status) != 0)
    return std::nullopt;
  return factsOf(status, ownDevice);
}

int ReadFolderNames(int folder, NameList *names) {
  const int descriptor = ::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC | O_NONBLOCK);
  if (descriptor < 0) return errno;
  DIR *stream = ::fdopendir(descriptor);
  if (!stream) {
    const int error = errno;
    ::close(descriptor);
    return error;
  }
  errno = 0;
  while (const struct dirent *entry = ::readdir(stream)) {
    const std::string_view name = entry->d_name;
    if (name != "." && name != "..") names->add(name);
    errno = 0;
  }
  const int error = errno;
  ::closedir(stream);
  names->sort();
  return error;
}

OwnedDescriptor OpenFolder(int parent, const std::string &name) {
  return OwnedDescriptor(::openat(parent, name.c_str(), O_PATH | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
}

}  // namespace droxa::keld
