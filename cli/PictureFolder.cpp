#include "cli/PictureFolder.h"

#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <filesystem>
#include <unistd.h>

namespace droxa {

namespace {

constexpr std::size_t kLongestName = 255;
constexpr int kMostOfOneName = 10000;

// Leaves room for what comes after it, and doesn't cut a character in two.
std::string shortened(const std::string &name, std::size_t room) {
  if (name.size() <= room) return name;
  std::size_t end = room;
  while (end > 0 && (static_cast<unsigned char>(name[end]) & 0xc0) == 0x80) --end;
  return name.substr(0, end);
}

NSError writeAll(int file, const NSData &data) {
  auto bytes = data.bytes();
  while (!bytes.empty()) {
    const ssize_t count = ::write(file, bytes.data(), bytes.size());
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return NSError::errorWithPOSIXCode(errno);
    bytes = bytes.subspan(static_cast<std::size_t>(count));
  }
  return {};
}

}  // namespace

NSError PictureFolder::make() const {
  std::error_code code;
  std::filesystem::create_directories(path_, code);
  return code ? NSError::errorWithPOSIXCode(code.value()) : NSError();
}

std::string PictureFolder::write(const std::string &name, const NSData &picture, NSError *error) const {
  const std::string unfinished = path_ + "/.droxa-thumbnail-" + std::to_string(::getpid());
  const int file = ::open(unfinished.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOFOLLOW, 0666);
  if (file < 0) {
    *error = NSError::errorWithPOSIXCode(errno);
    return {};
  }
  *error = writeAll(file, picture);
  if (::close(file) != 0 && !*error) *error = NSError::errorWithPOSIXCode(errno);
  std::string path;
  for (int number = 1; !*error && number <= kMostOfOneName; ++number) {
    const std::string ending = (number == 1 ? "" : " " + std::to_string(number)) + ".png";
    path = path_ + "/" + shortened(name, kLongestName - ending.size()) + ending;
    if (::renameat2(AT_FDCWD, unfinished.c_str(), AT_FDCWD, path.c_str(), RENAME_NOREPLACE) == 0) return path;
    if (errno != EEXIST || number == kMostOfOneName) *error = NSError::errorWithPOSIXCode(errno);
  }
  ::unlink(unfinished.c_str());
  return {};
}

}  // namespace droxa
