#include "sharing/QVFileProviderShareOperationServiceSource.h"

#include "sharing/QVFileProviderShareOperationProxy.h"
#include "tessaly/QVCClientPrivilegesDescriptor.h"
#include "tessaly/QVLog.h"
#include "tessaly/xpc/QVCXPCSharingOperationInterface.h"

namespace droxa {

void QVFileProviderShareOperationServiceSource::exportObject(NSXPCConnection &connection) {
  const auto privileges = std::make_shared<const QVCClientPrivilegesDescriptor>(connection.peer());
  connection.setExportedObject<QVShareOperationProtocol>(
      QVCXPCSharingOperationInterface(),
      std::make_shared<QVFileProviderShareOperationProxy>(_fileProviderExtension, _itemIdentifier,
                                                          _operationQueue, privileges));
}

QVFileProviderServiceSource::ConnectionHandlers
QVFileProviderShareOperationServiceSource::connectionHandlers() const {
  return {[] { os_log_debug(qvc_default_log(), "[DEBUG] share service source connection invalidated"); },
          [] { os_log_debug(qvc_default_log(), "[DEBUG] share service source connection interrupted"); },
          nullptr};
}

}  // namespace droxa
