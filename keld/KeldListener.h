#pragma once

#include <memory>
#include <string>

#include "keld/Keld.h"
#include "platform/xpc/NSXPCListener.h"

namespace droxa::keld {

// Serves a daemon at a socket: each connection gets a session of its own, which ends with it.
// Thread contract: any thread.
class KeldListener final : public NSXPCListenerDelegate {
 public:
  // Null with `error` (may be null) set, as NSXPCListener says.
  static std::shared_ptr<KeldListener> listen(const std::shared_ptr<Keld> &daemon,
                                              const std::string &socketPath, NSError *error);
  ~KeldListener() override;
  // Accepts nobody any more.
  void invalidate();

  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &listener,
                                         const std::shared_ptr<NSXPCConnection> &connection) override;

 private:
  KeldListener(std::weak_ptr<Keld> daemon, std::shared_ptr<NSXPCListener> listener);
  const std::weak_ptr<Keld> daemon_;
  const std::shared_ptr<NSXPCListener> listener_;
};

}  // namespace droxa::keld
