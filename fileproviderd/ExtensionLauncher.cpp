#include "fileproviderd/ExtensionLauncher.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <signal.h>
#include <sys/socket.h>
#include <unistd.h>

#include "fileproviderd/ExtensionCalls.h"
#include "fileproviderd/HostErrors.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/oslog/os_log.h"

namespace droxa {

namespace {

using std::chrono::milliseconds;
using std::chrono::steady_clock;

constexpr milliseconds kReapingPatience{2'000};

os_log_t hostLog() {
  static const os_log_t log = os_log_create("com.quorva.fileproviderd", "extension");
  return log;
}

}  // namespace

ExtensionLauncher::ExtensionLauncher(Configuration configuration, std::function<void()> ended)
    : configuration_(std::move(configuration)), ended_(std::move(ended)) {}

ExtensionLauncher::~ExtensionLauncher() {
  if (connection_) connection_->invalidate();
  if (process_) process_->signal(SIGKILL);
}

void ExtensionLauncher::setHost(std::shared_ptr<NSFileProviderHostProtocol> host) {
  Lock held(lock_);
  host_ = std::move(host);
}

std::shared_ptr<NSFileProviderExtensionProtocol> ExtensionLauncher::extension(NSXPCErrorHandler handler,
                                                                              NSError *error) {
  std::shared_ptr<NSXPCConnection> connection;
  std::uint64_t run = 0;
  {
    Lock held(lock_);
    if (!connection_) awaitReaping(held, kReapingPatience);
    if (!connection_ && (!mayLaunch(error) || !launch(error))) return nullptr;
    connection = connection_;
    run = launches_;
  }
  // Calls fail before the connection tells of its end: whoever asks again then must get a new one.
  return connection->remoteObjectProxyWithErrorHandler<NSFileProviderExtensionProtocol>(
      [weak = weak_from_this(), run, handler = std::move(handler)](const NSError &failure) {
        const auto self = weak.lock();
        if (self && isConnectionGone(failure)) self->connectionEnded(run);
        handler(failure);
      });
}

bool ExtensionLauncher::mayLaunch(NSError *error) {
  if (isStopped_) {
    *error = unreachableError("the host is ending");
    return false;
  }
  const auto now = steady_clock::now();
  if (now >= notBefore_) return true;
  const auto seconds = std::chrono::ceil<std::chrono::seconds>(notBefore_ - now).count();
  *error = unreachableError("the extension ended " + std::to_string(quickEnds_) +
                            " times before it answered anything (" + lastEnd_ + "); it is started again in " +
                            std::to_string(seconds) + " s");
  return false;
}

bool ExtensionLauncher::launch(NSError *error) {
  int sockets[2] = {-1, -1};
  if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, sockets) != 0) {
    *error =
        NSError::errorWithPOSIXCode(errno, std::string("can't make a socket pair: ") + std::strerror(errno));
    return false;
  }
  process_ = ExtensionProcess::start(configuration_.program, configuration_.home, sockets[1], error);
  close(sockets[1]);
  if (!process_) {
    close(sockets[0]);
    os_log_error(hostLog(), "[ERROR] %@", error->localizedDescription());
    return false;
  }
  ++launches_;
  hasAnswered_ = false;
  os_log(hostLog(), "[NOTICE] started the extension as process %d", static_cast<int>(process_->identifier()));
  connect(sockets[0]);
  process_->awaitEnd([weak = weak_from_this(), run = launches_](const ExtensionProcess::End &end) {
    if (auto self = weak.lock()) self->processEnded(run, end);
  });
  return true;
}

void ExtensionLauncher::connect(int socket) {
  connection_ = NSXPCConnection::connectionWithDescriptor(socket);
  connection_->setExportedObject(NSFileProviderHostInterface(), host_);
  connection_->setRemoteObjectInterface(NSFileProviderExtensionInterface());
  connection_->setCallDeadline(configuration_.callDeadline);
  connection_->setInvalidationHandler([weak = weak_from_this(), run = launches_] {
    if (auto self = weak.lock()) self->connectionEnded(run);
  });
  connection_->resume();
}

// Without its connection the process is of no use, whatever it is still doing; it has nothing to lose.
void ExtensionLauncher::connectionEnded(std::uint64_t run) {
  std::shared_ptr<NSXPCConnection> released;
  {
    Lock held(lock_);
    if (run != launches_) return;
    released.swap(connection_);
    if (released && process_) process_->signal(SIGKILL);
    if (endTold_ >= run) return;
    endTold_ = run;
  }
  if (released) released->invalidate();
  ended_();
}

void ExtensionLauncher::processEnded(std::uint64_t run, const ExtensionProcess::End &end) {
  std::shared_ptr<NSXPCConnection> released;
  bool tell = false;
  {
    Lock held(lock_);
    if (run != launches_) return;
    os_log(hostLog(), "[NOTICE] the extension ended: %@", end.reason);
    process_ = nullptr;
    lastEnd_ = end.reason;
    released.swap(connection_);
    if (!hasAnswered_ && !end.wasAskedFor && ++quickEnds_ >= kMostQuickEnds) {
      const int doublings = std::min(quickEnds_ - kMostQuickEnds, 10);
      notBefore_ = steady_clock::now() +
                   std::min(configuration_.firstPause * (1 << doublings), configuration_.longestPause);
    }
    tell = endTold_ < run;
    endTold_ = run;
    reaped_.notify_all();
  }
  if (released) released->invalidate();
  if (tell) ended_();
}

void ExtensionLauncher::awaitReaping(Lock &held, milliseconds longest) {
  const auto until = steady_clock::now() + longest;
  while (process_ && !connection_ && reaped_.wait_until(held, until) == std::cv_status::no_timeout) {
  }
}

void ExtensionLauncher::noteAnswer() {
  Lock held(lock_);
  hasAnswered_ = true;
  quickEnds_ = 0;
}

std::string ExtensionLauncher::describeEnd() {
  Lock held(lock_);
  if (!connection_) awaitReaping(held, kReapingPatience);
  return lastEnd_.empty() ? "its connection was closed" : lastEnd_;
}

ExtensionLauncher::Status ExtensionLauncher::status() const {
  Lock held(lock_);
  Status status;
  if (process_) {
    status.processIdentifier = process_->identifier();
    status.startedNanoseconds = process_->startedNanoseconds();
  }
  status.launches = launches_;
  status.lastEnd = lastEnd_;
  return status;
}

void ExtensionLauncher::stop() {
  Lock held(lock_);
  isStopped_ = true;
  if (!process_) return;
  const auto process = process_;
  process->signal(SIGTERM);
  auto until = steady_clock::now() + kReapingPatience;
  while (process_ == process && reaped_.wait_until(held, until) == std::cv_status::no_timeout) {
  }
  if (process_ != process) return;
  process->signal(SIGKILL);
  until = steady_clock::now() + kReapingPatience;
  while (process_ == process && reaped_.wait_until(held, until) == std::cv_status::no_timeout) {
  }
}

}  // namespace droxa
