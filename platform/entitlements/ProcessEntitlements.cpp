#include "platform/entitlements/ProcessEntitlements.h"

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <poll.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

namespace droxa {
namespace {

constexpr std::size_t LargestInfo = 256U << 10;

class Opened {
 public:
  explicit Opened(int descriptor) : descriptor_(descriptor) {}
  Opened(const Opened &) = delete;
  Opened &operator=(const Opened &) = delete;
  ~Opened() {
    if (descriptor_ >= 0) close(descriptor_);
  }
  int get() const { return descriptor_; }

 private:
  const int descriptor_;
};

NSError UnknownProcess(std::int32_t process, int code, const std::string &why) {
  return NSError::errorWithPOSIXCode(code, "process " + std::to_string(process) + ": " + why);
}

// A process descriptor becomes readable when its process ends.
bool IsAlive(int processDescriptor) {
  pollfd waiting{processDescriptor, POLLIN, 0};
  return poll(&waiting, 1, 0) == 0;
}

std::optional<std::string> ReadAt(int folder, const char *name) {
  const Opened file(openat(folder, name, O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  if (file.get() < 0) return std::nullopt;
  std::string text;
  char buffer[4096];
  while (text.size() < LargestInfo) {
    const ssize_t count = read(file.get(), buffer, sizeof buffer);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return std::nullopt;
    if (count == 0) break;
    text.append(buffer, static_cast<std::size_t>(count));
  }
  return text;
}

// When the process was started, in ticks since the machine was: the 22nd value of its "stat", whose second,
// the name, may hold anything. 0 when there is none.
std::uint64_t StartTime(int process) {
  const std::string text = ReadAt(process, "stat").value_or("");
  std::size_t at = text.rfind(')');
  for (int skipped = 2; at != std::string::npos && skipped < 22; ++skipped) at = text.find(' ', at + 1);
  return at == std::string::npos ? 0 : std::strtoull(text.c_str() + at, nullptr, 10);
}

// The value of "name" in the group [Application] of a key file; nullopt when there is none.
std::optional<std::string> ApplicationName(const std::string &keyFile) {
  bool inGroup = false;
  for (std::size_t start = 0; start < keyFile.size();) {
    const std::size_t end = std::min(keyFile.find('\n', start), keyFile.size());
    const std::string line = keyFile.substr(start, end - start);
    start = end + 1;
    if (!line.empty() && line[0] == '[') inGroup = line == "[Application]";
    if (inGroup && line.rfind("name=", 0) == 0 && line.size() > 5) return line.substr(5);
  }
  return std::nullopt;
}

// False when the process is in a sandbox that can't be looked into, or names no application.
bool ReadApplication(int process, ProcessApplication *application) {
  const Opened root(openat(process, "root", O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (root.get() < 0) return false;
  struct stat status {};
  if (fstatat(root.get(), ".flatpak-info", &status, AT_SYMLINK_NOFOLLOW) == 0) {
    application->flatpak = ApplicationName(ReadAt(root.get(), ".flatpak-info").value_or(""));
    if (!application->flatpak) return false;
  } else if (errno != ENOENT) {
    return false;
  }
  char path[4096];
  const ssize_t size = readlinkat(process, "exe", path, sizeof path);
  if (size > 0) application->executable.assign(path, static_cast<std::size_t>(size));
  if (fstatat(process, "exe", &status, 0) == 0) {
    application->device = status.st_dev;
    application->inode = status.st_ino;
  }
  return true;
}

// An executable is granted to by its path, and recognised by its file: what a process calls its path is its
// own affair. The file has to be as hard to change as the grant itself.
bool IsExecutable(const ProcessApplication &application, const std::string &path, uid_t owner) {
  struct stat status {};
  return application.inode != 0 && stat(path.c_str(), &status) == 0 && status.st_dev == application.device &&
         status.st_ino == application.inode && status.st_uid == owner &&
         (status.st_mode & (S_IWGRP | S_IWOTH)) == 0;
}

bool Applies(const EntitlementGrant &grant, const ProcessApplication &application, uid_t owner) {
  if (grant.kind == EntitlementGrant::Kind::flatpak) return application.flatpak == grant.application;
  return !application.flatpak && IsExecutable(application, grant.application, owner);
}

NSError LookAt(const NSXPCPeer &peer, ProcessApplication *application) {
  const std::int32_t number = peer.processIdentifier;
  if (number <= 0 || peer.processDescriptor < 0)
    return UnknownProcess(number, EINVAL, "the kernel names no process");
  const Opened process(open(("/proc/" + std::to_string(number)).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  if (process.get() < 0) return UnknownProcess(number, errno, "it can't be looked at");
  // The folder is of one process for good; this one, if its descriptor still finds it alive now.
  if (!IsAlive(peer.processDescriptor)) return UnknownProcess(number, ESRCH, "it has ended");
  const std::uint64_t started = StartTime(process.get());
  if (!ReadApplication(process.get(), application))
    return UnknownProcess(number, EACCES, "it doesn't let itself be looked at");
  const bool isSame = started != 0 && StartTime(process.get()) == started && IsAlive(peer.processDescriptor);
  return isSame ? NSError() : UnknownProcess(number, ESRCH, "it has ended");
}

}  // namespace

bool ProcessEntitlements::has(const std::string &entitlement) const {
  return std::any_of(grants.begin(), grants.end(), [&entitlement](const EntitlementGrant &grant) {
    return std::find(grant.entitlements.begin(), grant.entitlements.end(), entitlement) !=
           grant.entitlements.end();
  });
}

ProcessEntitlements EntitlementsOfPeer(const NSXPCPeer &peer, const EntitlementFiles &files) {
  ProcessEntitlements result;
  result.processIdentifier = peer.processIdentifier;
  result.error = LookAt(peer, &result.application);
  if (result.error) {
    result.application = {};
    return result;
  }
  EntitlementGrants all = files.read();
  result.problems = std::move(all.problems);
  for (EntitlementGrant &grant : all.grants)
    if (Applies(grant, result.application, files.owner())) result.grants.push_back(std::move(grant));
  return result;
}

}  // namespace droxa
