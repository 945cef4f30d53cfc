#include "keld/HomeLock.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <sys/file.h>
#include <unistd.h>

namespace droxa::keld {

namespace {

std::string holder(int descriptor) {
  char text[32];
  const ssize_t length = ::pread(descriptor, text, sizeof text - 1, 0);
  std::string number(text, length > 0 ? static_cast<std::size_t>(length) : 0);
  number.erase(number.find_last_not_of("\n ") + 1);
  return number.empty() ? "another process" : "process " + number;
}

}  // namespace

std::unique_ptr<HomeLock> HomeLock::take(const std::string &path, std::string *problem) {
  const int descriptor = ::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
  if (descriptor < 0) {
    *problem = path + ": " + std::strerror(errno);
    return nullptr;
  }
  if (::flock(descriptor, LOCK_EX | LOCK_NB) != 0) {
    *problem = errno == EWOULDBLOCK
                   ? "keld runs for this home already (" + holder(descriptor) + " holds " + path + ")"
                   : path + ": " + std::strerror(errno);
    ::close(descriptor);
    return nullptr;
  }
  const std::string text = std::to_string(::getpid()) + "\n";
  if (::ftruncate(descriptor, 0) != 0 || ::pwrite(descriptor, text.data(), text.size(), 0) < 0) {
    *problem = path + ": " + std::strerror(errno);
    ::close(descriptor);
    return nullptr;
  }
  return std::unique_ptr<HomeLock>(new HomeLock(descriptor));
}

// The file stays: removing it would let two processes lock two files of one name.
HomeLock::~HomeLock() {
  ::close(descriptor_);
}

}  // namespace droxa::keld
