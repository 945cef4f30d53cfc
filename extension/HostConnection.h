#pragma once

#include <functional>
#include <memory>

#include "platform/fileprovider/NSFileProviderManager.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

class NSXPCConnection;

// The connection to the host: the extension's requests come in through it, its signals go out.
// Thread contract: any thread; requests, replies and `ended` run on the process's pool.
class HostConnection final : public NSFileProviderHostLink {
 public:
  // Takes ownership of `descriptor`, a connected socket. `ended` is called at most once, when the connection
  // can't be used any more, for whatever reason.
  HostConnection(int descriptor, std::shared_ptr<NSFileProviderExtensionProtocol> exported,
                 std::function<void()> ended);
  ~HostConnection() override;
  HostConnection(const HostConnection &) = delete;
  HostConnection &operator=(const HostConnection &) = delete;

  void resume();  // from now on requests are served

  void signalEnumeratorForContainerItemIdentifier(const std::string &identifier,
                                                  NSFileProviderSignalCompletion completion) override;

 private:
  const std::shared_ptr<NSXPCConnection> connection_;
};

}  // namespace droxa
