#include <utility>

#include "platform/fileprovider/xpc/FPDProvidingAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

class ProvidingServer final : public schema::FPDProviding::Server {
 public:
  ProvidingServer(Session &session, std::shared_ptr<FPDProviding> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> waitWithReply(WaitWithReplyContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.waitWithReply(
          reply([](auto results, Session &, const NSError &error) { setError(results, error); }));
    });
  }

  kj::Promise<void> getProgress(GetProgressContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.getProgress(reply([](auto results, Session &, std::int64_t completed, std::int64_t total) {
        results.setCompleted(completed);
        results.setTotal(total);
      }));
    });
  }

  kj::Promise<void> cancel(CancelContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.cancel();
      reply.done();
    });
  }

 private:
  Exported<FPDProviding> exported_;
};

class ProvidingProxy final : public XPCProxy<schema::FPDProviding, FPDProviding, ProvidingProxy> {
 public:
  using XPCProxy::XPCProxy;

  // However long the download takes.
  void waitWithReply(NSFileProviderErrorCompletion completion) override {
    call(
        &Client::waitWithReplyRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getError(results)); }, XPCWithoutDeadline);
  }

  void getProgress(FPDProgressCompletion completion) override {
    call(
        &Client::getProgressRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) {
          return std::tuple(static_cast<std::int64_t>(results.getCompleted()),
                            static_cast<std::int64_t>(results.getTotal()));
        });
  }

  void cancel() override {
    tell(&Client::cancelRequest, [](auto, Session &) {});
  }
};

}  // namespace

schema::FPDProviding::Client exportProviding(Session &session, std::shared_ptr<FPDProviding> providing) {
  return kj::heap<ProvidingServer>(session, std::move(providing));
}

std::shared_ptr<FPDProviding> receivedProviding(const RemoteObject &via,
                                                schema::FPDProviding::Client client) {
  return std::make_shared<ProvidingProxy>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
