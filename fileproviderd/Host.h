#pragma once

#include <map>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionLauncher.h"
#include "fileproviderd/HostServices.h"
#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/NSXPCListener.h"

namespace droxa {

// The framework's daemon of one home: the extension's launcher, what is followed, and the listener for
// clients. Thread contract: start() and stop() on one thread; clients connect on the pool. lock_ guards the
// connections.
class Host final : public NSXPCListenerDelegate, public std::enable_shared_from_this<Host> {
 public:
  // `extensionProgram` is started on demand for the process's home; `ownProgram` is this process's, which
  // understands Announcer::kArgument ("": it doesn't).
  static std::shared_ptr<Host> create(const std::string &extensionProgram,
                                      const std::string &ownProgram = {});

  // Listens at the home's socket. False, with `error` set, when that isn't possible.
  bool start(NSError *error);
  // Ends the listener, the clients' connections and the extension.
  void stop();

  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &listener,
                                         const std::shared_ptr<NSXPCConnection> &connection) override;
  FPDStatus status() const;
  const std::shared_ptr<ControlService> &control() const { return control_; }

 private:
  Host() = default;

  // Constant after create().
  std::int64_t startedNanoseconds_ = 0;
  std::string ownProgram_;
  std::shared_ptr<ExtensionLauncher> launcher_;
  std::shared_ptr<FollowedContainers> followed_;
  std::shared_ptr<HostSignalReceiver> signals_;
  std::shared_ptr<ControlService> control_;

  std::shared_ptr<NSXPCListener> listener_;  // between start() and stop()
  Mutex lock_;
  std::map<const NSXPCConnection *, std::shared_ptr<NSXPCConnection>> clients_ GUARDED_BY(lock_);
};

}  // namespace droxa
