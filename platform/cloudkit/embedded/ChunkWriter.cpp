#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "platform/cloudkit/embedded/ChunkStore.h"

namespace droxa::embedded {
namespace {

// So many files are written before the first of them is waited for: the disk gets them together.
constexpr std::size_t kFilesAtOnce = 32;

// Each wait for a folder costs a turn of the disk; beyond so many the whole file system is waited for once.
// For files it is the other way round: measured, one wait for each of many that are being written costs no
// more than a plain copy of the same bytes.
constexpr std::size_t kFoldersOneByOne = 4;

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
    : store_(store), prefix_(store.unfinished_ + "/" + UUID::generate().description() + "-") {}

ChunkWriter::~ChunkWriter() {
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
  for (const Pending &pending : pending_) {
    if (fdatasync(pending.file) != 0) return errno;
  }
  for (const Pending &pending : pending_) {
    if (rename(pending.temporary.c_str(), store_.path(pending.digest).c_str()) != 0) return errno;
  }
  for (const Pending &pending : pending_) close(pending.file);
  pending_.clear();
  return 0;
}

int ChunkWriter::finish() {
  if (const int code = flush(); code != 0) return code;
  const int code = syncFolders();
  if (code == 0) folders_.clear();
  return code;
}

int ChunkWriter::syncFolders() {
  if (folders_.size() > kFoldersOneByOne) {
    const int folder = open(store_.chunks_.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC);
    if (folder < 0) return errno;
    const int code = syncfs(folder) == 0 ? 0 : errno;
    close(folder);
    return code;
  }
  for (const std::string &folder : folders_) {
    if (const int code = syncFolder(folder); code != 0) return code;
  }
  return 0;
}

}  // namespace droxa::embedded
