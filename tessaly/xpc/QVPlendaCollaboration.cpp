#include "tessaly/QVPlendaCollaboration.h"

#include <kj/debug.h>
#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Progress.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVPlendaCollaboration.capnp.h"
#include "tessaly/xpc/QVPlendaCollaborationInterface.h"

namespace droxa {
namespace {

using Schema = schema::QVPlendaCollaboration;
using Text = std::optional<std::string>;

constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };
constexpr auto writeText = [](auto results, Session &, const Text &text, const NSError &error) {
  if (text) results.setText(xpcBytes(*text));
  setError(results, error);
};
constexpr auto writeTokens = [](auto results, Session &, const Text &provider, const Text &first,
                                const Text &second, const NSDate &expiry, const NSError &error) {
  if (provider) results.setProvider(xpcBytes(*provider));
  if (first) results.setFirst(xpcBytes(*first));
  if (second) results.setSecond(xpcBytes(*second));
  results.setHasExpiry(static_cast<bool>(expiry));
  results.setExpiry(expiry.nanosecondsSince1970());
  setError(results, error);
};

// Calls run several at a time: one that waits for the daemon holds up no other.
class CollaborationServer final : public Schema::Server {
 public:
  CollaborationServer(Session &session, std::shared_ptr<QVFileProviderPlendaCollaboration> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> fetchVersionAndCapabilities(FetchVersionAndCapabilitiesContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchVersionAndCapabilitiesWithCompletionHandler(reply(
          [](auto results, Session &, std::int64_t version, std::int64_t capabilities, const NSError &error) {
            results.setVersion(version);
            results.setCapabilities(capabilities);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> fetchCollaborationToken(FetchCollaborationTokenContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.fetchCollaborationTokenWithCompletionHandler(reply(writeTokens)));
    });
  }

  kj::Promise<void> fetchLatestRevision(FetchLatestRevisionContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.fetchLatestRevisionWithCompletionHandler(reply(writeOutcome)));
    });
  }

  kj::Promise<void> refreshSharingState(RefreshSharingStateContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.refreshSharingStateWithCompletionHandler(reply(writeOutcome)));
    });
  }

  kj::Promise<void> fetchFileProviderIdentifier(FetchFileProviderIdentifierContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchFileProviderIdentifierWithCompletionHandler(reply(writeText));
    });
  }

  kj::Promise<void> fetchURLForSharingFile(FetchURLForSharingFileContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchURLForSharingFileWithCompletionHandler(
          reply([](auto results, Session &, const NSURL &url, const NSError &error) {
            setURL(results, url);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> fetchFolderSharingState(FetchFolderSharingStateContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchFolderSharingStateWithCompletionHandler(
          reply([](auto results, Session &, bool isShared, const NSError &error) {
            results.setIsShared(isShared);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> fetchSharedFolderInfo(FetchSharedFolderInfoContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchSharedFolderInfoWithCompletionHandler(
          reply([](auto results, Session &session, bool isShared, const Text &folder, const NSError &error) {
            results.setIsShared(isShared);
            writeText(results, session, folder, error);
          }));
    });
  }

  kj::Promise<void> fetchAccountIdentifier(FetchAccountIdentifierContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchAccountIdentifierWithCompletionHandler(reply(writeText));
    });
  }

 private:
  template <class Context>
  ProgressReturn progress(Context &context) const {
    const auto session = exported_.session();
    KJ_REQUIRE(session != nullptr, "the connection ended");
    return getProgressReturn(context.getParams(), *session);
  }

  Exported<QVFileProviderPlendaCollaboration> exported_;
};

template <class Results>
Text getText(Results results) {
  return results.hasText() ? Text(xpcString(results.getText())) : std::nullopt;
}

// What a progress goes with may take as long as it needs.
class CollaborationProxy final
    : public XPCProxy<Schema, QVFileProviderPlendaCollaboration, CollaborationProxy> {
 public:
  using XPCProxy::XPCProxy;

  void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) override {
    call(&Client::fetchVersionAndCapabilitiesRequest, withoutArguments, std::move(handler),
         [](auto results, const RemoteObject &) {
           return std::tuple(std::int64_t{results.getVersion()}, std::int64_t{results.getCapabilities()},
                             getError(results));
         });
  }

  Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) override {
    if (!handler) handler = [](const Text &, const Text &, const Text &, const NSDate &, const NSError &) {};
    const auto mirror = std::make_shared<NSProgress>();
    call(
        &Client::fetchCollaborationTokenRequest, watchedBy(mirror), std::move(handler),
        [](auto results, const RemoteObject &) {
          const NSDate expiry =
              results.getHasExpiry() ? NSDate::dateWithNanosecondsSince1970(results.getExpiry()) : NSDate();
          return std::tuple(results.hasProvider() ? Text(xpcString(results.getProvider())) : std::nullopt,
                            results.hasFirst() ? Text(xpcString(results.getFirst())) : std::nullopt,
                            results.hasSecond() ? Text(xpcString(results.getSecond())) : std::nullopt, expiry,
                            getError(results));
        },
        XPCWithoutDeadline);
    return mirror;
  }

  Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(&Client::fetchLatestRevisionRequest, watchedBy(mirror), std::move(handler), readOutcome,
         XPCWithoutDeadline);
    return mirror;
  }

  Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(&Client::refreshSharingStateRequest, watchedBy(mirror), std::move(handler), readOutcome,
         XPCWithoutDeadline);
    return mirror;
  }

  void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    call(&Client::fetchFileProviderIdentifierRequest, withoutArguments, std::move(handler), readText);
  }

  void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) override {
    call(&Client::fetchURLForSharingFileRequest, withoutArguments, std::move(handler),
         [](auto results, const RemoteObject &) { return std::tuple(getURL(results), getError(results)); });
  }

  Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) override {
    call(&Client::fetchFolderSharingStateRequest, withoutArguments, std::move(handler),
         [](auto results, const RemoteObject &) {
           return std::tuple(bool(results.getIsShared()), getError(results));
         });
    return nullptr;
  }

  Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) override {
    call(&Client::fetchSharedFolderInfoRequest, withoutArguments, std::move(handler),
         [](auto results, const RemoteObject &) {
           return std::tuple(bool(results.getIsShared()), getText(results), getError(results));
         });
    return nullptr;
  }

  void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override {
    call(&Client::fetchAccountIdentifierRequest, withoutArguments, std::move(handler), readText);
  }

 private:
  static constexpr auto withoutArguments = [](auto, Session &) {};
  static constexpr auto readOutcome = [](auto results, const RemoteObject &) {
    return std::tuple(getError(results));
  };
  static constexpr auto readText = [](auto results, const RemoteObject &) {
    return std::tuple(getText(results), getError(results));
  };
};

}  // namespace

const NSXPCInterface &QVPlendaCollaborationInterface() {
  static const auto interface =
      makeXPCInterface<QVFileProviderPlendaCollaboration, CollaborationServer, CollaborationProxy>(
          "QVFileProviderPlendaCollaboration");
  return interface;
}

}  // namespace droxa
