#pragma once

#include "platform/foundation/NSURL.h"
#include "sharing/QVFileProviderServiceSource.h"
#include "tessaly/QVSharingService.h"

namespace droxa {

// Offers the sharing service on a shareable item, to everybody (QVSharingProxy). Its connections' handlers
// run under the persona under which the connection was accepted. Thread contract: the base's.
class QVSharingClient final : public QVFileProviderServiceSource {
 public:
  using QVFileProviderServiceSource::QVFileProviderServiceSource;
  std::string serviceName() const override { return QVSharingServiceName; }
  // Where the item is at this moment; nil when it is nowhere.
  NSURL fileURL() const;

 protected:
  void exportObject(NSXPCConnection &connection) override;
  ConnectionHandlers connectionHandlers() const override;
};

}  // namespace droxa
