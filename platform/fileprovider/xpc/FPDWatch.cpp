#include <utility>

#include "platform/fileprovider/xpc/FPDWatchAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

class WatchServer final : public schema::FPDWatch::Server {
 public:
  WatchServer(Session &session, std::shared_ptr<FPDWatch> object) : exported_(session, std::move(object)) {}

  kj::Promise<void> stop(StopContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.stop();
      reply.done();
    });
  }

 private:
  Exported<FPDWatch> exported_;
};

class WatchProxy final : public XPCProxy<schema::FPDWatch, FPDWatch, WatchProxy> {
 public:
  using XPCProxy::XPCProxy;
  void stop() override {
    tell(&Client::stopRequest, [](auto, Session &) {});
  }
};

}  // namespace

schema::FPDWatch::Client exportWatch(Session &session, std::shared_ptr<FPDWatch> watch) {
  return kj::heap<WatchServer>(session, std::move(watch));
}

std::shared_ptr<FPDWatch> receivedWatch(const RemoteObject &via, schema::FPDWatch::Client client) {
  return std::make_shared<WatchProxy>(RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
