#include "platform/xpc/UnixSocket.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/file.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <sys/un.h>
#include <unistd.h>
#include <utility>

#ifndef SO_PEERPIDFD
#define SO_PEERPIDFD 77
#endif

namespace droxa {
namespace {

constexpr int ConnectSeconds = 5;

// A descriptor that is closed at the end of the scope.
class Descriptor {
 public:
  explicit Descriptor(int descriptor) : descriptor_(descriptor) {}
  Descriptor(const Descriptor &) = delete;
  Descriptor &operator=(const Descriptor &) = delete;
  ~Descriptor() {
    const int kept = errno;
    if (descriptor_ >= 0) close(descriptor_);
    errno = kept;
  }
  int get() const { return descriptor_; }
  int release() { return std::exchange(descriptor_, -1); }

 private:
  int descriptor_;
};

// A socket's address. One whose path is longer than the kernel takes leads through the folder's descriptor,
// which has to stay open while the address is used.
class SocketAddress {
 public:
  explicit SocketAddress(const std::string &path) : folder_(openFolder(path)) {
    address_.sun_family = AF_UNIX;
    std::string text = path;
    if (text.size() >= sizeof address_.sun_path && folder_.get() >= 0) {
      text = "/proc/self/fd/" + std::to_string(folder_.get()) + path.substr(path.rfind('/'));
    }
    valid_ = !text.empty() && text.find('\0') == std::string::npos && text.size() < sizeof address_.sun_path;
    if (valid_) std::memcpy(address_.sun_path, text.c_str(), text.size() + 1);
  }
  bool valid() const { return valid_; }
  const char *path() const { return address_.sun_path; }
  const sockaddr *address() const { return reinterpret_cast<const sockaddr *>(&address_); }
  socklen_t size() const { return sizeof address_; }

 private:
  static int openFolder(const std::string &path) {
    const std::size_t slash = path.rfind('/');
    if (slash == std::string::npos || path.size() < sizeof(sockaddr_un::sun_path)) return -1;
    return open(path.substr(0, slash + 1).c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC);
  }
  const Descriptor folder_;
  sockaddr_un address_ = {};
  bool valid_ = false;
};

int makeSocket() {
  return socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
}

int connectTo(const SocketAddress &address) {
  if (!address.valid()) return -ENAMETOOLONG;
  Descriptor made(makeSocket());
  if (made.get() < 0) return -errno;
  // A listener with a full queue blocks connect() for as long as a write may take.
  timeval limit = {ConnectSeconds, 0};
  setsockopt(made.get(), SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
  int result = 0;
  do {
    result = connect(made.get(), address.address(), address.size());
  } while (result < 0 && errno == EINTR);
  if (result < 0) return errno == EAGAIN ? -ETIMEDOUT : -errno;
  limit = {0, 0};
  setsockopt(made.get(), SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
  return made.release();
}

int bindAndListen(const SocketAddress &address) {
  Descriptor made(makeSocket());
  if (made.get() < 0) return -errno;
  fchmod(made.get(), 0600);  // the mode of the file that bind() makes
  if (bind(made.get(), address.address(), address.size()) < 0 || listen(made.get(), SOMAXCONN) < 0)
    return -errno;
  return made.release();
}

// Holds a folder's lock, so that of two processes that find a stale socket there one replaces it.
class FolderLock {
 public:
  explicit FolderLock(const std::string &path)
      : folder_(open(path.substr(0, path.rfind('/') + 1).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC)) {
    while (folder_.get() >= 0 && flock(folder_.get(), LOCK_EX) < 0 && errno == EINTR) {
    }
  }

 private:
  const Descriptor folder_;
};

bool nobodyListens(const SocketAddress &address) {
  struct stat status = {};
  if (lstat(address.path(), &status) < 0) return errno == ENOENT;
  if (!S_ISSOCK(status.st_mode)) return false;
  const int result = connectTo(address);
  if (result >= 0) close(result);
  return result == -ECONNREFUSED;
}

}  // namespace

int connectToSocketPath(const std::string &path) {
  return connectTo(SocketAddress(path));
}

int connectToSocketDescriptor(int descriptor) {
  return connectTo(SocketAddress("/proc/self/fd/" + std::to_string(descriptor)));
}

int listenAtSocketPath(const std::string &path) {
  const SocketAddress address(path);
  if (!address.valid()) return -ENAMETOOLONG;
  const FolderLock lock(path.find('/') == std::string::npos ? "./" + path : path);
  int result = bindAndListen(address);
  if (result == -EADDRINUSE && nobodyListens(address)) {
    unlink(address.path());
    result = bindAndListen(address);
  }
  return result;
}

int listenAnonymously(int *pathDescriptor) {
  const char *runtime = getenv("XDG_RUNTIME_DIR");
  std::string folder =
      std::string(runtime && *runtime == '/' && access(runtime, W_OK) == 0 ? runtime : "/tmp") +
      "/droxa-xpc-XXXXXX";
  if (!mkdtemp(folder.data())) return -errno;
  const std::string path = folder + "/s";
  int result = -ENAMETOOLONG;
  {
    const SocketAddress address(path);
    if (address.valid()) result = bindAndListen(address);
    if (result >= 0) {
      *pathDescriptor = open(address.path(), O_PATH | O_NOFOLLOW | O_CLOEXEC);
      if (*pathDescriptor < 0) {
        const int problem = -errno;
        close(result);
        result = problem;
      }
    }
    unlink(address.path());
  }
  rmdir(folder.c_str());
  return result;
}

int pathDescriptorOfSocket(int socket) {
  sockaddr_un address = {};
  socklen_t size = sizeof address - 1;  // leaves the path a terminator
  if (getsockname(socket, reinterpret_cast<sockaddr *>(&address), &size) < 0) return -1;
  if (address.sun_family != AF_UNIX || address.sun_path[0] == '\0') return -1;
  return open(address.sun_path, O_PATH | O_NOFOLLOW | O_CLOEXEC);
}

NSXPCPeer peerOfSocket(int socket) {
  NSXPCPeer peer;
  ucred credentials = {};
  socklen_t size = sizeof credentials;
  if (getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) < 0) return peer;
  peer.processIdentifier = credentials.pid;
  peer.userIdentifier = credentials.uid;
  peer.groupIdentifier = credentials.gid;
  int descriptor = -1;
  size = sizeof descriptor;
  if (getsockopt(socket, SOL_SOCKET, SO_PEERPIDFD, &descriptor, &size) < 0) {
    descriptor = static_cast<int>(syscall(SYS_pidfd_open, credentials.pid, 0));
  }
  if (descriptor >= 0) fcntl(descriptor, F_SETFD, FD_CLOEXEC);
  peer.processDescriptor = descriptor;
  return peer;
}

}  // namespace droxa
