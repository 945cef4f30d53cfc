#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

#include "fileproviderd/ExtensionConnecting.h"

namespace droxa {

// Whether `error` says that the peer has gone, so that asking a new one may help.
bool isConnectionGone(const NSError &error);

// The calls that the host makes of the extension. None does more when it is made twice: one that the
// extension's end cut off is made once more, of the extension that is started for it. Thread contract: any
// thread; completions run exactly once, on any thread, also before the call returns.
class ExtensionCalls {
 public:
  using URLResult = std::function<void(const NSURL &url, const NSError &error)>;
  using IdentifierResult =
      std::function<void(const std::optional<std::string> &identifier, const NSError &error)>;

  explicit ExtensionCalls(std::shared_ptr<ExtensionConnecting> connecting);

  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion);
  void URLForItemIdentifier(const std::string &identifier, URLResult completion);  // nil without error: none
  void identifierForItemAtURL(const NSURL &url, IdentifierResult completion);      // the same
  void enumeratorForContainer(const std::string &identifier, NSFileProviderEnumeratorCompletion completion);
  // The providing ends with the extension that gave it.
  void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                               FPDProvidingCompletion completion);
  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion);
  void itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion);
  void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion);
  void movingItemAtURL(const NSURL &url, const NSURL &destination, NSFileProviderMovingCompletion completion);

  // The action hasn't begun; it ends with the extension that gave it.
  void performAction(const FPDActionRequest &request, FPDActionCompletion completion);

  // The service's connections end with the extension that gave it, and it takes no new ones then.
  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion);

  // They haven't begun; they end with the extension that gave them.
  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion);
  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion);

  // What to tell when the extension's end cut off what `error` says.
  NSError cutOffError(const NSError &error) const;

 private:
  // `ask(extension, reply)` makes the call.
  void askForOutcome(
      std::function<void(NSFileProviderExtensionProtocol &, NSFileProviderErrorCompletion)> ask,
      const NSFileProviderErrorCompletion &completion);

  const std::shared_ptr<ExtensionConnecting> connecting_;
};

}  // namespace droxa
