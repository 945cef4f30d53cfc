#include <utility>

#include "platform/fileprovider/xpc/FPDWatchAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"
#include "platform/xpc/capnp/Values.h"

namespace droxa {
namespace {

using Schema = schema::FPDWatchObserver;

void writeChange(schema::FPDChange::Builder builder, const FPDChange &change) {
  builder.setKind(static_cast<std::uint8_t>(change.kind));
  builder.setIdentifier(xpcBytes(change.identifier));
  if (change.item) writeItem(builder.initItem(), *change.item);
  builder.setOldName(xpcBytes(change.oldName));
}

FPDChange readChange(schema::FPDChange::Reader reader) {
  KJ_REQUIRE(reader.getKind() <= static_cast<std::uint8_t>(FPDChange::Kind::relisted),
             "a change of an unknown kind");
  FPDChange change;
  change.kind = static_cast<FPDChange::Kind>(reader.getKind());
  change.identifier = xpcString(reader.getIdentifier());
  if (reader.hasItem()) change.item = readItem(reader.getItem());
  change.oldName = xpcString(reader.getOldName());
  return change;
}

std::vector<FPDChange> readChanges(capnp::List<schema::FPDChange>::Reader list) {
  std::vector<FPDChange> changes;
  changes.reserve(list.size());
  for (const auto change : list) changes.push_back(readChange(change));
  return changes;
}

class ObserverServer final : public Schema::Server {
 public:
  ObserverServer(Session &session, std::shared_ptr<FPDWatchObserver> object)
      : exported_(session, std::move(object), XPCOrder::serial) {}

  kj::Promise<void> receiveChanges(ReceiveChangesContext context) override {
    return exported_.serve(
        context, [changes = readChanges(context.getParams().getChanges())](auto &object, auto reply) {
          object.receiveChanges(changes, reply([](auto, Session &) {}));
        });
  }

 private:
  Exported<FPDWatchObserver> exported_;
};

class ObserverProxy final : public XPCProxy<Schema, FPDWatchObserver, ObserverProxy> {
 public:
  using XPCProxy::XPCProxy;

  void receiveChanges(const std::vector<FPDChange> &changes, std::function<void()> reply) override {
    call(
        &Client::receiveChangesRequest,
        [changes](auto params, Session &) {
          auto list = params.initChanges(xpcCount(changes));
          for (unsigned index = 0; index < list.size(); ++index) writeChange(list[index], changes[index]);
        },
        std::move(reply), [](auto, const RemoteObject &) { return std::tuple(); });
  }
};

}  // namespace

Schema::Client exportWatchObserver(Session &session, std::shared_ptr<FPDWatchObserver> observer) {
  return kj::heap<ObserverServer>(session, std::move(observer));
}

std::shared_ptr<FPDWatchObserver> receivedWatchObserver(Session &session, Schema::Client client) {
  return std::make_shared<ObserverProxy>(RemoteObject::received(session, kj::mv(client), nullptr));
}

}  // namespace droxa
