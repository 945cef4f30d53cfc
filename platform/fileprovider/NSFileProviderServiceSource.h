#pragma once

#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/xpc/NSXPCListener.h"

namespace droxa {

// Offers one named service on one item. Thread contract: any thread.
class NSFileProviderServiceSource {
 public:
  virtual ~NSFileProviderServiceSource() = default;
  virtual std::string serviceName() const = 0;
  // The endpoint of a listener made for it, which takes connections for as long as the source lives; nullopt
  // with `error` (may be null) set when this process can't make one more.
  virtual std::optional<NSXPCListenerEndpoint> makeListenerEndpointAndReturnError(NSError *error) = 0;
};

}  // namespace droxa
