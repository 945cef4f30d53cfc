#include <utility>

#include "platform/fileprovider/NSFileProviderRemote.h"
#include "platform/fileprovider/xpc/FPDActionAdapter.h"
#include "platform/fileprovider/xpc/FPDControlProtocol.capnp.h"
#include "platform/fileprovider/xpc/FPDProvidingAdapter.h"
#include "platform/fileprovider/xpc/FPDServiceAdapter.h"
#include "platform/fileprovider/xpc/FPDThumbnailsAdapter.h"
#include "platform/fileprovider/xpc/FPDWatchAdapter.h"
#include "platform/fileprovider/xpc/FileProviderInterfaces.h"
#include "platform/fileprovider/xpc/RemoteEnumeratorAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"

namespace droxa {
namespace {

using Schema = schema::FPDControlProtocol;

constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };
constexpr auto writeMoving = [](auto results, Session &, bool requiresProviding, const NSError &error) {
  results.setRequiresProviding(requiresProviding);
  setError(results, error);
};
constexpr auto readOutcome = [](auto results, const RemoteObject &) { return std::tuple(getError(results)); };
constexpr auto readMoving = [](auto results, const RemoteObject &) {
  return std::tuple(static_cast<bool>(results.getRequiresProviding()), getError(results));
};
constexpr auto writeProviding = [](auto results, Session &session, const auto &providing, const NSURL &url,
                                   const NSError &error) {
  setProviding(results, session, providing);
  setURL(results, url);
  setError(results, error);
};
constexpr auto readProviding = [](auto results, const RemoteObject &via) {
  return std::tuple(getProviding(results, via), getURL(results), getError(results));
};

void writeStatus(schema::FPDStatus::Builder builder, const FPDStatus &status) {
  builder.setProcessIdentifier(status.processIdentifier);
  builder.setStartedNanoseconds(status.startedNanoseconds);
  builder.setExtensionProcessIdentifier(status.extensionProcessIdentifier);
  builder.setExtensionStartedNanoseconds(status.extensionStartedNanoseconds);
  builder.setExtensionLaunches(status.extensionLaunches);
  builder.setCachedItems(status.cachedItems);
  builder.setFollowedContainers(status.followedContainers);
  builder.setWatchers(status.watchers);
  builder.setSignals(status.signals);
  builder.setLastExtensionEnd(xpcBytes(status.lastExtensionEnd));
  builder.setMountPoint(xpcBytes(status.mountPoint));
  builder.setMountProblem(xpcBytes(status.mountProblem));
}

FPDStatus readStatus(schema::FPDStatus::Reader reader) {
  FPDStatus status;
  status.processIdentifier = reader.getProcessIdentifier();
  status.startedNanoseconds = reader.getStartedNanoseconds();
  status.extensionProcessIdentifier = reader.getExtensionProcessIdentifier();
  status.extensionStartedNanoseconds = reader.getExtensionStartedNanoseconds();
  status.extensionLaunches = reader.getExtensionLaunches();
  status.cachedItems = reader.getCachedItems();
  status.followedContainers = reader.getFollowedContainers();
  status.watchers = reader.getWatchers();
  status.signals = reader.getSignals();
  status.lastExtensionEnd = xpcString(reader.getLastExtensionEnd());
  status.mountPoint = xpcString(reader.getMountPoint());
  status.mountProblem = xpcString(reader.getMountProblem());
  return status;
}

class ControlServer final : public Schema::Server {
 public:
  ControlServer(Session &session, std::shared_ptr<FPDControlProtocol> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> getStatus(GetStatusContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.getStatus(reply([](auto results, Session &, const FPDStatus &status) {
        writeStatus(results.initStatus(), status);
      }));
    });
  }

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

  kj::Promise<void> itemAtPath(ItemAtPathContext context) override {
    return exported_.serve(
        context, [path = xpcString(context.getParams().getPath())](auto &object, auto reply) {
          object.itemAtPath(path, reply([](auto results, Session &, const auto &item, const NSError &error) {
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

  kj::Promise<void> watchContainer(WatchContainerContext context) override {
    const auto params = context.getParams();
    KJ_REQUIRE(params.hasObserver(), "a watch without an observer");
    return exported_.serve(
        context, [identifier = xpcString(params.getIdentifier()),
                  observer = receivedWatchObserver(*exported_.session(), params.getObserver())](auto &object,
                                                                                                auto reply) {
          object.watchContainer(
              identifier, observer,
              reply([](auto results, Session &session, const auto &watch, const NSError &error) {
                if (watch) results.setWatch(exportWatch(session, watch));
                setError(results, error);
              }));
        });
  }

  kj::Promise<void> startProvidingItemWithIdentifier(
      StartProvidingItemWithIdentifierContext context) override {
    const auto params = context.getParams();
    return exported_.serve(context, [identifier = xpcString(params.getIdentifier()),
                                     options = params.getReadingOptions()](auto &object, auto reply) {
      object.startProvidingItemWithIdentifier(identifier, options, reply(writeProviding));
    });
  }

  kj::Promise<void> startProvidingItemAtPath(StartProvidingItemAtPathContext context) override {
    const auto params = context.getParams();
    return exported_.serve(context, [path = xpcString(params.getPath()),
                                     options = params.getReadingOptions()](auto &object, auto reply) {
      object.startProvidingItemAtPath(path, options, reply(writeProviding));
    });
  }

  kj::Promise<void> stopProvidingItemAtURL(StopProvidingItemAtURLContext context) override {
    return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
      object.stopProvidingItemAtURL(url, reply(writeOutcome));
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

  kj::Promise<void> fillDesktopThumbnails(FillDesktopThumbnailsContext context) override {
    return exported_.serve(
        context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
          object.fillDesktopThumbnailsForContainer(identifier, reply(writeOutcome));
        });
  }

  kj::Promise<void> mountAtPath(MountAtPathContext context) override {
    return exported_.serve(
        context, [path = xpcString(context.getParams().getPath())](auto &object, auto reply) {
          object.mountAtPath(
              path, reply([](auto results, Session &, const std::string &mountPoint, const NSError &error) {
                results.setMountPoint(xpcBytes(mountPoint));
                setError(results, error);
              }));
        });
  }

  kj::Promise<void> unmount(UnmountContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) { object.unmount(reply(writeOutcome)); });
  }

 private:
  Exported<FPDControlProtocol> exported_;
};

class ControlProxy final : public XPCProxy<Schema, FPDControlProtocol, ControlProxy> {
 public:
  using XPCProxy::XPCProxy;

  void getStatus(FPDStatusCompletion completion) override {
    call(
        &Client::getStatusRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(readStatus(results.getStatus())); });
  }

  void itemForIdentifier(const std::string &identifier, NSFileProviderItemCompletion completion) override {
    call(
        &Client::itemForIdentifierRequest,
        [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); },
        std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getItem(results), getError(results)); });
  }

  void itemAtPath(const std::string &path, NSFileProviderItemCompletion completion) override {
    call(
        &Client::itemAtPathRequest, [path](auto params, Session &) { params.setPath(xpcBytes(path)); },
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

  void watchContainer(const std::string &identifier, std::shared_ptr<FPDWatchObserver> observer,
                      FPDWatchCompletion completion) override {
    call(
        &Client::watchContainerRequest,
        [identifier, observer = std::move(observer)](auto params, Session &session) {
          params.setIdentifier(xpcBytes(identifier));
          if (observer) params.setObserver(exportWatchObserver(session, observer));
        },
        std::move(completion),
        [](auto results, const RemoteObject &via) {
          return std::tuple(results.hasWatch() ? receivedWatch(via, results.getWatch()) : nullptr,
                            getError(results));
        });
  }

  void startProvidingItemWithIdentifier(const std::string &identifier, std::uint64_t readingOptions,
                                        FPDItemProvidingCompletion completion) override {
    call(
        &Client::startProvidingItemWithIdentifierRequest,
        [identifier, readingOptions](auto params, Session &) {
          params.setIdentifier(xpcBytes(identifier));
          params.setReadingOptions(readingOptions);
        },
        std::move(completion), readProviding);
  }

  void startProvidingItemAtPath(const std::string &path, std::uint64_t readingOptions,
                                FPDItemProvidingCompletion completion) override {
    call(
        &Client::startProvidingItemAtPathRequest,
        [path, readingOptions](auto params, Session &) {
          params.setPath(xpcBytes(path));
          params.setReadingOptions(readingOptions);
        },
        std::move(completion), readProviding);
  }

  void stopProvidingItemAtURL(const NSURL &url, NSFileProviderErrorCompletion completion) override {
    call(
        &Client::stopProvidingItemAtURLRequest, [url](auto params, Session &) { setURL(params, url); },
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

  void fillDesktopThumbnailsForContainer(const std::string &identifier,
                                         NSFileProviderErrorCompletion completion) override {
    call(
        &Client::fillDesktopThumbnailsRequest,
        [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); },
        std::move(completion), readOutcome, XPCWithoutDeadline);
  }

  void mountAtPath(const std::string &path, FPDMountCompletion completion) override {
    call(
        &Client::mountAtPathRequest, [path](auto params, Session &) { params.setPath(xpcBytes(path)); },
        std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(xpcString(results.getMountPoint()), getError(results));
        });
  }

  void unmount(NSFileProviderErrorCompletion completion) override {
    call(
        &Client::unmountRequest, [](auto, Session &) {}, std::move(completion), readOutcome);
  }
};

}  // namespace

const NSXPCInterface &FPDControlInterface() {
  static const auto interface =
      makeXPCInterface<FPDControlProtocol, ControlServer, ControlProxy>("FPDControlProtocol");
  return interface;
}

}  // namespace droxa
