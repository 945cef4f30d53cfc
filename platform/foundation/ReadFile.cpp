#include "platform/foundation/ReadFile.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace droxa {
namespace {

int codeOfKind(int descriptor) {
  struct stat status {};
  if (fstat(descriptor, &status) != 0) return errno;
  if (S_ISDIR(status.st_mode)) return EISDIR;
  return S_ISREG(status.st_mode) ? 0 : EINVAL;
}

FileContents readOpenFile(int descriptor, std::size_t most) {
  if (const int code = codeOfKind(descriptor)) return {code, {}};
  std::string bytes;
  char buffer[4096];
  for (;;) {
    const ssize_t length = read(descriptor, buffer, sizeof buffer);
    if (length < 0 && errno == EINTR) continue;
    if (length < 0) return {errno, {}};
    if (length == 0) return {0, std::move(bytes)};
    bytes.append(buffer, static_cast<std::size_t>(length));
    if (bytes.size() > most) return {EFBIG, {}};
  }
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
