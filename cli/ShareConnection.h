#pragma once

#include <memory>
#include <string>
#include <utility>

#include "cli/CommandContext.h"
#include "cli/Waiting.h"
#include "platform/foundation/NSProgress.h"

namespace droxa {

// A connection to a service on an item, straight to the extension's listener. Ends with this object.
// Thread contract: one thread.
class ShareConnection {
 public:
  ShareConnection() = default;
  ~ShareConnection() {
    if (connection_) connection_->invalidate();
  }
  ShareConnection(const ShareConnection &) = delete;
  ShareConnection &operator=(const ShareConnection &) = delete;

  NSError open(CommandContext &context, const char *service, const std::string &identifier,
               const NSXPCInterface &interface) {
    timeout_ = context.timeout;
    auto offered = context.host->service(service, identifier);
    if (offered.error) return offered.error;
    service_ = std::move(offered.value);  // its listener takes the connection for as long as this is held
    NSError error;
    connection_ = NSXPCConnection::connectionWithListenerEndpoint(service_->endpoint(), &error);
    if (!connection_) return error;
    connection_->setRemoteObjectInterface(interface);
    connection_->setCallDeadline(timeout_);
    connection_->resume();
    return NSError();
  }

  // Makes `call(remote, slot)`, which may give a progress to cancel it by, and waits for what comes into the
  // slot.
  template <class Value, class Protocol, class Call>
  CallResult<Value> ask(const Call &call) {
    const auto slot = std::make_shared<AnswerSlot<Value>>();
    const auto remote =
        connection_->remoteObjectProxyWithErrorHandler<Protocol>([slot](const NSError &error) {
          slot->put({{}, error});
        });
    const std::shared_ptr<NSProgress> progress = call(*remote, slot);
    if (const auto answer = slot->waitFor(timeout_)) return *answer;
    if (progress) progress->cancel();
    return slot->wait(std::chrono::milliseconds(0));
  }

 private:
  std::chrono::milliseconds timeout_{};
  std::shared_ptr<FPDService> service_;
  std::shared_ptr<NSXPCConnection> connection_;
};

}  // namespace droxa
