#include <utility>

#include "platform/fileprovider/xpc/RemoteEnumeratorAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"

namespace droxa {
namespace {

using Schema = schema::NSFileProviderRemoteEnumerator;

class EnumeratorServer final : public Schema::Server {
 public:
  EnumeratorServer(Session &session, std::shared_ptr<NSFileProviderRemoteEnumerator> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> enumerateItems(EnumerateItemsContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [page = params.hasPage() ? xpcData(params.getPage()) : NSData()](auto &object, auto reply) {
          object.enumerateItems(page, reply([](auto results, Session &, const NSFileProviderItems &items,
                                               const NSData &nextPage, const NSError &error) {
                                  writeItems(results.initItems(xpcCount(items)), items);
                                  if (nextPage) results.setNextPage(xpcBytes(nextPage));
                                  setError(results, error);
                                }));
        });
  }

  kj::Promise<void> enumerateChanges(EnumerateChangesContext context) override {
    const auto params = context.getParams();
    return exported_.serve(context, [anchor = params.hasAnchor() ? xpcData(params.getAnchor()) : NSData()](
                                        auto &object, auto reply) {
      object.enumerateChanges(
          anchor, reply([](auto results, Session &, const NSFileProviderItems &updated,
                           const std::vector<std::string> &deleted, const NSData &newAnchor, bool moreComing,
                           const NSError &error) {
            writeItems(results.initUpdated(xpcCount(updated)), updated);
            writeStrings(results.initDeleted(xpcCount(deleted)), deleted);
            if (newAnchor) results.setAnchor(xpcBytes(newAnchor));
            results.setMoreComing(moreComing);
            setError(results, error);
          }));
    });
  }

  kj::Promise<void> currentSyncAnchor(CurrentSyncAnchorContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.currentSyncAnchor(reply([](auto results, Session &, const NSData &anchor) {
        if (anchor) results.setAnchor(xpcBytes(anchor));
      }));
    });
  }

  kj::Promise<void> invalidate(InvalidateContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.invalidate();
      reply.done();
    });
  }

 private:
  Exported<NSFileProviderRemoteEnumerator> exported_;
};

// It has no error handler of its own: failures are given to the completions.
class EnumeratorProxy final : public XPCProxy<Schema, NSFileProviderRemoteEnumerator, EnumeratorProxy> {
 public:
  using XPCProxy::XPCProxy;

  void enumerateItems(const NSData &page, NSFileProviderPageCompletion completion) override {
    call(
        &Client::enumerateItemsRequest,
        [page](auto params, Session &) {
          if (page) params.setPage(xpcBytes(page));
        },
        std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(readItems(results.getItems()),
                            results.hasNextPage() ? xpcData(results.getNextPage()) : NSData(),
                            getError(results));
        },
        XPCAnsweringFailures(
            [](auto &answer, const NSError &error) { answer(NSFileProviderItems(), NSData(), error); }));
  }

  void enumerateChanges(const NSData &anchor, NSFileProviderChangesCompletion completion) override {
    call(
        &Client::enumerateChangesRequest,
        [anchor](auto params, Session &) {
          if (anchor) params.setAnchor(xpcBytes(anchor));
        },
        std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(readItems(results.getUpdated()), readStrings(results.getDeleted()),
                            results.hasAnchor() ? xpcData(results.getAnchor()) : NSData(),
                            static_cast<bool>(results.getMoreComing()), getError(results));
        },
        XPCAnsweringFailures([](auto &answer, const NSError &error) {
          answer(NSFileProviderItems(), std::vector<std::string>(), NSData(), false, error);
        }));
  }

  void currentSyncAnchor(NSFileProviderAnchorCompletion completion) override {
    call(
        &Client::currentSyncAnchorRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(results.hasAnchor() ? xpcData(results.getAnchor()) : NSData());
        },
        XPCAnsweringFailures([](auto &answer, const NSError &) { answer(NSData()); }));
  }

  void invalidate() override {
    tell(&Client::invalidateRequest, [](auto, Session &) {});
  }
};

}  // namespace

Schema::Client exportEnumerator(Session &session,
                                std::shared_ptr<NSFileProviderRemoteEnumerator> enumerator) {
  return kj::heap<EnumeratorServer>(session, std::move(enumerator));
}

std::shared_ptr<NSFileProviderRemoteEnumerator> receivedEnumerator(const RemoteObject &via,
                                                                   Schema::Client client) {
  return std::make_shared<EnumeratorProxy>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
