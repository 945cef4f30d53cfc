#include <utility>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDActionAdapter.h"
#include "platform/fileprovider/xpc/FPDProvidingAdapter.h"
#include "platform/fileprovider/xpc/FPDServiceAdapter.h"
#include "platform/fileprovider/xpc/FPDThumbnailsAdapter.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/fileprovider/xpc/NSFileProviderExtensionProtocol.capnp.h"
#include "platform/fileprovider/xpc/RemoteEnumeratorAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"

namespace droxa {
namespace {

using Schema = schema::NSFileProviderExtensionProtocol;

constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };
constexpr auto writeMoving = [](auto results, Session &, bool requiresProviding, const NSError &error) {
  results.setRequiresProviding(requiresProviding);
  setError(results, error);
};
constexpr auto readOutcome = [](auto results, const RemoteObject &) { return std::tuple(getError(results)); };
constexpr auto readMoving = [](auto results, const RemoteObject &) {
  return std::tuple(static_cast<bool>(results.getRequiresProviding()), getError(results));
};

class ExtensionServer final : public Schema::Server {
 public:
  ExtensionServer(Session &session, std::shared_ptr<NSFileProviderExtensionProtocol> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> itemForIdentifier(ItemForIdentifierContext context) override {
    return exported_.serve(
        context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
          object.itemForIdentifier(identifier,
                                   reply([](auto results, Session &, const auto &item, const NSError &error) {
                                     setItem(results, item);
                                     setError(results, error);
                                   }));
        });
  }

  kj::Promise<void> urlForItemIdentifier(UrlForItemIdentifierContext context) override {
    return exported_.serve(
        context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
          object.URLForItemIdentifier(
              identifier, reply([](auto results, Session &, const NSURL &url) { setURL(results, url); }));
        });
  }

  kj::Promise<void> identifierForItemAtURL(IdentifierForItemAtURLContext context) override {
    return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
      object.identifierForItemAtURL(url, reply([](auto results, Session &, const auto &identifier) {
                                      setIdentifier(results, identifier);
                                    }));
    });
  }

  kj::Promise<void> enumeratorForContainer(EnumeratorForContainerContext context) override {
    return exported_.serve(context, [identifier = xpcString(context.getParams().getIdentifier())](
                                        auto &object, auto reply) {
      object.enumeratorForContainer(
          identifier, reply([](auto results, Session &session, const auto &enumerator, const NSError &error) {
            setEnumerator(results, session, enumerator);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> startProvidingItemAtURL(StartProvidingItemAtURLContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [url = getURL(params), options = params.getReadingOptions()](auto &object, auto reply) {
          object.startProvidingItemAtURL(
              url, options,
              reply([](auto results, Session &session, const auto &providing, const NSError &error) {
                setProviding(results, session, providing);
                setError(results, error);
              }));
        });
  }

  kj::Promise<void> stopProvidingItemAtURL(StopProvidingItemAtURLContext context) override {
    return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
      object.stopProvidingItemAtURL(url, reply(writeOutcome));
    });
  }

  kj::Promise<void> itemChangedAtURL(ItemChangedAtURLContext context) override {
    return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
      object.itemChangedAtURL(url, reply(writeOutcome));
    });
  }

  kj::Promise<void> providePlaceholderAtURL(ProvidePlaceholderAtURLContext context) override {
    return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
      object.providePlaceholderAtURL(url, reply(writeOutcome));
    });
  }

  kj::Promise<void> movingItemAtURL(MovingItemAtURLContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context,
        [url = getURL(params),
         destination = params.hasDestination() ? readURL(params.getDestination()) : NSURL()](
            auto &object, auto reply) { object.movingItemAtURL(url, destination, reply(writeMoving)); });
  }

  kj::Promise<void> performAction(PerformActionContext context) override {
    return exported_.serve(
        context, [request = readActionRequest(context.getParams().getRequest())](auto &object, auto reply) {
          object.performAction(request, reply(xpcWriteAction));
        });
  }

  kj::Promise<void> listenerEndpointForServiceName(ListenerEndpointForServiceNameContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [name = xpcString(params.getName()), identifier = xpcString(params.getIdentifier())](
                     auto &object, auto reply) {
          object.listenerEndpointForServiceName(name, identifier, reply(xpcWriteService));
        });
  }

  kj::Promise<void> fetchThumbnails(FetchThumbnailsContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [identifiers = readStrings(params.getIdentifiers()),
                  size = CGSize{params.getWidth(), params.getHeight()}](auto &object, auto reply) {
          object.fetchThumbnailsForItemIdentifiers(identifiers, size, reply(xpcWriteThumbnails));
        });
  }

  kj::Promise<void> defaultContainer(DefaultContainerContext context) override {
    return exported_.serve(context, [bundle = getIdentifier(context.getParams())](auto &object, auto reply) {
      object.defaultContainerForBundleIdentifier(
          bundle, reply([](auto results, Session &, const auto &item, const NSError &error) {
            setItem(results, item);
            setError(results, error);
          }));
    });
  }

 private:
  Exported<NSFileProviderExtensionProtocol> exported_;
};

class ExtensionProxy final : public XPCProxy<Schema, NSFileProviderExtensionProtocol, ExtensionProxy> {
 public:
  using XPCProxy::XPCProxy;

  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override {
    call(
        &Client::itemForIdentifierRequest,
        [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getItem(results), getError(results)); });
  }

  void URLForItemIdentifier(const std::string &identifier, NSFileProviderURLCompletion completion) override {
    call(
        &Client::urlForItemIdentifierRequest,
        [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getURL(results)); });
  }

  void identifierForItemAtURL(const NSURL &url, NSFileProviderIdentifierCompletion completion) override {
    call(
        &Client::identifierForItemAtURLRequest, [url](auto params, Session &) { setURL(params, url); },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getIdentifier(results)); });
  }

  void enumeratorForContainer(const std::string &identifier,
                              NSFileProviderEnumeratorCompletion completion) override {
    call(
        &Client::enumeratorForContainerRequest,
        [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); },
        std::move(completion),
        [](auto results, const RemoteObject &via) {
          return std::tuple(getEnumerator(results, via), getError(results));
        });
  }

  void startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                               FPDProvidingCompletion completion) override {
    call(
        &Client::startProvidingItemAtURLRequest,
        [url, readingOptions](auto params, Session &) {
          setURL(params, url);
          params.setReadingOptions(readingOptions);
        },
        std::move(completion),
        [](auto results, const RemoteObject &via) {
          return std::tuple(getProviding(results, via), getError(results));
        });
  }

  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override {
    call(
        &Client::stopProvidingItemAtURLRequest, [url](auto params, Session &) { setURL(params, url); },
        std::move(completion), readOutcome);
  }

  void itemChangedAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override {
    call(
        &Client::itemChangedAtURLRequest, [url](auto params, Session &) { setURL(params, url); },
        std::move(completion), readOutcome);
  }

  void providePlaceholderAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override {
    call(
        &Client::providePlaceholderAtURLRequest, [url](auto params, Session &) { setURL(params, url); },
        std::move(completion), readOutcome);
  }

  void movingItemAtURL(const NSURL &url, const NSURL &destination,
                       NSFileProviderMovingCompletion completion) override {
    call(
        &Client::movingItemAtURLRequest,
        [url, destination](auto params, Session &) {
          setURL(params, url);
          if (destination) writeURL(params.initDestination(), destination);
        },
        std::move(completion), readMoving);
  }

  void performAction(const FPDActionRequest &request, FPDActionCompletion completion) override {
    call(
        &Client::performActionRequest,
        [request](auto params, Session &) { writeActionRequest(params.initRequest(), request); },
        std::move(completion), xpcReadAction);
  }

  void listenerEndpointForServiceName(const std::string &name, const std::string &itemIdentifier,
                                      FPDServiceCompletion completion) override {
    call(
        &Client::listenerEndpointForServiceNameRequest,
        [name, itemIdentifier](auto params, Session &) {
          params.setName(xpcBytes(name));
          params.setIdentifier(xpcBytes(itemIdentifier));
        },
        std::move(completion), xpcReadService);
  }

  void fetchThumbnailsForItemIdentifiers(const std::vector<std::string> &identifiers, CGSize size,
                                         FPDThumbnailsCompletion completion) override {
    call(
        &Client::fetchThumbnailsRequest,
        [identifiers, size](auto params, Session &) {
          writeStrings(params.initIdentifiers(xpcCount(identifiers)), identifiers);
          params.setWidth(size.width);
          params.setHeight(size.height);
        },
        std::move(completion), xpcReadThumbnails);
  }

  void defaultContainerForBundleIdentifier(const std::optional<std::string> &bundleIdentifier,
                                           NSFileProviderItemCompletion completion) override {
    call(
        &Client::defaultContainerRequest,
        [bundleIdentifier](auto params, Session &) { setIdentifier(params, bundleIdentifier); },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getItem(results), getError(results)); });
  }
};

}  // namespace

const NSXPCInterface &NSFileProviderExtensionInterface() {
  static const auto interface =
      makeXPCInterface<NSFileProviderExtensionProtocol, ExtensionServer, ExtensionProxy>(
          "NSFileProviderExtensionProtocol");
  return interface;
}

}  // namespace droxa
