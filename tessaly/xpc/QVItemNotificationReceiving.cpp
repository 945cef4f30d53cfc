#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "tessaly/xpc/QVPassedObjects.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

using Schema = schema::QVItemNotificationReceiving;

class ReceiverServer final : public Schema::Server {
 public:
  ReceiverServer(Session &session, std::shared_ptr<QVItemNotificationReceiving> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> receiveUpdates(ReceiveUpdatesContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context,
        [items = readQueryItems(params.getItems()), logical = readStrings(params.getLogicalExtensions()),
         physical = readStrings(params.getPhysicalExtensions())](auto &object, auto reply) {
          object.receiveUpdates(items, logical, physical, reply([](auto, Session &) {}));
        });
  }

  kj::Promise<void> receiveProgressUpdates(ReceiveProgressUpdatesContext context) override {
    return exported_.serve(
        context, [updates = readStrings(context.getParams().getUpdates())](auto &object, auto reply) {
          object.receiveProgressUpdates(updates, reply([](auto, Session &) {}));
        });
  }

 private:
  Exported<QVItemNotificationReceiving> exported_;
};

class ReceiverProxy final : public XPCProxy<Schema, QVItemNotificationReceiving, ReceiverProxy> {
 public:
  using XPCProxy::XPCProxy;

  void receiveUpdates(const QVQueryItems &items, const std::vector<std::string> &logicalExtensions,
                      const std::vector<std::string> &physicalExtensions, QVReply reply) override {
    call(
        &Client::receiveUpdatesRequest,
        [items, logicalExtensions, physicalExtensions](auto params, Session &) {
          writeQueryItems(params.initItems(xpcCount(items)), items);
          writeStrings(params.initLogicalExtensions(xpcCount(logicalExtensions)), logicalExtensions);
          writeStrings(params.initPhysicalExtensions(xpcCount(physicalExtensions)), physicalExtensions);
        },
        std::move(reply), [](auto, const RemoteObject &) { return std::tuple(); });
  }

  void receiveProgressUpdates(const std::vector<std::string> &updates, QVReply reply) override {
    call(
        &Client::receiveProgressUpdatesRequest,
        [updates](auto params, Session &) { writeStrings(params.initUpdates(xpcCount(updates)), updates); },
        std::move(reply), [](auto, const RemoteObject &) { return std::tuple(); });
  }
};

}  // namespace

Schema::Client exportReceiver(Session &session, std::shared_ptr<QVItemNotificationReceiving> receiver) {
  return kj::heap<ReceiverServer>(session, std::move(receiver));
}

std::shared_ptr<QVItemNotificationReceiving> receivedReceiver(Session &session, Schema::Client client) {
  return std::make_shared<ReceiverProxy>(RemoteObject::received(session, kj::mv(client), nullptr));
}

}  // namespace droxa
