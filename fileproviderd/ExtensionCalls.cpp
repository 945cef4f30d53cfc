#include "fileproviderd/ExtensionCalls.h"

#include <atomic>
#include <utility>

#include "platform/fileprovider/NSFileProviderError.h"

namespace droxa {

namespace {

constexpr int kAttempts = 2;

// The last error of a call that the extension never answered, in words that name the reason.
NSError cutOff(const NSError &error, ExtensionConnecting &connecting) {
  NSUserInfo information;
  information[NSUnderlyingErrorKey] = error;
  information[NSLocalizedDescriptionKey] =
      "the extension ended before it answered: " + connecting.describeEnd();
  return NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable, information);
}

// One call: answered by the reply or, when the transport fails for good, with that error.
template <class... Values>
class Call : public std::enable_shared_from_this<Call<Values...>> {
 public:
  using Reply = std::function<void(const Values &...)>;
  using Ask = std::function<void(NSFileProviderExtensionProtocol &extension, Reply reply)>;

  Call(std::shared_ptr<ExtensionConnecting> connecting, Ask ask, Reply reply,
       std::function<void(const NSError &)> fail)
      : connecting_(std::move(connecting)), ends_{std::move(ask), std::move(reply), std::move(fail)} {}

  void attempt(int number) {
    auto self = this->shared_from_this();
    auto answered = std::make_shared<std::atomic_flag>();
    NSError error;
    auto extension = connecting_->extension(
        [self, answered, number](const NSError &failure) {
          if (!answered->test_and_set()) self->failed(failure, number);
        },
        &error);
    if (!extension) {
      end().fail(error);
      return;
    }
    const Ask ask = ends_.ask;  // its end may come while this runs
    ask(*extension, [self, answered](const Values &...values) {
      if (answered->test_and_set()) return;
      self->connecting_->noteAnswer();
      self->end().reply(values...);
    });
  }

 private:
  struct Ends {
    Ask ask;
    Reply reply;
    std::function<void(const NSError &)> fail;
  };

  void failed(const NSError &error, int number) {
    if (!isConnectionGone(error)) {
      end().fail(error);
    } else if (number < kAttempts) {
      attempt(number + 1);
    } else {
      end().fail(cutOff(error, *connecting_));
    }
  }
  // What the reply brings may hold the error handler, and so this, for as long as it lives: what the caller
  // gave is let go of.
  Ends end() { return std::exchange(ends_, {}); }

  const std::shared_ptr<ExtensionConnecting> connecting_;
  Ends ends_;  // touched by one at a time: who begins an attempt, then who is first to answer it
};

}  // namespace

bool isConnectionGone(const NSError &error) {
  return error.is(NSCocoaErrorDomain, NSXPCConnectionInterrupted) ||
         error.is(NSCocoaErrorDomain, NSXPCConnectionInvalid);
}

ExtensionCalls::ExtensionCalls(std::shared_ptr<ExtensionConnecting> connecting)
    : connecting_(std::move(connecting)) {}

void ExtensionCalls::itemForIdentifier(const std::string &identifier,
                                       NSFileProviderItemCompletion completion) {
  using ItemCall = Call<std::shared_ptr<const NSFileProviderItem>, NSError>;
  std::make_shared<ItemCall>(
      connecting_,
      [identifier](NSFileProviderExtensionProtocol &extension, ItemCall::Reply reply) {
        extension.itemForIdentifier(identifier, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

void ExtensionCalls::URLForItemIdentifier(const std::string &identifier, URLResult completion) {
  using URLCall = Call<NSURL>;
  std::make_shared<URLCall>(
      connecting_,
      [identifier](NSFileProviderExtensionProtocol &extension, URLCall::Reply reply) {
        extension.URLForItemIdentifier(identifier, std::move(reply));
      },
      [completion](const NSURL &url) { completion(url, NSError()); },
      [completion](const NSError &error) { completion(NSURL(), error); })
      ->attempt(1);
}

void ExtensionCalls::identifierForItemAtURL(const NSURL &url, IdentifierResult completion) {
  using IdentifierCall = Call<std::optional<std::string>>;
  std::make_shared<IdentifierCall>(
      connecting_,
      [url](NSFileProviderExtensionProtocol &extension, IdentifierCall::Reply reply) {
        extension.identifierForItemAtURL(url, std::move(reply));
      },
      [completion](const std::optional<std::string> &identifier) { completion(identifier, NSError()); },
      [completion](const NSError &error) { completion(std::nullopt, error); })
      ->attempt(1);
}

void ExtensionCalls::enumeratorForContainer(const std::string &identifier,
                                            NSFileProviderEnumeratorCompletion completion) {
  using EnumeratorCall = Call<std::shared_ptr<NSFileProviderRemoteEnumerator>, NSError>;
  std::make_shared<EnumeratorCall>(
      connecting_,
      [identifier](NSFileProviderExtensionProtocol &extension, EnumeratorCall::Reply reply) {
        extension.enumeratorForContainer(identifier, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

NSError ExtensionCalls::cutOffError(const NSError &error) const {
  return isConnectionGone(error) ? cutOff(error, *connecting_) : error;
}

void ExtensionCalls::startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                             FPDProvidingCompletion completion) {
  using ProvidingCall = Call<std::shared_ptr<FPDProviding>, NSError>;
  std::make_shared<ProvidingCall>(
      connecting_,
      [url, readingOptions](NSFileProviderExtensionProtocol &extension, ProvidingCall::Reply reply) {
        extension.startProvidingItemAtURL(url, readingOptions, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

void ExtensionCalls::askForOutcome(
    std::function<void(NSFileProviderExtensionProtocol &, NSFileProviderErrorCompletion)> ask,
    const NSFileProviderErrorCompletion &completion) {
  std::make_shared<Call<NSError>>(connecting_, std::move(ask), completion, completion)->attempt(1);
}

void ExtensionCalls::stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  askForOutcome(
      [url](auto &extension, auto reply) { extension.stopProvidingItemAtURL(url, std::move(reply)); },
      completion);
}

void ExtensionCalls::itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  askForOutcome([url](auto &extension, auto reply) { extension.itemChangedAtURL(url, std::move(reply)); },
                completion);
}

void ExtensionCalls::providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) {
  askForOutcome(
      [url](auto &extension, auto reply) { extension.providePlaceholderAtURL(url, std::move(reply)); },
      completion);
}

void ExtensionCalls::movingItemAtURL(const NSURL &url, const NSURL &destination,
                                     NSFileProviderMovingCompletion completion) {
  using MovingCall = Call<bool, NSError>;
  std::make_shared<MovingCall>(
      connecting_,
      [url, destination](NSFileProviderExtensionProtocol &extension, MovingCall::Reply reply) {
        extension.movingItemAtURL(url, destination, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(false, error); })
      ->attempt(1);
}

void ExtensionCalls::performAction(const FPDActionRequest &request, FPDActionCompletion completion) {
  using ActionCall = Call<std::shared_ptr<FPDAction>, NSError>;
  std::make_shared<ActionCall>(
      connecting_,
      [request](NSFileProviderExtensionProtocol &extension, ActionCall::Reply reply) {
        extension.performAction(request, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

void ExtensionCalls::listenerEndpointForServiceName(const std::string &name,
                                                    const std::string &itemIdentifier,
                                                    FPDServiceCompletion completion) {
  using ServiceCall = Call<std::shared_ptr<FPDService>, NSError>;
  std::make_shared<ServiceCall>(
      connecting_,
      [name, itemIdentifier](NSFileProviderExtensionProtocol &extension, ServiceCall::Reply reply) {
        extension.listenerEndpointForServiceName(name, itemIdentifier, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

void ExtensionCalls::fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers,
                                                       CGSize size, FPDThumbnailsCompletion completion) {
  using ThumbnailsCall = Call<std::shared_ptr<FPDThumbnails>, NSError>;
  std::make_shared<ThumbnailsCall>(
      connecting_,
      [identifiers, size](NSFileProviderExtensionProtocol &extension, ThumbnailsCall::Reply reply) {
        extension.fetchThumbnailsForItemIdentifiers(identifiers, size, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

// Made once more it finds the folder that it made.
void ExtensionCalls::defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                                         NSFileProviderItemCompletion completion) {
  using ItemCall = Call<std::shared_ptr<const NSFileProviderItem>, NSError>;
  std::make_shared<ItemCall>(
      connecting_,
      [bundleIdentifier](NSFileProviderExtensionProtocol &extension, ItemCall::Reply reply) {
        extension.defaultContainerForBundleIdentifier(bundleIdentifier, std::move(reply));
      },
      completion, [completion](const NSError &error) { completion(nullptr, error); })
      ->attempt(1);
}

}  // namespace droxa
