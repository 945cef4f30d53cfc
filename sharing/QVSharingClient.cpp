#include "sharing/QVSharingClient.h"

#include "sharing/QVSharingProxy.h"
#include "tessaly/QVLog.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"

namespace droxa {

NSURL QVSharingClient::fileURL() const {
  return _fileProviderExtension->URLForItemWithPersistentIdentifier(_itemIdentifier);
}

void QVSharingClient::exportObject(NSXPCConnection &connection) {
  connection.setExportedObject<QVSharingService>(
      getSharingServiceInterface(),
      std::make_shared<QVSharingProxy>(_fileProviderExtension, _itemIdentifier, fileURL(), _operationQueue));
}

QVFileProviderServiceSource::ConnectionHandlers QVSharingClient::connectionHandlers() const {
  return {[] { os_log_debug(qvc_default_log(), "[DEBUG] sharing service source connection invalidated"); },
          [] { os_log_debug(qvc_default_log(), "[DEBUG] sharing service source connection interrupted"); },
          underCurrentPersona()};
}

}  // namespace droxa
