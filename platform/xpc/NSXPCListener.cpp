#include "platform/xpc/NSXPCListener.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/UnixSocket.h"
#include "platform/xpc/capnp/AcceptLoop.h"
#include "platform/xpc/capnp/Connection.h"

namespace droxa {
namespace {

class Listener final : public NSXPCListener, public std::enable_shared_from_this<Listener> {
 public:
  Listener(int socket, int pathDescriptor, std::string path)
      : pathDescriptor_(pathDescriptor), path_(std::move(path)), accepting_(AcceptLoop::create(socket)) {
    if (!path_.empty() && stat(path_.c_str(), &status_) < 0) status_ = {};
  }
  ~Listener() override {
    endListening();
    if (pathDescriptor_ >= 0) close(pathDescriptor_);
  }

  void setDelegate(std::weak_ptr<NSXPCListenerDelegate> delegate) override {
    const Lock lock(mutex_);
    delegate_ = std::move(delegate);
  }
  NSXPCListenerEndpoint endpoint() const override {
    return NSXPCListenerEndpoint(fcntl(pathDescriptor_, F_DUPFD_CLOEXEC, 0));
  }
  void resume() override {
    accepting_->start([weak = weak_from_this()](int socket) {
      if (const auto self = weak.lock()) {
        self->accepted(socket);
      } else {
        close(socket);
      }
    });
  }
  void invalidate() override { endListening(); }

 private:
  // On the pool.
  void accepted(int socket) {
    std::shared_ptr<NSXPCListenerDelegate> delegate;
    {
      const Lock lock(mutex_);
      delegate = delegate_.lock();
    }
    const auto connection = XPCConnection::create(socket);
    if (!delegate || !delegate->listenerShouldAcceptNewConnection(shared_from_this(), connection))
      connection->invalidate();
  }

  // The socket in the file system goes with its listener, unless another one has taken its place.
  void endListening() {
    struct stat now = {};
    const bool own = !path_.empty() && accepting_->isOpen() && stat(path_.c_str(), &now) == 0 &&
                     now.st_ino == status_.st_ino && now.st_dev == status_.st_dev;
    if (own) unlink(path_.c_str());
    accepting_->stop();
  }

  // Constant after construction.
  const int pathDescriptor_;
  const std::string path_;
  struct stat status_ = {};
  const std::shared_ptr<AcceptLoop> accepting_;

  Mutex mutex_;
  std::weak_ptr<NSXPCListenerDelegate> delegate_ GUARDED_BY(mutex_);
};

std::shared_ptr<NSXPCListener> listening(int socket, int pathDescriptor, const std::string &path,
                                         NSError *error) {
  if (socket >= 0) return std::make_shared<Listener>(socket, pathDescriptor, path);
  if (error) {
    const std::string target = path.empty() ? "without a name" : "at " + path;
    *error = NSError::errorWithPOSIXCode(-socket, "Can't listen " + target);
  }
  return nullptr;
}

}  // namespace

NSXPCListenerEndpoint::NSXPCListenerEndpoint(int descriptor) : descriptor_(descriptor) {}

NSXPCListenerEndpoint::NSXPCListenerEndpoint(const NSXPCListenerEndpoint &other)
    : descriptor_(other.descriptor_ < 0 ? -1 : fcntl(other.descriptor_, F_DUPFD_CLOEXEC, 0)) {}

NSXPCListenerEndpoint::~NSXPCListenerEndpoint() {
  if (descriptor_ >= 0) close(descriptor_);
}

std::shared_ptr<NSXPCListener> NSXPCListener::listenerWithSocketPath(const std::string &path,
                                                                     NSError *error) {
  const int socket = listenAtSocketPath(path);
  const int pathDescriptor = socket < 0 ? -1 : open(path.c_str(), O_PATH | O_NOFOLLOW | O_CLOEXEC);
  return listening(socket, pathDescriptor, path, error);
}

std::shared_ptr<NSXPCListener> NSXPCListener::listenerWithDescriptor(int descriptor) {
  fcntl(descriptor, F_SETFD, FD_CLOEXEC);
  return std::make_shared<Listener>(descriptor, pathDescriptorOfSocket(descriptor), "");
}

std::shared_ptr<NSXPCListener> NSXPCListener::anonymousListener(NSError *error) {
  int pathDescriptor = -1;
  const int socket = listenAnonymously(&pathDescriptor);
  return listening(socket, pathDescriptor, "", error);
}

}  // namespace droxa
