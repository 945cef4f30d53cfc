#include <utility>

#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"
#include "tessaly/xpc/QVPassedObjects.h"

namespace droxa {
namespace {

using Schema = schema::QVTransfer;

// Lives as long as the client's reference: when the client lets go of it, or its connection ends, the
// transfer is released here, and with it the client's interest.
class TransferServer final : public Schema::Server {
 public:
  TransferServer(Session &session, std::shared_ptr<QVTransferring> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> waitWithReply(WaitWithReplyContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.waitWithReply(
          reply([](auto results, Session &, const NSError &error) { setError(results, error); }));
    });
  }

  kj::Promise<void> getProgress(GetProgressContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.getProgress(
          reply([](auto results, Session &, std::uint64_t completedBytes, std::uint64_t totalBytes) {
            results.setCompletedBytes(completedBytes);
            results.setTotalBytes(totalBytes);
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
  Exported<QVTransferring> exported_;
};

class TransferProxy final : public XPCProxy<Schema, QVTransferring, TransferProxy> {
 public:
  using XPCProxy::XPCProxy;

  // However long it takes: a daemon that goes away ends it through the error handler.
  void waitWithReply(QVContentsErrorReply reply) override {
    call(
        &Client::waitWithReplyRequest, [](auto, Session &) {}, std::move(reply),
        [](auto results, const RemoteObject &) { return std::tuple(getError(results)); }, XPCWithoutDeadline);
  }

  void getProgress(QVProgressReply reply) override {
    call(
        &Client::getProgressRequest, [](auto, Session &) {}, std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(results.getCompletedBytes(), results.getTotalBytes());
        });
  }

  void cancel() override {
    tell(&Client::cancelRequest, [](auto, Session &) {});
  }
};

// A transfer as the reply of startDownloadAtURL brings it.
class ReceivedTransfer final : public QVTransfer {
 public:
  explicit ReceivedTransfer(RemoteObject remote) : proxy_(std::move(remote)) {}

  void waitWithReply(QVContentsErrorReply reply) override { proxy_.waitWithReply(std::move(reply)); }
  void getProgress(QVProgressReply reply) override { proxy_.getProgress(std::move(reply)); }
  void cancel() override { proxy_.cancel(); }
  std::shared_ptr<QVTransferring> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override {
    return proxy_.remoteObjectProxyWithErrorHandler(std::move(handler));
  }

 private:
  TransferProxy proxy_;
};

}  // namespace

Schema::Client exportTransfer(Session &session, std::shared_ptr<QVTransferring> transfer) {
  return kj::heap<TransferServer>(session, std::move(transfer));
}

std::shared_ptr<QVTransfer> receivedTransfer(const RemoteObject &via, Schema::Client client) {
  return std::make_shared<ReceivedTransfer>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
