#include "keld/contents/FileLease.h"

#include <cctype>
#include <cerrno>
#include <csignal>
#include <cstdlib>
#include <dirent.h>
#include <fcntl.h>
#include <memory>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/contents/FileSteps.h"

namespace droxa::keld {

namespace {

struct CloseFolder {
  void operator()(DIR *folder) const { ::closedir(folder); }
};
using FolderStream = std::unique_ptr<DIR, CloseFolder>;

bool isOpenForWriting(int process, const char *descriptor) {
  std::string text;
  const std::string name = std::string("fdinfo/") + descriptor;
  if (ReadSmallFile(process, name, 4096, &text) != 0) return true;  // can't be told: taken for a writer
  const std::size_t at = text.find("flags:");
  if (at == std::string::npos) return true;
  const auto flags = std::strtoul(text.c_str() + at + 6, nullptr, 8);
  return (flags & O_ACCMODE) != O_RDONLY && (flags & O_PATH) == 0;
}

bool isPathAlone(int process, const char *descriptor) {
  std::string text;
  if (ReadSmallFile(process, std::string("fdinfo/") + descriptor, 4096, &text) != 0) return false;
  const std::size_t at = text.find("flags:");
  return at != std::string::npos && (std::strtoul(text.c_str() + at + 6, nullptr, 8) & O_PATH) != 0;
}

// Looks at the open files of one process, given by its folder in /proc.
bool hasOpen(int process, const struct stat &file, const std::string &exceptDescriptor, bool writersOnly) {
  const int folder = ::openat(process, "fd", O_RDONLY | O_DIRECTORY | O_CLOEXEC);
  if (folder < 0) return false;
  const FolderStream stream(::fdopendir(folder));
  if (!stream) {
    ::close(folder);
    return false;
  }
  while (const struct dirent *entry = ::readdir(stream.get())) {
    const char *name = entry->d_name;
    struct stat other;
    if (std::isdigit(static_cast<unsigned char>(name[0])) == 0 || exceptDescriptor == name) continue;
    if (::fstatat(folder, name, &other, 0) != 0) continue;
    if (other.st_ino != file.st_ino || other.st_dev != file.st_dev) continue;
    if (writersOnly ? isOpenForWriting(process, name) : !isPathAlone(process, name)) return true;
  }
  return false;
}

}  // namespace

bool IsOpenElsewhere(int descriptor, bool writersOnly) {
  struct stat file;
  if (::fstat(descriptor, &file) != 0) return true;
  const FolderStream processes(::opendir("/proc"));
  if (!processes) return false;
  const std::string own = std::to_string(::getpid());
  while (const struct dirent *entry = ::readdir(processes.get())) {
    const std::string_view name = entry->d_name;
    if (std::isdigit(static_cast<unsigned char>(name.front())) == 0) continue;
    const OwnedDescriptor process(
        ::openat(::dirfd(processes.get()), entry->d_name, O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!process) continue;
    const std::string except = name == own ? std::to_string(descriptor) : std::string();
    if (hasOpen(process.get(), file, except, writersOnly)) return true;
  }
  return false;
}

std::optional<FileLease> FileLease::take(int descriptor, Against against, bool useLeases) {
  if (useLeases) {
    // A broken lease is told by SIGIO, which ends a process that doesn't expect it. SIGURG is ignored by
    // default; whether the lease was broken is asked for where it matters.
    ::fcntl(descriptor, F_SETSIG, SIGURG);
    if (::fcntl(descriptor, F_SETLEASE, against == Against::writers ? F_RDLCK : F_WRLCK) == 0)
      return FileLease(descriptor, against, true);
    if (errno == EAGAIN || errno == EBUSY) return std::nullopt;
  }
  if (IsOpenElsewhere(descriptor, against == Against::writers)) return std::nullopt;
  return FileLease(descriptor, against, false);
}

FileLease::FileLease(FileLease &&other) noexcept
    : descriptor_(other.descriptor_), against_(other.against_), isKernels_(other.isKernels_) {
  other.isKernels_ = false;
  other.descriptor_ = -1;
}

bool FileLease::isUnbroken() const {
  const bool writersOnly = against_ == Against::writers;
  if (!isKernels_) return !IsOpenElsewhere(descriptor_, writersOnly);
  return ::fcntl(descriptor_, F_GETLEASE) == (writersOnly ? F_RDLCK : F_WRLCK);
}

void FileLease::release() {
  if (isKernels_) ::fcntl(descriptor_, F_SETLEASE, F_UNLCK);
  isKernels_ = false;
}

}  // namespace droxa::keld
