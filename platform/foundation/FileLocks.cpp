#include "platform/foundation/FileLocks.h"

#include <cerrno>
#include <cstdint>
#include <fcntl.h>

namespace droxa {
namespace {

// FNV-1a, which goes on from folder to folder.
class PathHash {
 public:
  void add(char byte) { value_ = (value_ ^ static_cast<std::uint8_t>(byte)) * 0x100000001b3ULL; }
  // An even one that leaves room for the turnstile beside it. The product's high bits are its good ones.
  off_t offset() const { return static_cast<off_t>(value_ >> 3U) * 2; }

 private:
  std::uint64_t value_ = 0xcbf29ce484222325ULL;
};

struct flock LockOf(short type, off_t offset) {
  struct flock lock {};
  lock.l_type = type;
  lock.l_whence = SEEK_SET;
  lock.l_start = offset;
  lock.l_len = 1;
  return lock;
}

int Set(int descriptor, short type, off_t offset) {
  struct flock lock = LockOf(type, offset);
  if (fcntl(descriptor, F_OFD_SETLK, &lock) == 0) return 0;
  return errno == EACCES ? EAGAIN : errno;
}

}  // namespace

void FileLockPlan::add(off_t offset, bool isWriting, const std::string &path) {
  Entry &entry = entries_[offset];
  if (entry.path.empty() || (isWriting && !entry.isWriting)) entry = {isWriting, path};
}

void FileLockPlan::add(const std::string &path, bool isWriting) {
  PathHash hash;
  for (std::size_t i = 0; i < path.size(); ++i) {
    // The root's own lock, then one for each folder that ends before a slash.
    if (path[i] == '/') add(hash.offset(), false, i == 0 ? "/" : path.substr(0, i));
    hash.add(path[i]);
  }
  add(path == "/" ? PathHash().offset() : hash.offset(), isWriting, path);
}

int FileLockTry(int descriptor, off_t offset, bool isWriting) {
  return Set(descriptor, isWriting ? F_WRLCK : F_RDLCK, offset);
}

int FileLockTestFree(int descriptor, off_t offset) {
  struct flock lock = LockOf(F_WRLCK, offset);
  if (fcntl(descriptor, F_OFD_GETLK, &lock) != 0) return errno;
  return lock.l_type == F_UNLCK ? 0 : EAGAIN;
}

void FileLockRelease(int descriptor, off_t offset) {
  (void)Set(descriptor, F_UNLCK, offset);
}

}  // namespace droxa
