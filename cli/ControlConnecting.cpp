#include "cli/ControlConnecting.h"

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"

namespace droxa {

ControlConnectionOverXPC::ControlConnectionOverXPC(std::string socketPath, std::chrono::milliseconds deadline)
    : socketPath_(std::move(socketPath)), deadline_(deadline) {}

ControlConnectionOverXPC::~ControlConnectionOverXPC() {
  if (connection_) connection_->invalidate();
}

std::shared_ptr<FPDControlProtocol> ControlConnectionOverXPC::control(NSXPCErrorHandler handler,
                                                                      NSError *error) {
  if (!connection_) {
    NSError cause;
    connection_ = NSXPCConnection::connectionWithSocketPath(socketPath_, &cause);
    if (!connection_) {
      NSUserInfo information{{NSLocalizedDescriptionKey, "fileproviderd doesn't answer at " + socketPath_}};
      information[NSUnderlyingErrorKey] = cause;
      *error = NSError(NSCocoaErrorDomain, NSXPCConnectionInvalid, information);
      return nullptr;
    }
    connection_->setRemoteObjectInterface(FPDControlInterface());
    connection_->setCallDeadline(deadline_);
    connection_->setInterruptionHandler(endHandler_);
    connection_->resume();
  }
  return connection_->remoteObjectProxyWithErrorHandler<FPDControlProtocol>(std::move(handler));
}

}  // namespace droxa
