#pragma once

#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// The principal object as the host sees it: each request is one of the principal's operations.
// Thread contract: any thread, several requests at a time. A request blocks its caller, which is the
// connection's pool, while the principal waits for the daemon; its completion is called exactly once, before
// the request returns (those of placeholders and moves, when the principal answers). What is being provided
// goes on after that, without a thread.
class HostedExtension final : public NSFileProviderExtensionProtocol {
 public:
  explicit HostedExtension(std::shared_ptr<NSFileProviderExtension> principal);

  // Without an item there always is an error.
  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override;
  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override;
  void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) override;
  // Without an enumerator there always is an error.
  void enumeratorForContainer(const std::string &identifier,
                              NSFileProviderEnumeratorCompletion completion) override;
  // Always with a providing, which holds the download: see HostedProviding.
  void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                               FPDProvidingCompletion completion) override;
  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override;
  void movingItemAtURL(const NSURL &url, const NSURL &destination,
                       NSFileProviderMovingCompletion completion) override;
  // With an action, which the first wait begins (HostedAction), or with what is wrong with the request.
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override;
  // With what holds the source of the service (HostedService).
  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion) override;

  // Always with thumbnails, which the first request for the next ones begins (HostedThumbnails).
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion) override;
  // When the principal completes, on any thread.
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion) override;

 private:
  const std::shared_ptr<NSFileProviderExtension> principal_;
};

}  // namespace droxa
