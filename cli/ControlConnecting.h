#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

// The way to the host: its socket, or an object in a test.
// Thread contract: any thread.
class ControlConnecting {
 public:
  virtual ~ControlConnecting() = default;
  // The host; null with `error` set when it can't be reached. A call whose transport fails ends in `handler`.
  virtual std::shared_ptr<FPDControlProtocol> control(NSXPCErrorHandler handler, NSError *error) = 0;
  // Called once when the host has gone; set before the first call.
  virtual void setEndHandler(std::function<void()> handler) = 0;
};

// Over the host's socket of a home.
class ControlConnectionOverXPC final : public ControlConnecting {
 public:
  ControlConnectionOverXPC(std::string socketPath, std::chrono::milliseconds deadline);
  ~ControlConnectionOverXPC() override;
  std::shared_ptr<FPDControlProtocol> control(NSXPCErrorHandler handler, NSError *error) override;
  void setEndHandler(std::function<void()> handler) override { endHandler_ = std::move(handler); }

 private:
  const std::string socketPath_;
  const std::chrono::milliseconds deadline_;
  std::function<void()> endHandler_;
  std::shared_ptr<NSXPCConnection> connection_;  // from the first call on; calls are made on one thread
};

}  // namespace droxa
