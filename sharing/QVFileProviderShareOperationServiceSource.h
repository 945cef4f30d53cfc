#pragma once

#include "sharing/QVFileProviderServiceSource.h"

namespace droxa {

// Offers the sharing operations, on every item and to everybody; what a client may ask for is decided by its
// privileges, call by call (QVFileProviderShareOperationProxy). Thread contract: the base's.
class QVFileProviderShareOperationServiceSource final : public QVFileProviderServiceSource {
 public:
  static constexpr char kServiceName[] = "com.quorva.Tessaly.private.SharingOperation";

  using QVFileProviderServiceSource::QVFileProviderServiceSource;
  std::string serviceName() const override { return kServiceName; }

 protected:
  void exportObject(NSXPCConnection &connection) override;
  ConnectionHandlers connectionHandlers() const override;
};

}  // namespace droxa
