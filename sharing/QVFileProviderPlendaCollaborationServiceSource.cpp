#include "sharing/QVFileProviderPlendaCollaborationServiceSource.h"

#include "sharing/QVFileProviderPlendaCollaborationProxy.h"
#include "tessaly/QVLog.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"

namespace droxa {

void QVFileProviderPlendaCollaborationServiceSource::exportObject(NSXPCConnection &connection) {
  connection.setExportedObject<QVFileProviderPlendaCollaboration>(
      QVPlendaCollaborationInterface(), std::make_shared<QVFileProviderPlendaCollaborationProxy>(
                                            _fileProviderExtension, _itemIdentifier, _operationQueue));
}

QVFileProviderServiceSource::ConnectionHandlers
QVFileProviderPlendaCollaborationServiceSource::connectionHandlers() const {
  return {
      [] { os_log_debug(qvc_default_log(), "[DEBUG] collaboration service source connection invalidated"); },
      [] { os_log_debug(qvc_default_log(), "[DEBUG] collaboration service source connection interrupted"); },
      underCurrentPersona()};
}

}  // namespace droxa
