#pragma once

#include <optional>
#include <string>
#include <utility>

#include "platform/xpc/capnp/Descriptors.h"
#include "platform/xpc/capnp/Proxy.h"
#include "tessaly/xpc/QVPassedOperations.h"
#include "tessaly/xpc/QVShareValues.h"

namespace droxa {

// The sharing operations of a remote object: of one that has nothing else, and of the daemon. Those that
// an operation stands for may take as long as they need; it cancels them.
// Thread contract: any thread, never the loop.
template <class Schema, class Protocol, class Self>
class QVShareOperationCalls : public XPCProxy<Schema, Protocol, Self> {
  using Sharing = schema::QVShareOperationProtocol::Client;
  using Operation = std::shared_ptr<QVOperationClient>;
  using Text = std::optional<std::string>;

 public:
  using XPCProxy<Schema, Protocol, Self>::XPCProxy;

  void startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                             QVShareAndURLReply reply) override {
    this->call(&Sharing::copySharingInfoAtURLRequest, sharingAtURL(op, url), std::move(reply),
               readSharingAndURL, XPCWithoutDeadline);
  }

  void startOperation_toCopyShareURLForShare(Operation op, const std::optional<CKShare> &share,
                                             const Text &appName, QVShareAndURLReply reply) override {
    this->call(
        &Sharing::copyShareURLForShareRequest,
        [op, share, appName](auto params, Session &session) {
          setOperation(params, session, op);
          setShare(params, share);
          if (appName) params.setAppName(xpcBytes(*appName));
        },
        std::move(reply), readSharingAndURL, XPCWithoutDeadline);
  }

  void startOperation_toSaveSharingInfo(Operation op, const std::optional<CKShare> &share,
                                        QVShareReply reply) override {
    this->call(
        &Sharing::saveSharingInfoRequest,
        [op, share](auto params, Session &session) {
          setOperation(params, session, op);
          setShare(params, share);
        },
        std::move(reply), readSharingReply, XPCWithoutDeadline);
  }

  void createSharingInfoForURL(const NSURL &url, QVShareReply reply) override {
    this->call(
        &Sharing::createSharingInfoForURLRequest, [url](auto params, Session &) { setURL(params, url); },
        std::move(reply), readSharingReply);
  }

  void startOperation_toUnshareShare(Operation op, const std::optional<CKShare> &share, bool forceDelete,
                                     QVShareOutcomeReply reply) override {
    this->call(
        &Sharing::unshareShareRequest,
        [op, share, forceDelete](auto params, Session &session) {
          setOperation(params, session, op);
          setShare(params, share);
          params.setForceDelete(forceDelete);
        },
        std::move(reply), readSharingOutcome, XPCWithoutDeadline);
  }

  void startOperation_toModifyRecordAccessAtURL(Operation op, const NSURL &url, bool allowAccess,
                                                QVRecordAccessReply reply) override {
    this->call(
        &Sharing::modifyRecordAccessAtURLRequest,
        [op, url, allowAccess](auto params, Session &session) {
          setOperation(params, session, op);
          setURL(params, url);
          params.setAllowAccess(allowAccess);
        },
        std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(results.hasData() ? xpcData(results.getData()) : NSData(),
                            results.hasText() ? Text(xpcString(results.getText())) : std::nullopt,
                            getError(results));
        },
        XPCWithoutDeadline);
  }

  void startOperation_toCopyParticipantTokenAtURL(Operation op, const NSURL &url,
                                                  QVParticipantTokenReply reply) override {
    this->call(
        &Sharing::copyParticipantTokenAtURLRequest, sharingAtURL(op, url), std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(results.hasFirst() ? Text(xpcString(results.getFirst())) : std::nullopt,
                            results.hasSecond() ? Text(xpcString(results.getSecond())) : std::nullopt,
                            getError(results));
        },
        XPCWithoutDeadline);
  }

  void startOperation_toPrepFolderForSharingAt(Operation op, const NSURL &url,
                                               QVShareOutcomeReply reply) override {
    this->call(&Sharing::prepFolderForSharingAtRequest, sharingAtURL(op, url), std::move(reply),
               readSharingOutcome, XPCWithoutDeadline);
  }

  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override {
    this->call(
        &Sharing::copyCurrentUserNameAndDisplayHandleRequest, [](auto, Session &) {}, std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(
              results.hasName() ? std::optional(readPersonName(results.getName())) : std::nullopt,
              results.hasFirst() ? Text(xpcString(results.getFirst())) : std::nullopt,
              results.hasSecond() ? Text(xpcString(results.getSecond())) : std::nullopt,
              results.hasThird() ? Text(xpcString(results.getThird())) : std::nullopt, getError(results));
        });
  }

  void startOperation_toProcessSubitemsAtURL(Operation op, const NSURL &url,
                                             std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                             QVShareOutcomeReply reply) override {
    this->call(
        &Sharing::processSubitemsAtURLRequest,
        [op, url, maxSubsharesFailures, processType](auto params, Session &session) {
          setOperation(params, session, op);
          setURL(params, url);
          params.setMaxSubsharesFailures(maxSubsharesFailures);
          params.setProcessType(processType);
        },
        std::move(reply), readSharingOutcome, XPCWithoutDeadline);
  }

  void startOperation_toLookupShareParticipants(Operation op, const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override {
    this->call(
        &Sharing::lookupShareParticipantsRequest,
        [op, participants](auto params, Session &session) {
          setOperation(params, session, op);
          setParticipants(params, participants);
        },
        std::move(reply),
        [](auto results, const RemoteObject &) {
          return std::tuple(getParticipants(results), getError(results));
        },
        XPCWithoutDeadline);
  }

  void startOperation_toCopyDocumentURLForRecordID(Operation op, const std::optional<CKRecordID> &recordID,
                                                   bool syncIfNeeded, QVSandboxingURLReply reply) override {
    this->call(
        &Sharing::copyDocumentURLForRecordIDRequest,
        [op, recordID, syncIfNeeded](auto params, Session &session) {
          setOperation(params, session, op);
          setRecordID(params, recordID);
          params.setSyncIfNeeded(syncIfNeeded);
        },
        std::move(reply), readSharingDocument, XPCWithoutDeadline);
  }

 private:
  static auto sharingAtURL(Operation op, const NSURL &url) {
    return [op = std::move(op), url](auto params, Session &session) {
      setOperation(params, session, op);
      setURL(params, url);
    };
  }
  static constexpr auto readSharingOutcome = [](auto results, const RemoteObject &) {
    return std::tuple(getError(results));
  };
  static constexpr auto readSharingReply = [](auto results, const RemoteObject &) {
    return std::tuple(getShare(results), getError(results));
  };
  static constexpr auto readSharingAndURL = [](auto results, const RemoteObject &) {
    return std::tuple(getShare(results), getURL(results), getError(results));
  };
  static constexpr auto readSharingDocument = [](auto results, const RemoteObject &) {
    std::shared_ptr<const FPSandboxingURLWrapper> wrapper;
    if (results.hasUrl()) {
      const int descriptor = results.hasDescriptor() ? receivedDescriptor(results.getDescriptor()) : -1;
      wrapper = std::make_shared<FPSandboxingURLWrapper>(readURL(results.getUrl()), descriptor);
    }
    return std::tuple(std::move(wrapper), getError(results));
  };
};

}  // namespace droxa
