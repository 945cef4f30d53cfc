// What is asked about contents.

#include <utility>

#include "tessaly/xpc/QVContentsValues.h"
#include "tessaly/xpc/QVPassedObjects.h"
#include "tessaly/xpc/QVProtocolProxy.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto readOutcome = [](auto results, const RemoteObject &) { return std::tuple(getError(results)); };

auto writeURLOf(const NSURL &url) {
  return [url](auto params, Session &) { setURL(params, url); };
}

}  // namespace

void QVProtocolProxy::startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) {
  call(
      &Client::startDownloadAtURLRequest,
      [url, options](auto params, Session &) {
        setURL(params, url);
        params.setOptions(options);
      },
      std::move(reply),
      [](auto results, const RemoteObject &via) {
        return std::tuple(results.hasTransfer() ? receivedTransfer(via, results.getTransfer()) : nullptr,
                          getError(results));
      });
}

// A folder's documents are looked at one by one, so this takes as long as they are many.
void QVProtocolProxy::evictItemAtURL(const NSURL &url, QVContentsResultReply reply) {
  call(
      &Client::evictItemAtURLRequest, writeURLOf(url), std::move(reply),
      [](auto results, const RemoteObject &) {
        return std::tuple(readContentsResult(results.getResult()), getError(results));
      },
      XPCWithoutDeadline);
}

void QVProtocolProxy::setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) {
  call(
      &Client::setPinnedAtURLRequest,
      [url, isPinned](auto params, Session &) {
        setURL(params, url);
        params.setIsPinned(isPinned);
      },
      std::move(reply), readOutcome);
}

void QVProtocolProxy::getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) {
  call(&Client::getContentsStatusAtURLRequest, writeURLOf(url), std::move(reply),
       [](auto results, const RemoteObject &) {
         return std::tuple(readContentsStatus(results.getStatus()), getError(results));
       });
}

void QVProtocolProxy::getTransferStatus(QVTransferStatusReply reply) {
  call(
      &Client::getTransferStatusRequest, [](auto, Session &) {}, std::move(reply),
      [](auto results, const RemoteObject &) {
        return std::tuple(readTransferStatus(results.getStatus()), getError(results));
      });
}

void QVProtocolProxy::waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) {
  call(&Client::waitForUploadAtURLRequest, writeURLOf(url), std::move(reply), readOutcome,
       XPCWithoutDeadline);
}

void QVProtocolProxy::getMoveCapability(const NSURL &source, const NSURL &destination,
                                        QVMoveCapabilityReply reply) {
  call(
      &Client::getMoveCapabilityRequest,
      [source, destination](auto params, Session &) {
        if (source) writeURL(params.initSource(), source);
        if (destination) writeURL(params.initDestination(), destination);
      },
      std::move(reply),
      [](auto results, const RemoteObject &) {
        return std::tuple(results.getCapability(), getError(results));
      });
}

void QVProtocolProxy::allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) {
  call(&Client::allowDeletionAtURLRequest, writeURLOf(url), std::move(reply), readOutcome);
}

void QVProtocolProxy::confirmDeletions(bool carryOut, QVContentsErrorReply reply) {
  call(
      &Client::confirmDeletionsRequest, [carryOut](auto params, Session &) { params.setCarryOut(carryOut); },
      std::move(reply), readOutcome);
}

}  // namespace droxa
