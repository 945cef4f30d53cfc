#include "tessaly/QVSharingService.h"

#include <kj/debug.h>
#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Interface.h"
#include "platform/xpc/capnp/Progress.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVShareValues.h"
#include "tessaly/xpc/QVSharingService.capnp.h"
#include "tessaly/xpc/QVSharingServiceInterface.h"

namespace droxa {
namespace {

using Schema = schema::QVSharingService;
using Item = std::shared_ptr<const NSFileProviderItem>;

constexpr auto writeShareReply = [](auto results, Session &, const std::optional<CKShare> &share,
                                    const NSError &error) {
  setShare(results, share);
  setError(results, error);
};

// Calls run several at a time: one that waits for the daemon holds up no other.
class SharingServer final : public Schema::Server {
 public:
  SharingServer(Session &session, std::shared_ptr<QVSharingService> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> fetchSharingInfo(FetchSharingInfoContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.fetchSharingInfo(
          reply([](auto results, Session &, bool isShared, const Item &item, const NSError &error) {
            results.setIsShared(isShared);
            setItem(results, item);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> preflightCheck(PreflightCheckContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.preflightCheckIfCurrentlyShareableWithCompletion(
          reply([](auto results, Session &, bool isShared, const Item &item, const QVSharingStrings &first,
                   const QVSharingStrings &second, const NSError &error) {
            results.setIsShared(isShared);
            setItem(results, item);
            if (first) writeStrings(results.initFirst().initList(xpcCount(*first)), *first);
            if (second) writeStrings(results.initSecond().initList(xpcCount(*second)), *second);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> fetchParticipantList(FetchParticipantListContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.fetchParticipantListAndPublicPermission(
          reply([](auto results, Session &, const QVShareParticipants &participants,
                   std::int64_t publicPermission, const NSError &error) {
            setParticipants(results, participants);
            results.setPublicPermission(publicPermission);
            setError(results, error);
          })));
    });
  }

  kj::Promise<void> startPreparingForShare(StartPreparingForShareContext context) override {
    return exported_.serve(context, [force = bool(context.getParams().getForce())](auto &object, auto reply) {
      object.startPreparingForShareWhenForcing(force);
      reply.done();
    });
  }

  kj::Promise<void> fetchShare(FetchShareContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.fetchShareWithCompletion(reply(writeShareReply)));
    });
  }

  kj::Promise<void> fetchShareURL(FetchShareURLContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.fetchShareURLWithCompletion(
          reply([](auto results, Session &, const NSURL &url, const NSError &error) {
            setURL(results, url);
            setError(results, error);
          })));
    });
  }

  kj::Promise<void> saveShare(SaveShareContext context) override {
    return exported_.serve(context, [returned = progress(context), share = getShare(context.getParams())](
                                        auto &object, auto reply) {
      returned(object.saveShare(share, reply(writeShareReply)));
    });
  }

  kj::Promise<void> unshare(UnshareContext context) override {
    return exported_.serve(context, [returned = progress(context)](auto &object, auto reply) {
      returned(object.unshareWithCompletion(
          reply([](auto results, Session &, const NSError &error) { setError(results, error); })));
    });
  }

 private:
  template <class Context>
  ProgressReturn progress(Context &context) const {
    const auto session = exported_.session();
    KJ_REQUIRE(session != nullptr, "the connection ended");
    return getProgressReturn(context.getParams(), *session);
  }

  Exported<QVSharingService> exported_;
};

QVSharingStrings readTexts(bool isThere, schema::Texts::Reader texts) {
  return isThere ? QVSharingStrings(readStrings(texts.getList())) : std::nullopt;
}

// What a progress goes with may take as long as it needs.
class SharingProxy final : public XPCProxy<Schema, QVSharingService, SharingProxy> {
 public:
  using XPCProxy::XPCProxy;

  void fetchSharingInfo(QVSharingInfoReply reply) override {
    call(
        &Client::fetchSharingInfoRequest, [](auto, Session &) {}, std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(bool(results.getIsShared()), getItem(results), getError(results));
        });
  }

  Progress preflightCheckIfCurrentlyShareableWithCompletion(QVSharingPreflightReply completion) override {
    call(
        &Client::preflightCheckRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(bool(results.getIsShared()), getItem(results),
                            readTexts(results.hasFirst(), results.getFirst()),
                            readTexts(results.hasSecond(), results.getSecond()), getError(results));
        });
    return nullptr;
  }

  Progress fetchParticipantListAndPublicPermission(QVSharingParticipantsReply completion) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(
        &Client::fetchParticipantListRequest, watchedBy(mirror), std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(getParticipants(results), std::int64_t{results.getPublicPermission()},
                            getError(results));
        },
        XPCWithoutDeadline);
    return mirror;
  }

  void startPreparingForShareWhenForcing(bool force) override {
    tell(&Client::startPreparingForShareRequest, [force](auto params, Session &) { params.setForce(force); });
  }

  Progress fetchShareWithCompletion(QVShareReply completion) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(&Client::fetchShareRequest, watchedBy(mirror), std::move(completion), readShareReply,
         XPCWithoutDeadline);
    return mirror;
  }

  Progress fetchShareURLWithCompletion(QVSharingURLReply completion) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(
        &Client::fetchShareURLRequest, watchedBy(mirror), std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getURL(results), getError(results)); },
        XPCWithoutDeadline);
    return mirror;
  }

  Progress saveShare(const std::optional<CKShare> &share, QVShareReply completion) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(
        &Client::saveShareRequest,
        [watcher = std::weak_ptr(mirror), share](auto params, Session &session) {
          setProgressMirror(params, session, watcher);
          setShare(params, share);
        },
        std::move(completion), readShareReply, XPCWithoutDeadline);
    return mirror;
  }

  Progress unshareWithCompletion(QVShareOutcomeReply completion) override {
    const auto mirror = std::make_shared<NSProgress>();
    call(
        &Client::unshareRequest, watchedBy(mirror), std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getError(results)); }, XPCWithoutDeadline);
    return mirror;
  }

 private:
  static constexpr auto readShareReply = [](auto results, const RemoteObject &) {
    return std::tuple(getShare(results), getError(results));
  };
};

}  // namespace

const NSXPCInterface &getSharingServiceInterface() {
  static const auto interface =
      makeXPCInterface<QVSharingService, SharingServer, SharingProxy>("QVSharingService");
  return interface;
}

}  // namespace droxa
