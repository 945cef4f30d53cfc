#include "cli/DocumentCopy.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <dirent.h>
#include <fcntl.h>
#include <linux/fs.h>
#include <memory>
#include <sys/ioctl.h>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace droxa {

namespace {

// Closes a descriptor at the end of a scope.
class Descriptor {
 public:
  explicit Descriptor(int number) : number_(number) {}
  ~Descriptor() {
    if (number_ >= 0) close(number_);
  }
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  int number() const { return number_; }
  explicit operator bool() const { return number_ >= 0; }

 private:
  const int number_;
};

bool stop(std::string *problem, const std::string &path) {
  *problem = "can't copy " + path + ": " + std::strerror(errno);
  return false;
}

bool writeAll(int target, const char *bytes, std::size_t length) {
  while (length > 0) {
    const ssize_t written = write(target, bytes, length);
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return false;
    bytes += written;
    length -= static_cast<std::size_t>(written);
  }
  return true;
}

enum class Outcome { done, unreadable, unwritable };

// As shared blocks, else inside the kernel, else through a buffer.
Outcome copyContents(int source, int target, off_t size) {
  if (ioctl(target, FICLONE, source) == 0) return Outcome::done;
  off_t copied = 0;
  while (copied < size) {
    const ssize_t step =
        copy_file_range(source, nullptr, target, nullptr, static_cast<std::size_t>(size - copied), 0);
    if (step < 0 && errno == EINTR) continue;
    if (step < 0 && errno == ENOSPC) return Outcome::unwritable;
    if (step <= 0) break;
    copied += step;
  }
  std::vector<char> buffer(256 * 1024);
  while (true) {
    const ssize_t length = read(source, buffer.data(), buffer.size());
    if (length < 0 && errno == EINTR) continue;
    if (length < 0) return Outcome::unreadable;
    if (length == 0) return Outcome::done;
    if (!writeAll(target, buffer.data(), static_cast<std::size_t>(length))) return Outcome::unwritable;
  }
}

}  // namespace

DocumentCopy::DocumentCopy(const std::string &except, Report report) : report_(std::move(report)) {
  struct stat status {};
  if (stat(except.c_str(), &status) != 0) return;
  exceptDevice_ = status.st_dev;
  exceptInode_ = status.st_ino;
}

bool DocumentCopy::copy(const std::string &source, const std::string &target, Result *result,
                        std::string *problem) {
  result_ = {};
  const Descriptor from(open(source.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!from) return stop(problem, source);
  const Descriptor into(open(target.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!into) return stop(problem, target);
  const bool done = copyFolder(from.number(), into.number(), source, problem);
  *result = result_;
  return done;
}

bool DocumentCopy::copyFolder(int source, int target, const std::string &path, std::string *problem) {
  const int listed = openat(source, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  const std::unique_ptr<DIR, int (*)(DIR *)> folder(listed < 0 ? nullptr : fdopendir(listed), closedir);
  if (!folder) {
    leaveOut(path, errno);
    return true;
  }
  while (const dirent *entry = readdir(folder.get())) {
    const std::string name = entry->d_name;
    if (name == "." || name == "..") continue;
    if (!copyEntry(source, target, name.c_str(), path + "/" + name, problem)) return false;
  }
  return true;
}

bool DocumentCopy::copyEntry(int source, int target, const char *name, const std::string &path,
                             std::string *problem) {
  struct stat status {};
  if (fstatat(source, name, &status, AT_SYMLINK_NOFOLLOW) != 0) {
    leaveOut(path, errno);
    return true;
  }
  if (S_ISREG(status.st_mode)) return copyDocument(source, target, name, path, problem);
  // By what it is, since it may be named in more than one way.
  if (status.st_dev == exceptDevice_ && status.st_ino == exceptInode_) return true;
  if (S_ISDIR(status.st_mode)) return enterFolder(source, target, name, path, problem);
  if (S_ISLNK(status.st_mode)) return copyLink(source, target, name, path, problem);
  leaveOut(path, 0);
  return true;
}

bool DocumentCopy::copyDocument(int source, int target, const char *name, const std::string &path,
                                std::string *problem) {
  // Without blocking, should a pipe have taken the file's place.
  const Descriptor from(openat(source, name, O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  struct stat status {};
  if (!from || fstat(from.number(), &status) != 0 || !S_ISREG(status.st_mode)) {
    leaveOut(path, errno);
    return true;
  }
  // Under a name that no listing shows until it is whole.
  const std::string partial = ".#droxa-copy-" + std::to_string(getpid());
  unlinkat(target, partial.c_str(), 0);
  const Descriptor into(openat(target, partial.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, 0600));
  if (!into) return stop(problem, path);
  const Outcome outcome = copyContents(from.number(), into.number(), status.st_size);
  const int code = errno;
  if (outcome != Outcome::done) {
    unlinkat(target, partial.c_str(), 0);
    errno = code;
    if (outcome == Outcome::unwritable) return stop(problem, path);
    leaveOut(path, code);
    return true;
  }
  fchmod(into.number(), (status.st_mode & 07777U) | S_IRUSR);
  const std::array<timespec, 2> times{status.st_atim, status.st_mtim};
  futimens(into.number(), times.data());
  // The link fails where a document is already; that one stays.
  const bool isNew = linkat(target, partial.c_str(), target, name, 0) == 0;
  unlinkat(target, partial.c_str(), 0);
  if (isNew) ++result_.documents;
  return true;
}

bool DocumentCopy::copyLink(int source, int target, const char *name, const std::string &path,
                            std::string *problem) {
  std::array<char, 4096> text{};
  const ssize_t length = readlinkat(source, name, text.data(), text.size() - 1);
  if (length < 0) {
    leaveOut(path, errno);
    return true;
  }
  if (symlinkat(text.data(), target, name) == 0) {
    ++result_.documents;
  } else if (errno != EEXIST) {
    return stop(problem, path);
  }
  return true;
}

bool DocumentCopy::enterFolder(int source, int target, const char *name, const std::string &path,
                               std::string *problem) {
  const Descriptor from(openat(source, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!from) {
    leaveOut(path, errno);
    return true;
  }
  if (mkdirat(target, name, 0700) == 0) {
    ++result_.folders;
  } else if (errno != EEXIST) {
    return stop(problem, path);
  }
  const Descriptor into(openat(target, name, O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!into) return stop(problem, path);
  if (!copyFolder(from.number(), into.number(), path, problem)) return false;
  struct stat status {};
  if (fstat(from.number(), &status) == 0) {
    fchmod(into.number(), (status.st_mode & 07777U) | S_IRWXU);
    const std::array<timespec, 2> times{status.st_atim, status.st_mtim};
    futimens(into.number(), times.data());
  }
  return true;
}

void DocumentCopy::leaveOut(const std::string &path, int code) {
  ++result_.leftOut;
  report_(path, code != 0 ? std::strerror(code) : "neither a file, a folder nor a symbolic link");
}

}  // namespace droxa
