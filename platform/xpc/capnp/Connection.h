#pragma once

#include <functional>
#include <memory>

#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/NSXPCConnection.h"
#include "platform/xpc/capnp/Session.h"

namespace droxa {

// A connection: what its owner set up, over the session on the loop.
// Thread contract: as NSXPCConnection says; sessionDidEnd() once, on the pool.
class XPCConnection final : public NSXPCConnection, public std::enable_shared_from_this<XPCConnection> {
 public:
  static std::shared_ptr<XPCConnection> create(int socket);  // takes ownership
  ~XPCConnection() override;

  void setRemoteObjectInterface(const NSXPCInterface &interface) override;
  void setInterruptionHandler(std::function<void()> handler) override;
  void setInvalidationHandler(std::function<void()> handler) override;
  void setCallDeadline(std::chrono::milliseconds deadline) override { session_->setCallDeadline(deadline); }
  void resume() override;
  void invalidate() override;
  NSXPCPeer peer() const override { return peer_; }

  bool wasResumed() const;
  void sessionDidEnd(bool byPeer);

 protected:
  void setExportedObjectErased(const NSXPCInterface &interface, std::shared_ptr<void> object) override;
  std::shared_ptr<void> remoteObjectProxyErased(NSXPCErrorHandler handler, bool synchronous) override;

 private:
  XPCConnection(std::shared_ptr<Session> session, const NSXPCPeer &peer);

  struct Setup {
    const NSXPCInterface *exportedInterface = nullptr;
    std::shared_ptr<void> exportedObject;
    const NSXPCInterface *remoteInterface = nullptr;
    std::function<void()> interruptionHandler;
    std::function<void()> invalidationHandler;
  };

  const std::shared_ptr<Session> session_;
  const NSXPCPeer peer_;  // the descriptor is closed with the connection
  mutable Mutex mutex_;
  Setup setup_ GUARDED_BY(mutex_);
  bool resumed_ GUARDED_BY(mutex_) = false;
  bool ended_ GUARDED_BY(mutex_) = false;
};

}  // namespace droxa
