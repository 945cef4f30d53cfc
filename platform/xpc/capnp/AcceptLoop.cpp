#include "platform/xpc/capnp/AcceptLoop.h"

#include <cerrno>
#include <fcntl.h>
#include <kj/debug.h>
#include <sys/socket.h>
#include <unistd.h>
#include <utility>

#include "platform/dispatch/dispatch.h"
#include "platform/foundation/NSError.h"

namespace droxa {

std::shared_ptr<AcceptLoop> AcceptLoop::create(int socket) {
  fcntl(socket, F_SETFL, fcntl(socket, F_GETFL) | O_NONBLOCK);
  return {new AcceptLoop(socket), XPCLoopDeleter()};
}

AcceptLoop::~AcceptLoop() {
  work_ = nullptr;
  observer_ = nullptr;
  if (open_) close(socket_);
}

void AcceptLoop::start(Accepted accepted) {
  XPCLoop::shared().post([self = shared_from_this(), handed = std::move(accepted)]() mutable {
    if (!self->open_ || self->observer_.get()) return;
    self->accepted_ = std::move(handed);
    self->observer_ = kj::heap<kj::UnixEventPort::FdObserver>(XPCLoop::shared().eventPort(), self->socket_,
                                                              kj::UnixEventPort::FdObserver::OBSERVE_READ);
    self->work_ = self->cycle().eagerlyEvaluate([](kj::Exception &&problem) {
      os_log_error(xpcLog(), "[ERROR] a listener stopped: %s", problem.getDescription().cStr());
    });
  });
}

void AcceptLoop::stop() {
  XPCLoop::shared().run([self = shared_from_this()] {
    self->work_ = nullptr;
    self->observer_ = nullptr;
    if (self->open_.exchange(false)) close(self->socket_);
  });
}

kj::Promise<void> AcceptLoop::cycle() {
  auto ready = observer_->whenBecomesReadable();  // before accepting, so that nobody is missed
  if (acceptAll()) {
    return ready.then([this] { return cycle(); });
  }
  ready = nullptr;
  return XPCLoop::shared().timer().afterDelay(100 * kj::MILLISECONDS).then([this] { return cycle(); });
}

bool AcceptLoop::acceptAll() {
  for (;;) {
    const int socket = accept4(socket_, nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK);
    if (socket >= 0) {
      dispatch_async_global([accepted = accepted_, socket] { accepted(socket); });
      continue;
    }
    if (errno == EINTR || errno == ECONNABORTED) continue;
    if (errno == EAGAIN) return true;
    os_log_error(xpcLog(), "[ERROR] a listener can't accept: %@", NSError::errorWithPOSIXCode(errno));
    return false;
  }
}

}  // namespace droxa
