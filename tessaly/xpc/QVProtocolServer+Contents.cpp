// What clients ask about contents.

#include <utility>

#include "tessaly/xpc/QVContentsValues.h"
#include "tessaly/xpc/QVPassedObjects.h"
#include "tessaly/xpc/QVProtocolServer.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };

void writeTransfer(schema::QVProtocol::StartDownloadAtURLResults::Builder results, Session &session,
                   const std::shared_ptr<QVTransfer> &transfer, const NSError &error) {
  if (transfer) results.setTransfer(exportTransfer(session, transfer));
  setError(results, error);
}

}  // namespace

kj::Promise<void> QVProtocolServer::startDownloadAtURL(StartDownloadAtURLContext context) {
  const auto params = context.getParams();
  return exported_.serve(context,
                         [url = getURL(params), options = params.getOptions()](auto &object, auto reply) {
                           object.startDownloadAtURL(url, options, reply(writeTransfer));
                         });
}

kj::Promise<void> QVProtocolServer::evictItemAtURL(EvictItemAtURLContext context) {
  return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.evictItemAtURL(
        url, reply([](auto results, Session &, const QVContentsResult &result, const NSError &error) {
          writeContentsResult(results.initResult(), result);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::setPinnedAtURL(SetPinnedAtURLContext context) {
  const auto params = context.getParams();
  return exported_.serve(
      context, [url = getURL(params), isPinned = bool(params.getIsPinned())](auto &object, auto reply) {
        object.setPinnedAtURL(url, isPinned, reply(writeOutcome));
      });
}

kj::Promise<void> QVProtocolServer::getContentsStatusAtURL(GetContentsStatusAtURLContext context) {
  return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.getContentsStatusAtURL(
        url, reply([](auto results, Session &, const QVContentsStatus &status, const NSError &error) {
          writeContentsStatus(results.initStatus(), status);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::getTransferStatus(GetTransferStatusContext context) {
  return exported_.serve(context, [](auto &object, auto reply) {
    object.getTransferStatus(
        reply([](auto results, Session &, const QVTransferStatus &status, const NSError &error) {
          writeTransferStatus(results.initStatus(), status);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::waitForUploadAtURL(WaitForUploadAtURLContext context) {
  return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.waitForUploadAtURL(url, reply(writeOutcome));
  });
}

kj::Promise<void> QVProtocolServer::getMoveCapability(GetMoveCapabilityContext context) {
  const auto params = context.getParams();
  return exported_.serve(
      context, [source = params.hasSource() ? readURL(params.getSource()) : NSURL(),
                destination = params.hasDestination() ? readURL(params.getDestination()) : NSURL()](
                   auto &object, auto reply) {
        object.getMoveCapability(
            source, destination,
            reply([](auto results, Session &, std::uint64_t capability, const NSError &error) {
              results.setCapability(capability);
              setError(results, error);
            }));
      });
}

kj::Promise<void> QVProtocolServer::allowDeletionAtURL(AllowDeletionAtURLContext context) {
  return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.allowDeletionAtURL(url, reply(writeOutcome));
  });
}

kj::Promise<void> QVProtocolServer::confirmDeletions(ConfirmDeletionsContext context) {
  return exported_.serve(context,
                         [carryOut = bool(context.getParams().getCarryOut())](auto &object, auto reply) {
                           object.confirmDeletions(carryOut, reply(writeOutcome));
                         });
}

}  // namespace droxa
