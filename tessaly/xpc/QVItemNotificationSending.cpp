#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVPassedObjects.h"

namespace droxa {
namespace {

using Schema = schema::QVItemNotificationSending;

// Serial: a watch that was set up before the invalidation arrives before it.
class SenderServer final : public Schema::Server {
 public:
  SenderServer(Session &session, std::shared_ptr<QVItemNotificationSending> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> boostPriority(BoostPriorityContext context) override {
    return exported_.serve(
        context, [](auto &object, auto reply) { object.boostPriority(reply([](auto, Session &) {})); });
  }

  kj::Promise<void> watchItemAtURL(WatchItemAtURLContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [url = getURL(params), options = params.getOptions()](auto &object, auto reply) {
          object.watchItemAtURL(url, options, reply([](auto results, Session &, const NSError &error) {
                                  setError(results, error);
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
  Exported<QVItemNotificationSending> exported_;
};

class SenderProxy final : public XPCProxy<Schema, QVItemNotificationSender, SenderProxy> {
 public:
  using XPCProxy::XPCProxy;

  void boostPriority(QVReply block) override {
    call(
        &Client::boostPriorityRequest, [](auto, Session &) {}, std::move(block),
        [](auto, const RemoteObject &) { return std::tuple(); }, XPCWithoutDeadline);
  }

  void watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) override {
    call(
        &Client::watchItemAtURLRequest,
        [url, options](auto params, Session &) {
          setURL(params, url);
          params.setOptions(options);
        },
        std::move(gatherReply),
        [](auto results, const RemoteObject &) { return std::tuple(getError(results)); });
  }

  void invalidate() override {
    tell(&Client::invalidateRequest, [](auto, Session &) {});
  }
};

}  // namespace

Schema::Client exportSender(Session &session, std::shared_ptr<QVItemNotificationSending> sender) {
  return kj::heap<SenderServer>(session, std::move(sender));
}

std::shared_ptr<QVItemNotificationSender> receivedSender(const RemoteObject &via, Schema::Client client) {
  return std::make_shared<SenderProxy>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
