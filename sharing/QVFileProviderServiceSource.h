#pragma once

#include <functional>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderServiceSource.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/ThreadSafety.h"
#include "platform/xpc/NSXPCListener.h"

namespace droxa {

// What all service sources do: each endpoint gets an anonymous listener of its own, and each connection that
// one accepts an exported object of its own.
//
// A listener belongs to the source until a client has connected; from then on to that connection, whose end
// ends it. So a source may go while its connections live. No connection is refused here: what a client may do
// is decided call by call, by the exported object.
//
// Thread contract: any thread. The lock guards the table of listeners and is held only to change it. A
// connection's handlers run on the transport's threads and keep the listener alone.
class QVFileProviderServiceSource : public NSFileProviderServiceSource,
                                    public NSXPCListenerDelegate,
                                    public std::enable_shared_from_this<QVFileProviderServiceSource> {
 public:
  QVFileProviderServiceSource(std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
                              std::shared_ptr<NSOperationQueue> operationQueue);
  ~QVFileProviderServiceSource() override;
  QVFileProviderServiceSource(const QVFileProviderServiceSource &) = delete;
  QVFileProviderServiceSource &operator=(const QVFileProviderServiceSource &) = delete;

  // REQUIRES: the source is held by a shared_ptr.
  std::optional<NSXPCListenerEndpoint> makeListenerEndpointAndReturnError(NSError *error) override;
  bool listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> &listener,
                                         const std::shared_ptr<NSXPCConnection> &connection) override;

  // Those that nobody has connected to yet.
  std::vector<std::shared_ptr<NSXPCListener>> listeners() const;

 protected:
  // What the handlers of one connection do besides ending it.
  struct ConnectionHandlers {
    void (*logInvalidated)();
    void (*logInterrupted)();
    // Runs each handler; made when the connection is accepted. Null: they are run as they are.
    std::function<void(const std::function<void()> &handler)> around;
  };

  // The connection's interface and an object made for it alone. `connection` isn't null.
  virtual void exportObject(NSXPCConnection &connection) = 0;
  virtual ConnectionHandlers connectionHandlers() const = 0;
  // Runs handlers under the calling thread's persona as it is now; where that can't be adopted then, under
  // whichever the handler's thread has.
  static std::function<void(const std::function<void()> &handler)> underCurrentPersona();

  const std::shared_ptr<NSFileProviderExtension> _fileProviderExtension;
  const std::string _itemIdentifier;
  const std::shared_ptr<NSOperationQueue> _operationQueue;

 private:
  mutable Mutex _lock;
  std::set<std::shared_ptr<NSXPCListener>> _listeners GUARDED_BY(_lock);
};

}  // namespace droxa
