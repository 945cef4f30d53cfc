#include "keld/contents/FileSteps.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <fcntl.h>
#include <linux/fs.h>
#include <string_view>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <sys/xattr.h>
#include <unistd.h>
#include <vector>

#include "keld/contents/DocumentMarker.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kCopyBytes = 128 * 1024;
constexpr std::size_t kBlockBytes = 4096;

// For file systems that can't rename without replacing.
int linkAndUnlink(int fromFolder, const std::string &from, int toFolder, const std::string &to) {
  if (::linkat(fromFolder, from.c_str(), toFolder, to.c_str(), 0) != 0) return errno;
  return ::unlinkat(fromFolder, from.c_str(), 0) == 0 ? 0 : errno;
}

int copyByHand(int from, int to, std::uint64_t offset, std::uint64_t size) {
  std::vector<char> buffer(kCopyBytes);
  while (offset < size) {
    const std::size_t wanted =
        static_cast<std::size_t>(std::min<std::uint64_t>(size - offset, buffer.size()));
    const ssize_t read = ::pread(from, buffer.data(), wanted, static_cast<off_t>(offset));
    if (read < 0 && errno == EINTR) continue;
    if (read <= 0) return read < 0 ? errno : EIO;
    ssize_t done = 0;
    while (done < read) {
      const ssize_t written = ::pwrite(to, buffer.data() + done, static_cast<std::size_t>(read - done),
                                       static_cast<off_t>(offset) + done);
      if (written < 0 && errno == EINTR) continue;
      if (written < 0) return errno;
      done += written;
    }
    offset += static_cast<std::uint64_t>(read);
  }
  return 0;
}

std::vector<std::string> attributeNames(int descriptor) {
  const ssize_t room = ::flistxattr(descriptor, nullptr, 0);
  if (room <= 0) return {};
  std::vector<char> bytes(static_cast<std::size_t>(room));
  const ssize_t length = ::flistxattr(descriptor, bytes.data(), bytes.size());
  std::vector<std::string> names;
  for (ssize_t at = 0; at < length;) {
    names.emplace_back(bytes.data() + at);
    at += static_cast<ssize_t>(names.back().size()) + 1;
  }
  return names;
}

bool isForeign(const std::string &name) {
  return name != kMarkerAttribute && (name.rfind("user.", 0) == 0 || name == "system.posix_acl_access");
}

}  // namespace

OwnedDescriptor OpenFileIn(int folder, const std::string &name, int flags, std::uint32_t mode) {
  return OwnedDescriptor(
      ::openat(folder, name.c_str(), flags | O_NOFOLLOW | O_NONBLOCK | O_NOCTTY | O_CLOEXEC, mode));
}

int SyncFolder(int folder) {
  const OwnedDescriptor readable(::openat(folder, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!readable) return errno;
  // EINVAL: a file system that has nothing to make durable.
  return ::fsync(readable.get()) == 0 || errno == EINVAL ? 0 : errno;
}

int RenameIfFree(int fromFolder, const std::string &from, int toFolder, const std::string &to) {
  if (::renameat2(fromFolder, from.c_str(), toFolder, to.c_str(), RENAME_NOREPLACE) == 0) return 0;
  if (errno != EINVAL && errno != ENOSYS) return errno;
  return linkAndUnlink(fromFolder, from, toFolder, to);
}

int ExchangeNames(int folder, const std::string &name, int otherFolder, const std::string &otherName) {
  return ::renameat2(folder, name.c_str(), otherFolder, otherName.c_str(), RENAME_EXCHANGE) == 0 ? 0 : errno;
}

int SetModified(int descriptor, std::int64_t nanoseconds) {
  constexpr std::int64_t kSecond = 1'000'000'000;
  std::int64_t seconds = nanoseconds / kSecond;
  std::int64_t rest = nanoseconds % kSecond;
  if (rest < 0) {
    rest += kSecond;
    --seconds;
  }
  const struct timespec times[2] = {{0, UTIME_OMIT}, {seconds, static_cast<long>(rest)}};
  return ::futimens(descriptor, times) == 0 ? 0 : errno;
}

int CopyContents(int from, int to, std::uint64_t size) {
  if (::ioctl(to, FICLONE, from) == 0) return 0;
  loff_t in = 0;
  loff_t out = 0;
  while (static_cast<std::uint64_t>(in) < size) {
    const std::size_t wanted =
        static_cast<std::size_t>(std::min<std::uint64_t>(size - static_cast<std::uint64_t>(in), 1U << 30));
    const ssize_t copied = ::copy_file_range(from, &in, to, &out, wanted, 0);
    if (copied < 0 && errno == EINTR) continue;
    if (copied < 0 && (errno == ENOSPC || errno == EDQUOT || errno == EIO)) return errno;
    if (copied <= 0) return copyByHand(from, to, static_cast<std::uint64_t>(in), size);
  }
  return 0;
}

bool CopyForeignAttributes(int from, int to) {
  bool copied = false;
  for (const auto &name : attributeNames(from)) {
    if (!isForeign(name)) continue;
    const ssize_t room = ::fgetxattr(from, name.c_str(), nullptr, 0);
    if (room < 0) continue;
    std::vector<char> value(static_cast<std::size_t>(room));
    const ssize_t length = ::fgetxattr(from, name.c_str(), value.data(), value.size());
    if (length < 0) continue;
    if (::fsetxattr(to, name.c_str(), value.data(), static_cast<std::size_t>(length), 0) == 0) copied = true;
  }
  return copied;
}

void RemoveAttributes(int descriptor) {
  for (const auto &name : attributeNames(descriptor))
    if (isForeign(name) || name == kMarkerAttribute) ::fremovexattr(descriptor, name.c_str());
}

int ReadDataCoverage(int descriptor, std::uint64_t size, DataCoverage *coverage) {
  *coverage = DataCoverage::none;
  const off_t data = ::lseek(descriptor, 0, SEEK_DATA);
  if (data < 0) return errno == ENXIO ? 0 : errno;
  *coverage = DataCoverage::some;
  if (data > 0) return 0;
  const off_t hole = ::lseek(descriptor, 0, SEEK_HOLE);
  if (hole < 0) return errno;
  if (static_cast<std::uint64_t>(hole) >= size) *coverage = DataCoverage::all;
  return 0;
}

// To the end of the last block: one that is punched in part is filled with zeros, not let go of.
int PunchOut(int file, std::uint64_t size) {
  constexpr std::uint64_t kStep = 1 << 20;
  const auto length = static_cast<off_t>((size + kStep - 1) / kStep * kStep);
  while (::fallocate(file, FALLOC_FL_PUNCH_HOLE | FALLOC_FL_KEEP_SIZE, 0, length) != 0)
    if (errno != EINTR) return errno;
  return 0;
}

bool BeginsWithZeros(int descriptor, std::uint64_t length) {
  std::array<char, kBlockBytes> bytes;
  const std::size_t wanted = static_cast<std::size_t>(std::min<std::uint64_t>(length, bytes.size()));
  const ssize_t read = ::pread(descriptor, bytes.data(), wanted, 0);
  return read == static_cast<ssize_t>(wanted) &&
         std::all_of(bytes.data(), bytes.data() + wanted, [](char c) { return c == 0; });
}

int WriteSmallFile(int folder, const std::string &name, const std::string &bytes, std::uint32_t mode) {
  const OwnedDescriptor file = OpenFileIn(folder, name, O_WRONLY | O_CREAT | O_EXCL, mode);
  if (!file) return errno;
  std::size_t done = 0;
  int error = 0;
  while (error == 0 && done < bytes.size()) {
    const ssize_t written = ::write(file.get(), bytes.data() + done, bytes.size() - done);
    if (written >= 0)
      done += static_cast<std::size_t>(written);
    else if (errno != EINTR)
      error = errno;
  }
  if (error == 0 && ::fsync(file.get()) != 0) error = errno;
  if (error != 0) ::unlinkat(folder, name.c_str(), 0);
  return error;
}

int ReadSmallFile(int folder, const std::string &name, std::size_t most, std::string *bytes) {
  const OwnedDescriptor file = OpenFileIn(folder, name, O_RDONLY);
  if (!file) return errno;
  struct stat status;
  if (::fstat(file.get(), &status) != 0) return errno;
  if (!S_ISREG(status.st_mode)) return EINVAL;
  bytes->resize(most + 1);
  const ssize_t read = ::pread(file.get(), bytes->data(), bytes->size(), 0);
  if (read < 0) return errno;
  if (static_cast<std::size_t>(read) > most) return EFBIG;
  bytes->resize(static_cast<std::size_t>(read));
  return 0;
}

}  // namespace droxa::keld
