#include <utility>

#include "platform/fileprovider/xpc/FPDActionAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

class ActionServer final : public schema::FPDAction::Server {
 public:
  ActionServer(Session &session, std::shared_ptr<FPDAction> object) : exported_(session, std::move(object)) {}

  kj::Promise<void> waitWithReply(WaitWithReplyContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.waitWithReply(reply([](auto results, Session &, const auto &item, const NSError &error) {
        setItem(results, item);
        setError(results, error);
      }));
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
  // Not one call after the other: a wait may last as long as the work that it begins.
  Exported<FPDAction> exported_;
};

class ActionProxy final : public XPCProxy<schema::FPDAction, FPDAction, ActionProxy> {
 public:
  using XPCProxy::XPCProxy;

  // However long it takes.
  void waitWithReply(NSFileProviderItemCompletion completion) override {
    call(
        &Client::waitWithReplyRequest, [](auto, Session &) {}, std::move(completion),
        [](auto results, const RemoteObject &) { return std::tuple(getItem(results), getError(results)); },
        XPCWithoutDeadline);
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

schema::FPDAction::Client exportAction(Session &session, std::shared_ptr<FPDAction> action) {
  return kj::heap<ActionServer>(session, std::move(action));
}

std::shared_ptr<FPDAction> receivedAction(const RemoteObject &via, schema::FPDAction::Client client) {
  return std::make_shared<ActionProxy>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

void writeActionRequest(schema::FPDActionRequest::Builder builder, const FPDActionRequest &request) {
  builder.setKind(static_cast<std::uint8_t>(request.kind));
  builder.setIdentifier(xpcBytes(request.identifier));
  if (request.parentIdentifier) builder.setParentIdentifier(xpcBytes(*request.parentIdentifier));
  if (request.name) builder.setName(xpcBytes(*request.name));
  setURL(builder, request.url);
  if (request.tagData) builder.setTagData(xpcBytes(request.tagData));
  builder.setDate(request.date.nanosecondsSince1970());
  builder.setHasDate(static_cast<bool>(request.date));
  builder.setFavoriteRank(request.favoriteRank.value_or(0));
  builder.setHasFavoriteRank(request.favoriteRank.has_value());
}

FPDActionRequest readActionRequest(schema::FPDActionRequest::Reader reader) {
  FPDActionRequest request;
  request.kind = static_cast<FPDActionRequest::Kind>(reader.getKind());
  request.identifier = xpcString(reader.getIdentifier());
  if (reader.hasParentIdentifier()) request.parentIdentifier = xpcString(reader.getParentIdentifier());
  if (reader.hasName()) request.name = xpcString(reader.getName());
  request.url = getURL(reader);
  if (reader.hasTagData()) request.tagData = xpcData(reader.getTagData());
  if (reader.getHasDate()) request.date = NSDate::dateWithNanosecondsSince1970(reader.getDate());
  if (reader.getHasFavoriteRank()) request.favoriteRank = reader.getFavoriteRank();
  return request;
}

}  // namespace droxa
