#include "platform/foundation/ProcessLock.h"

#include <array>
#include <cerrno>
#include <charconv>
#include <cstring>
#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

namespace droxa {

namespace {

int readIdentifier(int descriptor) {
  std::array<char, 32> text{};
  const ssize_t length = pread(descriptor, text.data(), text.size(), 0);
  int identifier = 0;
  if (length > 0) std::from_chars(text.data(), text.data() + length, identifier);
  return identifier > 0 ? identifier : 0;
}

}  // namespace

std::unique_ptr<ProcessLock> ProcessLock::acquire(const std::string &path, int *holder,
                                                  std::string *problem) {
  *holder = 0;
  const int descriptor = open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC | O_NOFOLLOW, 0600);
  if (descriptor < 0) {
    *problem = "can't open " + path + ": " + std::strerror(errno);
    return nullptr;
  }
  if (flock(descriptor, LOCK_EX | LOCK_NB) != 0) {
    const int code = errno;
    *holder = readIdentifier(descriptor);
    *problem = code == EWOULDBLOCK ? path + " is held by process " + std::to_string(*holder)
                                   : "can't lock " + path + ": " + std::strerror(code);
    close(descriptor);
    return nullptr;
  }
  const std::string text = std::to_string(getpid()) + "\n";
  if (ftruncate(descriptor, 0) != 0 ||
      pwrite(descriptor, text.data(), text.size(), 0) != static_cast<ssize_t>(text.size())) {
    *problem = "can't write " + path + ": " + std::strerror(errno);
    close(descriptor);
    return nullptr;
  }
  return std::unique_ptr<ProcessLock>(new ProcessLock(descriptor));
}

int ProcessLock::holderOf(const std::string &path) {
  const int descriptor = open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW);
  if (descriptor < 0) return 0;
  int holder = 0;
  if (flock(descriptor, LOCK_SH | LOCK_NB) != 0 && errno == EWOULDBLOCK) holder = readIdentifier(descriptor);
  close(descriptor);
  return holder;
}

ProcessLock::~ProcessLock() {
  close(descriptor_);
}

}  // namespace droxa
