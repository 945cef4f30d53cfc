#include "fileproviderd/mount/MountPoint.h"

#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <spawn.h>
#include <sstream>
#include <sys/mount.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "fileproviderd/mount/Descriptor.h"

extern char **environ;

namespace droxa {

namespace fs = std::filesystem;

namespace {

constexpr char kType[] = "fuse.droxa";

std::string unescaped(const std::string &text) {
  std::string plain;
  for (std::size_t at = 0; at < text.size(); ++at) {
    if (text[at] == '\\' && at + 3 < text.size()) {
      plain += static_cast<char>(std::strtoul(text.substr(at + 1, 3).c_str(), nullptr, 8));
      at += 3;
    } else {
      plain += text[at];
    }
  }
  return plain;
}

std::string programOnPath(const std::string &name) {
  const char *path = std::getenv("PATH");
  std::istringstream folders(path ? path : "/usr/bin:/bin");
  for (std::string folder; std::getline(folders, folder, ':');) {
    const std::string program = folder + "/" + name;
    if (::access(program.c_str(), X_OK) == 0) return program;
  }
  return {};
}

// Ends every request that the kernel still waits with; nobody is there to answer them.
void abortConnection(unsigned device) {
  const std::string file = "/sys/fs/fuse/connections/" + std::to_string(device) + "/abort";
  const Descriptor abort(::open(file.c_str(), O_WRONLY | O_CLOEXEC));
  if (abort && ::write(abort.get(), "1", 1) != 1) return;
}

void runUnmount(const std::string &path) {
  std::string program = programOnPath("fusermount3");
  if (program.empty()) return;
  std::array<std::string, 5> words{program, "-u", "-z", "-q", path};
  std::array<char *, 6> arguments{words[0].data(), words[1].data(), words[2].data(),
                                  words[3].data(), words[4].data(), nullptr};
  pid_t child = 0;
  if (::posix_spawn(&child, program.c_str(), nullptr, nullptr, arguments.data(), environ) != 0) return;
  int status = 0;
  while (::waitpid(child, &status, 0) < 0 && errno == EINTR) {
  }
}

}  // namespace

std::string whyMountingIsImpossible() {
  const Descriptor device(::open("/dev/fuse", O_RDWR | O_CLOEXEC));
  if (!device)
    return std::string("/dev/fuse can't be opened (") + std::strerror(errno) +
           "), so the drive isn't mounted; load the kernel's module \"fuse\"";
  if (::geteuid() != 0 && programOnPath("fusermount3").empty())
    return "there is no program fusermount3, so the drive isn't mounted; install the package fuse3";
  return {};
}

std::optional<MountPoint::Mounted> MountPoint::mounted() const {
  std::ifstream table("/proc/self/mountinfo");
  std::optional<Mounted> found;
  for (std::string line; std::getline(table, line);) {
    std::istringstream words(line);
    std::string number, parent, device, root, point, word, type, source;
    words >> number >> parent >> device >> root >> point;
    while (words >> word && word != "-") {
    }
    words >> type >> source;
    if (unescaped(point) != path_) continue;
    const auto minor = std::strtoul(device.substr(device.find(':') + 1).c_str(), nullptr, 10);
    found = Mounted{static_cast<unsigned>(minor), type == kType && unescaped(source) == source_};
  }
  return found;
}

unsigned MountPoint::connection() const {
  const auto there = mounted();
  return there && there->isOurs ? there->device : 0;
}

void MountPoint::takeOff(unsigned only) const {
  for (int mounts = 0; mounts < 16; ++mounts) {
    const auto there = mounted();
    if (!there || !there->isOurs || (only != 0 && there->device != only)) return;
    abortConnection(there->device);
    if (::geteuid() == 0 ? ::umount2(path_.c_str(), MNT_DETACH) != 0 : true) runUnmount(path_);
  }
}

std::string MountPoint::prepare() const {
  takeOff();
  if (mounted()) return path_ + ": something else is mounted there; name another folder";
  struct stat status;
  if (::lstat(path_.c_str(), &status) != 0) {
    std::error_code problem;
    fs::create_directories(path_, problem);
    return problem ? path_ + ": can't be made: " + problem.message() : std::string();
  }
  if (!S_ISDIR(status.st_mode)) return path_ + ": is not a folder; name another one";
  std::error_code problem;
  if (!fs::is_empty(path_, problem) || problem)
    return path_ + ": " + (problem ? problem.message() : "is not empty") + "; name an empty folder";
  return {};
}

}  // namespace droxa
