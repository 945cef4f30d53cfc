#pragma once

#include "sharing/QVFileProviderServiceSource.h"
#include "tessaly/QVPlendaCollaboration.h"

namespace droxa {

// Offers the collaboration service on a document, to everybody (QVFileProviderPlendaCollaborationProxy). Its
// connections' handlers run under the persona under which the connection was accepted. Thread contract: the
// base's.
class QVFileProviderPlendaCollaborationServiceSource final : public QVFileProviderServiceSource {
 public:
  using QVFileProviderServiceSource::QVFileProviderServiceSource;
  std::string serviceName() const override { return QVPlendaCollaborationServiceName; }

 protected:
  void exportObject(NSXPCConnection &connection) override;
  ConnectionHandlers connectionHandlers() const override;
};

}  // namespace droxa
