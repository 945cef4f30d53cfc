#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/embedded/ChunkStore.h"

namespace droxa::embedded {
namespace {

// So many files are written before they are waited for: the disk gets them together.
constexpr std::size_t kFilesAtOnce = 64;
// Each wait for a file or a folder costs a turn of the disk. Beyond so many the file system is waited for
// once, which, measured with chunks of 1 MiB, takes a third of the time.
constexpr std::size_t kOneByOne = 4;

int writeWhole(int file, std::span<const std::uint8_t> bytes) {
  while (!bytes.empty()) {
    const ssize_t count = ::write(file, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return errno;
    bytes = bytes.subspan(static_cast<std::size_t>(count));
  }
  return 0;
}

int syncFolder(const std::string &path) {
  const int folder = open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (folder < 0) return errno;
  const int code = fsync(folder) == 0 ? 0 : errno;
  close(folder);
  return code;
}

}  // namespace

ChunkWriter::ChunkWriter(const ChunkStore &store)
    : store_(store),
      prefix_(store.unfinished_ + "/" + UUID::generate().description() + "-"),
      root_(open(store.chunks_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {}

ChunkWriter::~ChunkWriter() {
  if (root_ >= 0) close(root_);
  for (const Pending &pending : pending_) {
    close(pending.file);
    unlink(pending.temporary.c_str());
  }
}

int ChunkWriter::add(const std::string &digest, std::span<const std::uint8_t> bytes,
                     const std::function<bool(const std::string &digest)> &isKept) {
  const std::string path = store_.path(digest);
  if (store_.has(digest, bytes.size()) && utimensat(AT_FDCWD, path.c_str(), nullptr, 0) == 0) {
    // It may have been put there by a writer that hasn't made its folder safe yet.
    if (!isKept(digest)) folders_.insert(store_.folderOf(digest));
    return 0;
  }
  folders_.insert(store_.folderOf(digest));
  if (const int code = write(digest, bytes); code != 0) return code;
  return pending_.size() < kFilesAtOnce ? 0 : flush();
}

int ChunkWriter::write(const std::string &digest, std::span<const std::uint8_t> bytes) {
  const std::string temporary = prefix_ + std::to_string(count_++);
  const int file = open(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600);
  if (file < 0) return errno;
  pending_.push_back({file, temporary, digest});
  if (const int code = writeWhole(file, bytes); code != 0) return code;
  // The disk may begin; a file system that can't just begins later.
  sync_file_range(file, 0, 0, SYNC_FILE_RANGE_WRITE);
  return 0;
}

int ChunkWriter::flush() {
  if (const int code = syncFiles(); code != 0) return code;
  for (const Pending &pending : pending_) {
    if (rename(pending.temporary.c_str(), store_.path(pending.digest).c_str()) != 0) return errno;
  }
  for (const Pending &pending : pending_) close(pending.file);
  pending_.clear();
  return 0;
}

int ChunkWriter::syncFiles() {
  if (pending_.size() > kOneByOne) return syncAll();
  for (const Pending &pending : pending_) {
    if (fdatasync(pending.file) != 0) return errno;
  }
  return 0;
}

// The descriptor is older than what is written, so failures to write it are reported through it.
int ChunkWriter::syncAll() {
  if (root_ < 0) return EBADF;
  return syncfs(root_) == 0 ? 0 : errno;
}

int ChunkWriter::finish() {
  if (const int code = flush(); code != 0) return code;
  const int code = syncFolders();
  if (code == 0) folders_.clear();
  return code;
}

int ChunkWriter::syncFolders() {
  if (folders_.size() > kOneByOne) return syncAll();
  for (const std::string &folder : folders_) {
    if (const int code = syncFolder(folder); code != 0) return code;
  }
  return 0;
}

}  // namespace droxa::embedded
