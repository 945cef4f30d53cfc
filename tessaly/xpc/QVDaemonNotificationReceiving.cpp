#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVPassedObjects.h"

namespace droxa {
namespace {

using Schema = schema::QVDaemonNotificationReceiving;

class DaemonReceiverServer final : public Schema::Server {
 public:
  DaemonReceiverServer(Session &session, std::shared_ptr<QVDaemonNotificationReceiving> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> receiveNotification(ReceiveNotificationContext context) override {
    return exported_.serve(context,
                           [name = xpcString(context.getParams().getName())](auto &object, auto reply) {
                             object.receiveNotification(name, reply([](auto, Session &) {}));
                           });
  }

 private:
  Exported<QVDaemonNotificationReceiving> exported_;
};

class DaemonReceiverProxy final
    : public XPCProxy<Schema, QVDaemonNotificationReceiving, DaemonReceiverProxy> {
 public:
  using XPCProxy::XPCProxy;

  void receiveNotification(const std::string &name, QVReply reply) override {
    call(
        &Client::receiveNotificationRequest,
        [name](auto params, Session &) { params.setName(xpcBytes(name)); }, std::move(reply),
        [](auto, const RemoteObject &) { return std::tuple(); });
  }
};

}  // namespace

Schema::Client exportDaemonReceiver(Session &session,
                                    std::shared_ptr<QVDaemonNotificationReceiving> receiver) {
  return kj::heap<DaemonReceiverServer>(session, std::move(receiver));
}

std::shared_ptr<QVDaemonNotificationReceiving> receivedDaemonReceiver(Session &session,
                                                                      Schema::Client client) {
  return std::make_shared<DaemonReceiverProxy>(RemoteObject::received(session, kj::mv(client), nullptr));
}

}  // namespace droxa
