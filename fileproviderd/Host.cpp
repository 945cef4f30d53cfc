#include "fileproviderd/Host.h"

#include <unistd.h>

#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/foundation/NSDate.h"
#include "platform/foundation/Paths.h"

namespace droxa {

std::shared_ptr<Host> Host::create(const std::string &extensionProgram, const std::string &ownProgram) {
  std::shared_ptr<Host> host(new Host());
  host->ownProgram_ = ownProgram;
  host->startedNanoseconds_ = NSDate::now().nanosecondsSince1970();
  ExtensionLauncher::Configuration configuration;
  configuration.program = extensionProgram;
  configuration.home = DroxaProcessHome().root();
  host->launcher_ = std::make_shared<ExtensionLauncher>(configuration, [weak = std::weak_ptr<Host>(host)] {
    if (auto self = weak.lock()) self->followed_->extensionEnded();
  });
  auto calls = std::make_shared<ExtensionCalls>(host->launcher_);
  host->followed_ = std::make_shared<FollowedContainers>(calls);
  const auto listings = std::make_shared<OpenListings>();
  host->signals_ = std::make_shared<HostSignalReceiver>(host->followed_, listings);
  host->launcher_->setHost(host->signals_);
  const auto thumbnails = std::make_shared<DesktopThumbnailFiller>(
      calls, DesktopThumbnails(DesktopThumbnails::userFolder()),
      std::vector<ShownFolder>{{DroxaProcessHome().replica(), DroxaProcessHome().replica()}});
  host->control_ = std::make_shared<ControlService>(
      calls, host->followed_, listings, DroxaProcessHome().replica(),
      [weak = std::weak_ptr<Host>(host)] {
        const auto self = weak.lock();
        return self ? self->status() : FPDStatus();
      },
      thumbnails);
  const auto mount = std::make_shared<HostMount>(calls, host->control_->providings(), DroxaProcessHome());
  mount->setFolderOpened([thumbnails](const std::string &path) { thumbnails->folderWasOpened(path); });
  thumbnails->setMountedFolders([weak = std::weak_ptr<HostMount>(mount)] {
    const auto mounted = weak.lock();
    return mounted ? mounted->shownFolders() : std::vector<ShownFolder>();
  });
  host->control_->setMount(mount);
  return host;
}

bool Host::start(NSError *error) {
  listener_ = NSXPCListener::listenerWithSocketPath(DroxaProcessHome().hostSocket(), error);
  if (!listener_) return false;
  listener_->setDelegate(weak_from_this());
  listener_->resume();
  control_->mount().begin(ownProgram_);
  return true;
}

void Host::stop() {
  if (listener_) listener_->invalidate();
  control_->mount().end();
  std::map<const NSXPCConnection *, std::shared_ptr<NSXPCConnection>> clients;
  {
    Lock held(lock_);
    clients.swap(clients_);
  }
  for (const auto &[key, client] : clients) client->invalidate();
  launcher_->stop();
}

bool Host::listenerShouldAcceptNewConnection(const std::shared_ptr<NSXPCListener> & /*listener*/,
                                             const std::shared_ptr<NSXPCConnection> &connection) {
  if (connection->peer().userIdentifier != getuid()) return false;
  const NSXPCConnection *key = connection.get();
  connection->setExportedObject(FPDControlInterface(), std::shared_ptr<FPDControlProtocol>(control_));
  connection->setInvalidationHandler([weak = weak_from_this(), key] {
    auto self = weak.lock();
    if (!self) return;
    std::shared_ptr<NSXPCConnection> released;
    Lock held(self->lock_);
    const auto found = self->clients_.find(key);
    if (found == self->clients_.end()) return;
    released = found->second;
    self->clients_.erase(found);
    held.unlock();
  });
  {
    Lock held(lock_);
    clients_[key] = connection;
  }
  connection->resume();
  return true;
}

FPDStatus Host::status() const {
  const ExtensionLauncher::Status extension = launcher_->status();
  FPDStatus status;
  status.processIdentifier = static_cast<std::uint32_t>(getpid());
  status.startedNanoseconds = startedNanoseconds_;
  status.extensionProcessIdentifier = static_cast<std::uint32_t>(extension.processIdentifier);
  status.extensionStartedNanoseconds = extension.startedNanoseconds;
  status.extensionLaunches = extension.launches;
  status.lastExtensionEnd = extension.lastEnd;
  status.signals = signals_->signals();
  return status;
}

}  // namespace droxa
