#include "fileproviderd/HostServices.h"

#include <cerrno>

#include "fileproviderd/HostErrors.h"
#include "fileproviderd/ObservedEnumerator.h"
#include "fileproviderd/RelayedThumbnails.h"
#include "platform/dispatch/dispatch.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

void HostSignalReceiver::signalEnumerator(const std::string &containerIdentifier,
                                          NSFileProviderErrorCompletion completion) {
  ++signals_;
  listings_->signal(containerIdentifier);
  followed_->signal(containerIdentifier);
  completion(NSError());
}

ControlService::ControlService(std::shared_ptr<ExtensionCalls> calls,
                               std::shared_ptr<FollowedContainers> followed,
                               std::shared_ptr<OpenListings> listings, std::string replica,
                               StatusSource status, std::shared_ptr<DesktopThumbnailFiller> desktopThumbnails)
    : calls_(std::move(calls)),
      followed_(std::move(followed)),
      listings_(std::move(listings)),
      paths_(std::make_shared<PathResolver>(calls_, std::move(replica))),
      providings_(std::make_shared<Providings>(calls_)),
      actions_(calls_, followed_, listings_),
      services_(std::make_shared<Services>(calls_)),
      status_(std::move(status)),
      desktopThumbnails_(std::move(desktopThumbnails)) {}

void ControlService::getStatus(FPDStatusCompletion completion) {
  FPDStatus status = status_();
  status.cachedItems = followed_->cachedItemCount();
  status.followedContainers = followed_->followedCount();
  status.watchers = followed_->watcherCount();
  const HostMount::State mount = mount_ ? mount_->state() : HostMount::State();
  status.mountPoint = mount.path;
  status.mountProblem = mount.problem;
  completion(status);
}

// Items are always asked of the extension: what followers keep may be older than a change that is on its way.
void ControlService::itemForIdentifier(const std::string &identifier,
                                       NSFileProviderItemCompletion completion) {
  calls_->itemForIdentifier(identifier, [identifier, completion](const auto &item, const NSError &error) {
    completion(item, explainedError(identifier, error));
  });
}

void ControlService::itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) {
  // A thread of its own: the search waits for the extension several times.
  dispatch_async_global(
      [paths = paths_, path = mount_ ? mount_->drivePath(path) : path, completion = std::move(completion)] {
        NSError error;
        const auto item = paths->itemAtPath(path, &error);
        completion(item, item ? NSError() : error);
      });
}

void ControlService::URLForItemIdentifier(const std::string &identifier,
                                          NSFileProviderURLCompletion completion) {
  calls_->URLForItemIdentifier(identifier,
                               [completion](const NSURL &url, const NSError &) { completion(url); });
}

void ControlService::identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) {
  calls_->identifierForItemAtURL(url, [completion](const std::optional<std::string> &identifier,
                                                   const NSError &) { completion(identifier); });
}

void ControlService::enumeratorForContainer(const std::string &identifier,
                                            NSFileProviderEnumeratorCompletion completion) {
  calls_->enumeratorForContainer(
      identifier,
      [self = shared_from_this(), identifier, completion](
          const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator, const NSError &error) {
        completion(enumerator ? self->relayed(identifier, enumerator) : nullptr,
                   explainedError(identifier, error));
      });
}

// What a client lists is what somebody looks at.
std::shared_ptr<NSFileProviderRemoteEnumerator> ControlService::relayed(
    const std::string &identifier, const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator) const {
  const auto relayed = std::make_shared<RelayedEnumerator>(calls_, identifier, enumerator);
  listings_->add(identifier, relayed);
  if (!desktopThumbnails_) return relayed;
  return std::make_shared<ObservedEnumerator>(
      relayed, [filler = desktopThumbnails_, identifier](const NSFileProviderItems &items) {
        filler->itemsWereListed(identifier, items);
      });
}

void ControlService::watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                                    FPDWatchCompletion completion) {
  followed_->watch(identifier, std::move(observer), std::move(completion));
}

// The contents are where the identifier leads, which for an alias is its target.
void ControlService::startProvidingItemWithIdentifier(const std::string &identifier,
                                                      std::uint64_t readingOptions,
                                                      FPDItemProvidingCompletion completion) {
  calls_->URLForItemIdentifier(identifier, [providings = providings_, identifier, readingOptions, completion](
                                               const NSURL &url, const NSError &error) {
    if (url) return completion(providings->start(url, readingOptions), url, NSError());
    completion(nullptr, NSURL(),
               explainedError(identifier,
                              error ? error : fileProviderErrorForNonExistentItemWithIdentifier(identifier)));
  });
}

void ControlService::startProvidingItemAtPath(const std::string &path, std::uint64_t readingOptions,
                                              FPDItemProvidingCompletion completion) {
  itemAtPath(path,
             [self = shared_from_this(), readingOptions, completion](const auto &item, const NSError &error) {
               if (!item) return completion(nullptr, NSURL(), error);
               self->startProvidingItemWithIdentifier(item->itemIdentifier(), readingOptions, completion);
             });
}

void ControlService::stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  calls_->stopProvidingItemAtURL(url, std::move(completion));
}

void ControlService::movingItemAtURL(const NSURL &url, const NSURL &destination,
                                     NSFileProviderMovingCompletion completion) {
  calls_->movingItemAtURL(url, destination, std::move(completion));
}

void ControlService::performAction(const FPDActionRequest &request, FPDActionCompletion completion) {
  actions_.perform(request, completion);
}

void ControlService::listenerEndpointForServiceName(const std::string &name,
                                                    const std::string &itemIdentifier,
                                                    FPDServiceCompletion completion) {
  const auto client = NSXPCConnection::currentConnection();
  services_->open(name, itemIdentifier, client ? client->peer().processIdentifier : 0, completion);
}

void ControlService::fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers,
                                                       CGSize size, FPDThumbnailsCompletion completion) {
  RelayedThumbnails::open(calls_, identifiers, size, completion);
}

// The top-level folder may be a container's, which making a folder of its name wouldn't find.
void ControlService::defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                         NSFileProviderItemCompletion completion) {
  if (bundleIdentifier) return calls_->defaultContainerForBundleIdentifier(bundleIdentifier, completion);
  itemAtPath("/Documents", [calls = calls_, completion](const auto &item, const NSError &error) {
    const bool isMissing = error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
    const bool isFolder = item && item->fields().kind == NSFileProviderItemKind::folder;
    if (isFolder || (!item && !isMissing)) return completion(item, error);
    calls->defaultContainerForBundleIdentifier(std::nullopt, completion);
  });
}

void ControlService::fillDesktopThumbnailsForContainer(const std::string &identifier,
                                                       NSFileProviderErrorCompletion completion) {
  if (!desktopThumbnails_)
    return completion(NSError::errorWithPOSIXCode(ENOSYS, "this host keeps no thumbnails for the desktop"));
  desktopThumbnails_->fillContainer(identifier, std::move(completion));
}

// Threads of their own: both wait for the kernel, and the first for the extension.
void ControlService::mountAtPath(const std::string &path, FPDMountCompletion completion) {
  if (!mount_) return completion({}, NSError::errorWithPOSIXCode(ENODEV, "this host mounts nothing"));
  dispatch_async_global([mount = mount_, path, completion = std::move(completion)] {
    const std::string problem = mount->mount(path);
    completion(problem.empty() ? mount->state().path : std::string(),
               problem.empty() ? NSError() : NSError::errorWithPOSIXCode(ENODEV, problem));
  });
}

void ControlService::unmount(NSFileProviderErrorCompletion completion) {
  if (!mount_) return completion(NSError());
  dispatch_async_global([mount = mount_, completion = std::move(completion)] {
    mount->unmount();
    completion(NSError());
  });
}

}  // namespace droxa
