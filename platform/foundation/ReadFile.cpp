#include "platform/foundation/ReadFile.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace droxa {
namespace {

constexpr std::size_t kPiece = 64UL * 1024;

int codeOfKind(const struct stat &status) {
  if (S_ISDIR(status.st_mode)) return EISDIR;
  return S_ISREG(status.st_mode) ? 0 : EINVAL;
}

// In one piece where the file tells its size, and not a byte more than `most` and one.
FileContents readOpenFile(int descriptor, std::size_t most) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0) return {errno, {}};
  if (const int code = codeOfKind(status)) return {code, {}};
  std::string bytes;
  std::size_t used = 0;
  std::size_t more = static_cast<std::size_t>(status.st_size) + 1;
  for (;;) {
    if (used == bytes.size()) bytes.resize(used + std::min(more, most + 1 - used));
    const ssize_t length = read(descriptor, &bytes[used], bytes.size() - used);
    if (length < 0 && errno == EINTR) continue;
    if (length < 0) return {errno, {}};
    if (length == 0) break;
    used += static_cast<std::size_t>(length);
    if (used > most) return {EFBIG, {}};
    more = kPiece;
  }
  bytes.resize(used);
  return {0, std::move(bytes)};
}

}  // namespace

FileContents ReadFile(const std::string &path, std::size_t most) {
  const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NONBLOCK);  // a pipe must not block
  if (descriptor < 0) return {errno, {}};
  FileContents contents = readOpenFile(descriptor, most);
  close(descriptor);
  return contents;
}

}  // namespace droxa
