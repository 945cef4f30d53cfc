#include "sharing/QVFileProviderServiceSource.h"

#include <utility>

#include "additions/QVPersonaAdoption.h"
#include "tessaly/QVPersona.h"

namespace droxa {

QVFileProviderServiceSource::QVFileProviderServiceSource(std::shared_ptr<NSFileProviderExtension> extension,
                                                         std::string itemIdentifier,
                                                         std::shared_ptr<NSOperationQueue> operationQueue)
    : _fileProviderExtension(std::move(extension)),
      _itemIdentifier(std::move(itemIdentifier)),
      _operationQueue(std::move(operationQueue)) {}

QVFileProviderServiceSource::~QVFileProviderServiceSource() = default;

std::optional<NSXPCListenerEndpoint> QVFileProviderServiceSource::makeListenerEndpointAndReturnError(
    NSError *error) {
  const auto listener = NSXPCListener::anonymousListener(error);
  if (!listener) return std::nullopt;
  listener->setDelegate(weak_from_this());
  std::optional<NSXPCListenerEndpoint> endpoint(listener->endpoint());
  listener->resume();
  const Lock lock(_lock);
  _listeners.insert(listener);
  return endpoint;
}

bool QVFileProviderServiceSource::listenerShouldAcceptNewConnection(
    const std::shared_ptr<NSXPCListener> &listener, const std::shared_ptr<NSXPCConnection> &connection) {
  exportObject(*connection);
  {
    const Lock lock(_lock);
    _listeners.erase(listener);
  }
  const ConnectionHandlers handlers = connectionHandlers();
  const auto around = handlers.around ? handlers.around : [](const std::function<void()> &run) { run(); };
  connection->setInvalidationHandler([listener, around, log = handlers.logInvalidated] {
    around([&] {
      log();
      listener->invalidate();
    });
  });
  connection->setInterruptionHandler(
      [weak = std::weak_ptr<NSXPCConnection>(connection), around, log = handlers.logInterrupted] {
        around([&] {
          log();
          if (const auto interrupted = weak.lock()) interrupted->invalidate();
        });
      });
  connection->resume();
  return true;
}

std::function<void(const std::function<void()> &)> QVFileProviderServiceSource::underCurrentPersona() {
  return
      [persona = qv_currentPersonaID(UMUserManager::sharedManager())](const std::function<void()> &handler) {
        const QVPersonaAdoption adoption(persona);
        handler();
      };
}

std::vector<std::shared_ptr<NSXPCListener>> QVFileProviderServiceSource::listeners() const {
  const Lock lock(_lock);
  return {_listeners.begin(), _listeners.end()};
}

}  // namespace droxa
