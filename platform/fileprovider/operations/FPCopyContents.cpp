#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <linux/fs.h>
#include <sys/ioctl.h>
#include <unistd.h>
#include <vector>

#include "platform/fileprovider/operations/FPCopy.h"

namespace droxa {
namespace {

// Small enough that a cancellation is soon seen.
constexpr std::int64_t kPiece = std::int64_t{4} << 20U;

bool IsUnsupported(int error) {
  return error == EXDEV || error == EINVAL || error == ENOSYS || error == EOPNOTSUPP || error == EBADF;
}

// Copies pieces by the kernel where it can, else through memory.
// Thread contract: for one thread.
class Extents {
 public:
  Extents(int source, int destination, const FPCopyMeter &meter)
      : source_(source), destination_(destination), meter_(meter) {}

  int copy(std::int64_t start, std::int64_t end) {
    while (start < end) {
      if (meter_.isCancelled()) return ECANCELED;
      const std::int64_t copied = piece(start, std::min(end - start, kPiece));
      if (copied < 0) return errno;
      if (copied == 0) return ESTALE;
      start += copied;
      meter_.report(start);
    }
    return 0;
  }

 private:
  std::int64_t piece(std::int64_t start, std::int64_t length) {
    if (byKernel_) {
      off_t from = start;
      off_t to = start;
      const ssize_t copied =
          copy_file_range(source_, &from, destination_, &to, static_cast<std::size_t>(length), 0);
      // Some file systems answer 0 where they can't; reading tells whether it is the end.
      if (copied > 0 || (copied < 0 && !IsUnsupported(errno))) return copied;
      byKernel_ = false;
    }
    return throughMemory(start, length);
  }
  std::int64_t throughMemory(std::int64_t start, std::int64_t length) {
    buffer_.resize(std::size_t{1} << 20U);
    const ssize_t read =
        pread(source_, buffer_.data(),
              std::min<std::size_t>(buffer_.size(), static_cast<std::size_t>(length)), start);
    for (ssize_t written = 0; written < read;) {
      const ssize_t step = pwrite(destination_, buffer_.data() + written,
                                  static_cast<std::size_t>(read - written), start + written);
      if (step < 0) return -1;
      written += step;
    }
    return read;
  }

  const int source_;
  const int destination_;
  const FPCopyMeter &meter_;
  bool byKernel_ = true;
  std::vector<char> buffer_;
};

}  // namespace

int FPCopyContents(int source, int destination, std::int64_t size, const FPCopyMeter &meter) {
  if (ioctl(destination, FICLONE, source) == 0) return 0;
  Extents extents(source, destination, meter);
  for (std::int64_t end = 0; end < size;) {
    std::int64_t start = lseek(source, end, SEEK_DATA);
    if (start < 0 && errno == ENXIO) break;  // only a hole is left
    if (start < 0) start = end;              // a file system that doesn't tell
    end = lseek(source, start, SEEK_HOLE);
    end = end < 0 ? size : std::min(end, size);
    if (const int error = extents.copy(start, end)) return error;
  }
  return ftruncate(destination, size) == 0 ? 0 : errno;
}

}  // namespace droxa
