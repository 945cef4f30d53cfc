#pragma once

#include <any>
#include <functional>
#include <memory>
#include <utility>

#include "platform/xpc/NSXPCProxyCreating.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

// A proxy whose calls block until they are answered; the reply runs on the calling thread, before the call
// returns. The reply stores what it got with setObjResult; a transport failure stores its error instead.
// Thread contract: one thread at a time.
class QVSyncProxy {
 public:
  virtual ~QVSyncProxy() = default;
  virtual QVProtocol *operator->() = 0;

  void setObjResult(std::any result, NSError error);
  void setBoolResult(bool result, NSError error) { setObjResult(result, std::move(error)); }
  // The stored result, or a default-constructed (nil) T.
  template <class T>
  T result() const {
    const T *value = std::any_cast<T>(&result_);
    return value ? *value : T();
  }
  NSError error() const { return error_; }

 private:
  std::any result_;
  NSError error_;
};

// The way to the daemon. What carries the calls is given by its maker: a connection over the daemon's socket
// (QVDaemonConnectionOverXPC.h) or an object in the same process.
// Thread contract: any thread.
class QVDaemonConnection {
 public:
  virtual ~QVDaemonConnection() = default;

  // The process's connection; one over the daemon's socket of the process's home, made on first use.
  static std::shared_ptr<QVDaemonConnection> defaultConnection();
  // For tests and for programs that carry the daemon themselves; null makes the next defaultConnection()
  // anew.
  static void setDefaultConnection(std::shared_ptr<QVDaemonConnection> connection);

  // Asynchronous calls; see NSXPCErrorHandler.
  virtual std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) = 0;
  virtual std::unique_ptr<QVSyncProxy> newSyncProxy() = 0;
  // Called on the pool whenever the way to the daemon was lost, with whatever the daemon kept for this
  // process (senders, subscriptions); the next call goes a new way. Replaces the handler before. A connection
  // that can't be lost never calls it.
  virtual void setInterruptionHandler(std::function<void()> handler);
};

}  // namespace droxa
