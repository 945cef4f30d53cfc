#include "extension/HostConnection.h"

#include <utility>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/xpc/NSXPCConnection.h"

namespace droxa {

HostConnection::HostConnection(int descriptor, std::shared_ptr<NSFileProviderExtensionProtocol> exported,
                               std::function<void()> ended)
    : connection_(NSXPCConnection::connectionWithDescriptor(descriptor)) {
  connection_->setExportedObject(NSFileProviderExtensionInterface(), std::move(exported));
  connection_->setRemoteObjectInterface(NSFileProviderHostInterface());
  connection_->setInvalidationHandler(std::move(ended));
}

HostConnection::~HostConnection() {
  connection_->invalidate();
}

void HostConnection::resume() {
  connection_->resume();
}

void HostConnection::signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                                NSFileProviderSignalCompletion completion) {
  connection_->remoteObjectProxyWithErrorHandler<NSFileProviderHostProtocol>(completion)
      ->signalEnumerator(identifier, completion);
}

}  // namespace droxa
