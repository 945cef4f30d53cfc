#include "extension/HostedExtension.h"

#include <utility>

#include "extension/HostedAction.h"
#include "extension/HostedEnumerator.h"
#include "extension/HostedProviding.h"
#include "extension/HostedService.h"
#include "extension/HostedThumbnails.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSFileManager.h"

namespace droxa {
namespace {

// A lookup may come back with neither a result nor an error; the host is told what that means.
NSError ErrorOrNoSuchItem(const NSError &error, const std::string &identifier) {
  return error ? error : fileProviderErrorForNonExistentItemWithIdentifier(identifier);
}

NSError NoSuchService(const std::string &name, const std::string &identifier) {
  return NSError(NSCocoaErrorDomain, NSFeatureUnsupportedError,
                 {{NSLocalizedDescriptionKey, "there is no service " + name + " on the item " + identifier}});
}

}  // namespace

HostedExtension::HostedExtension(std::shared_ptr<NSFileProviderExtension> principal)
    : principal_(std::move(principal)) {}

void HostedExtension::itemForIdentifier(const std::string &identifier,
                                        NSFileProviderItemCompletion completion) {
  NSError error;
  const auto item = principal_->itemForIdentifier(identifier, &error);
  completion(item, item ? NSError() : ErrorOrNoSuchItem(error, identifier));
}

void HostedExtension::URLForItemIdentifier(const std::string &identifier,
                                           NSFileProviderURLCompletion completion) {
  completion(principal_->URLForItemWithPersistentIdentifier(identifier));
}

void HostedExtension::identifierForItemAtURL(const NSURL &url,
                                             NSFileProviderIdentifierCompletion completion) {
  completion(principal_->persistentIdentifierForItemAtURL(url));
}

void HostedExtension::enumeratorForContainer(const std::string &identifier,
                                             NSFileProviderEnumeratorCompletion completion) {
  NSError error;
  auto enumerator = principal_->enumeratorForContainerItemIdentifier(identifier, &error);
  if (!enumerator) return completion(nullptr, ErrorOrNoSuchItem(error, identifier));
  completion(std::make_shared<HostedEnumerator>(std::move(enumerator)), {});
}

void HostedExtension::startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                              FPDProvidingCompletion completion) {
  completion(HostedProviding::start(principal_, url, readingOptions), {});
}

void HostedExtension::stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  principal_->stopProvidingItemAtURL(url);
  completion({});
}

void HostedExtension::itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  principal_->itemChangedAtURL(url);
  completion({});
}

void HostedExtension::providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  principal_->providePlaceholderAtURL(url, std::move(completion));
}

void HostedExtension::movingItemAtURL(const NSURL &url, const NSURL &destination,
                                      NSFileProviderMovingCompletion completion) {
  principal_->movingItemAtURL_requiresProvidingWithDestinationURL(url, destination, std::move(completion));
}

void HostedExtension::performAction(const FPDActionRequest &request, FPDActionCompletion completion) {
  if (const NSError error = FPDActionRequestError(request)) return completion(nullptr, error);
  completion(std::make_shared<HostedAction>(principal_, request), {});
}

void HostedExtension::listenerEndpointForServiceName(const std::string &name,
                                                     const std::string &itemIdentifier,
                                                     FPDServiceCompletion completion) {
  NSError error;
  for (const auto &source : principal_->supportedServiceSourcesForItemIdentifier(itemIdentifier, &error)) {
    if (source->serviceName() != name) continue;
    const auto endpoint = source->makeListenerEndpointAndReturnError(&error);
    if (!endpoint) return completion(nullptr, error);
    return completion(std::make_shared<HostedService>(source, *endpoint), {});
  }
  completion(nullptr, error ? error : NoSuchService(name, itemIdentifier));
}

void HostedExtension::fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers,
                                                        CGSize size, FPDThumbnailsCompletion completion) {
  completion(std::make_shared<HostedThumbnails>(principal_, identifiers, size), {});
}

void HostedExtension::defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                          NSFileProviderItemCompletion completion) {
  principal_->_defaultApplicationContainerForBundleIdentifier(bundleIdentifier, std::move(completion));
}

}  // namespace droxa
