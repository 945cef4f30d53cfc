#include "fileproviderd/HostServices.h"

#include "fileproviderd/HostErrors.h"
#include "platform/dispatch/dispatch.h"

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
                               StatusSource status)
    : calls_(std::move(calls)),
      followed_(std::move(followed)),
      listings_(std::move(listings)),
      paths_(std::make_shared<PathResolver>(calls_, std::move(replica))),
      status_(std::move(status)) {}

void ControlService::getStatus(FPDStatusCompletion completion) {
  FPDStatus status = status_();
  status.cachedItems = followed_->cachedItemCount();
  status.followedContainers = followed_->followedCount();
  status.watchers = followed_->watcherCount();
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
  dispatch_async_global([paths = paths_, path, completion = std::move(completion)] {
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
      [calls = calls_, listings = listings_, identifier, completion](
          const std::shared_ptr<NSFileProviderRemoteEnumerator> &enumerator, const NSError &error) {
        std::shared_ptr<RelayedEnumerator> relayed;
        if (enumerator) {
          relayed = std::make_shared<RelayedEnumerator>(calls, identifier, enumerator);
          listings->add(identifier, relayed);
        }
        completion(relayed, explainedError(identifier, error));
      });
}

void ControlService::watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                                    FPDWatchCompletion completion) {
  followed_->watch(identifier, std::move(observer), std::move(completion));
}

}  // namespace droxa
