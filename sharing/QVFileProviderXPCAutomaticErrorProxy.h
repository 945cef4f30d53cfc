#pragma once

#include "platform/fileprovider/FPXPCAutomaticErrorProxy.h"
#include "tessaly/QVProtocol.h"

namespace droxa {

// Calls of the daemon for a client: what the daemon says is wrong reaches the client as it was said.
// Thread contract: the base's.
class QVFileProviderXPCAutomaticErrorProxy final : public FPXPCAutomaticErrorProxy<QVProtocol> {
 public:
  using FPXPCAutomaticErrorProxy::FPXPCAutomaticErrorProxy;

 protected:
  bool sanitizeErrors() const override { return false; }
};

}  // namespace droxa
