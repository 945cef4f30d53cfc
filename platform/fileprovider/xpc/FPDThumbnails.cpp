#include <utility>

#include "platform/fileprovider/xpc/FPDThumbnailsAdapter.h"
#include "platform/xpc/capnp/Exported.h"
#include "platform/xpc/capnp/Proxy.h"

namespace droxa {
namespace {

using ThumbnailList = capnp::List<schema::FPDThumbnail>;

void writeThumbnails(ThumbnailList::Builder list, const std::vector<FPDThumbnail> &thumbnails) {
  for (unsigned index = 0; index < list.size(); ++index) {
    const FPDThumbnail &thumbnail = thumbnails[index];
    schema::FPDThumbnail::Builder builder = list[index];
    builder.setIdentifier(xpcBytes(thumbnail.identifier));
    if (thumbnail.imageData) builder.setImageData(xpcBytes(thumbnail.imageData));
    if (thumbnail.contentType) builder.setContentType(xpcBytes(*thumbnail.contentType));
    setError(builder, thumbnail.error);
  }
}

std::vector<FPDThumbnail> readThumbnails(ThumbnailList::Reader list) {
  std::vector<FPDThumbnail> thumbnails;
  thumbnails.reserve(list.size());
  for (const auto reader : list) {
    FPDThumbnail thumbnail;
    thumbnail.identifier = xpcString(reader.getIdentifier());
    if (reader.hasImageData()) thumbnail.imageData = xpcData(reader.getImageData());
    if (reader.hasContentType()) thumbnail.contentType = xpcString(reader.getContentType());
    thumbnail.error = getError(reader);
    thumbnails.push_back(std::move(thumbnail));
  }
  return thumbnails;
}

class ThumbnailsServer final : public schema::FPDThumbnails::Server {
 public:
  ThumbnailsServer(Session &session, std::shared_ptr<FPDThumbnails> object)
      : exported_(session, std::move(object)) {}

  kj::Promise<void> next(NextContext context) override {
    return exported_.serve(context, [](auto &object, auto reply) {
      object.nextWithReply(reply([](auto results, Session &, const std::vector<FPDThumbnail> &thumbnails,
                                    bool isLast, const NSError &error) {
        writeThumbnails(results.initThumbnails(xpcCount(thumbnails)), thumbnails);
        results.setIsLast(isLast);
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
  // Not one call after the other: a cancellation doesn't wait for what is to come.
  Exported<FPDThumbnails> exported_;
};

class ThumbnailsProxy final : public XPCProxy<schema::FPDThumbnails, FPDThumbnails, ThumbnailsProxy> {
 public:
  using XPCProxy::XPCProxy;

  // However long the cloud takes.
  void nextWithReply(FPDThumbnailsReply reply) override {
    call(
        &Client::nextRequest, [](auto, Session &) {}, std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(readThumbnails(results.getThumbnails()), static_cast<bool>(results.getIsLast()),
                            getError(results));
        },
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

schema::FPDThumbnails::Client exportThumbnails(Session &session, std::shared_ptr<FPDThumbnails> thumbnails) {
  return kj::heap<ThumbnailsServer>(session, std::move(thumbnails));
}

std::shared_ptr<FPDThumbnails> receivedThumbnails(const RemoteObject &via,
                                                  schema::FPDThumbnails::Client client) {
  return std::make_shared<ThumbnailsProxy>(
      RemoteObject::received(*via.session, kj::mv(client), via.errorHandler));
}

}  // namespace droxa
