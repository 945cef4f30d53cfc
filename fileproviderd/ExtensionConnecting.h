#pragma once

#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/xpc/NSXPCProxyCreating.h"

namespace droxa {

// The way to the extension: a process that is started on demand, or an object in a test.
// Thread contract: any thread.
class ExtensionConnecting {
 public:
  virtual ~ExtensionConnecting() = default;
  // The extension, started if it doesn't run; null with `error` set when that isn't possible now. A call
  // whose transport fails ends in `handler`.
  virtual std::shared_ptr<NSFileProviderExtensionProtocol> extension(NSXPCErrorHandler handler,
                                                                     NSError *error) = 0;
  // The extension answered a call: it got up.
  virtual void noteAnswer() = 0;
  // What to tell of a call that the extension's end cut off.
  virtual std::string describeEnd() = 0;
};

}  // namespace droxa
