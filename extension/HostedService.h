#pragma once

#include <memory>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/NSFileProviderServiceSource.h"

namespace droxa {

// A service of the principal's as the host holds it: the source lives as long as this does, so that its
// listener takes connections. When the last holder lets go, which a client's death does too, nobody connects
// any more; connections that were accepted go on. Thread contract: immutable.
class HostedService final : public FPDService {
 public:
  HostedService(std::shared_ptr<NSFileProviderServiceSource> source, const NSXPCListenerEndpoint &endpoint)
      : source_(std::move(source)), endpoint_(endpoint) {}
  NSXPCListenerEndpoint endpoint() const override { return endpoint_; }

 private:
  const std::shared_ptr<NSFileProviderServiceSource> source_;
  const NSXPCListenerEndpoint endpoint_;
};

}  // namespace droxa
