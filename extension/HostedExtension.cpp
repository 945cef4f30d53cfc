#include "extension/HostedExtension.h"

#include <utility>

#include "extension/HostedEnumerator.h"
#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {
namespace {

// A lookup may come back with neither a result nor an error; the host is told what that means.
NSError ErrorOrNoSuchItem(const NSError &error, const std::string &identifier) {
  return error ? error : fileProviderErrorForNonExistentItemWithIdentifier(identifier);
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

}  // namespace droxa
