#include "tessaly/QVOperationClient.h"

#include <kj/debug.h>
#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVPassedOperations.h"

namespace droxa {
namespace {

// Serial, like the operations: what was told first arrives first.
class CancellableServer final : public schema::QVCancellable::Server {
 public:
  CancellableServer(Session &session, std::shared_ptr<QVCancellable> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> invalidate(InvalidateContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.invalidate();
      reply.done();
    });
  }

 private:
  Exported<QVCancellable> exported_;
};

class CancellableProxy final : public XPCProxy<schema::QVCancellable, QVCancellable, CancellableProxy> {
 public:
  using XPCProxy::XPCProxy;
  void invalidate() override {
    tell(&Client::invalidateRequest, [](auto, Session &) {});
  }
};

class OperationServer final : public schema::QVOperationClient::Server {
 public:
  OperationServer(Session &session, std::shared_ptr<QVOperationClient> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> invalidate(InvalidateContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.invalidate();
      reply.done();
    });
  }

  kj::Promise<void> progressCallbackWithTopic(ProgressCallbackWithTopicContext context) override {
    const auto params = context.getParams();
    return exported_.serve(
        context, [topic = xpcString(params.getTopic()), userInfo = readUserInfo(params.getUserInfo())](
                     auto &object, auto reply) {
          object.progressCallbackWithTopic(topic, userInfo);
          reply.done();
        });
  }

  kj::Promise<void> setRemoteOperationProxy(SetRemoteOperationProxyContext context) override {
    const auto params = context.getParams();
    const auto session = exported_.session();
    KJ_REQUIRE(session != nullptr, "the connection ended");
    std::shared_ptr<QVCancellable> proxy;
    if (params.hasProxy())
      proxy =
          std::make_shared<CancellableProxy>(RemoteObject::received(*session, params.getProxy(), nullptr));
    return exported_.serve(context,
                           [proxy, userInfo = readUserInfo(params.getUserInfo())](auto &object, auto reply) {
                             object.setRemoteOperationProxy(proxy, userInfo);
                             reply.done();
                           });
  }

 private:
  Exported<QVOperationClient> exported_;
};

class OperationProxy final : public XPCProxy<schema::QVOperationClient, QVOperationClient, OperationProxy> {
 public:
  using XPCProxy::XPCProxy;

  std::string description() const override { return "<an operation of another process>"; }

  void invalidate() override {
    tell(&schema::QVCancellable::Client::invalidateRequest, [](auto, Session &) {});
  }

  void progressCallbackWithTopic(const std::string &topic, const NSUserInfo &userInfo) override {
    tell(&Client::progressCallbackWithTopicRequest, [topic, userInfo](auto params, Session &) {
      params.setTopic(xpcBytes(topic));
      writeUserInfo(params.initUserInfo(userInfoSize(userInfo)), userInfo);
    });
  }

  void setRemoteOperationProxy(std::shared_ptr<QVCancellable> proxy, const NSUserInfo &userInfo) override {
    tell(&Client::setRemoteOperationProxyRequest,
         [proxy = std::move(proxy), userInfo](auto params, Session &session) {
           if (proxy) params.setProxy(kj::heap<CancellableServer>(session, proxy));
           writeUserInfo(params.initUserInfo(userInfoSize(userInfo)), userInfo);
         });
  }
};

}  // namespace

schema::QVOperationClient::Client exportOperation(Session &session,
                                                  std::shared_ptr<QVOperationClient> operation) {
  return kj::heap<OperationServer>(session, std::move(operation));
}

std::shared_ptr<QVOperationClient> receivedOperation(Session &session,
                                                     schema::QVOperationClient::Client client) {
  return std::make_shared<OperationProxy>(RemoteObject::received(session, kj::mv(client), nullptr));
}

}  // namespace droxa
