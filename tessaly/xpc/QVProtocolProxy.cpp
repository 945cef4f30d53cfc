#include "tessaly/xpc/QVProtocolProxy.h"

#include <utility>

#include "tessaly/xpc/QVPassedObjects.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto writeNothing = [](auto, Session &) {};
constexpr auto readPage = [](auto results, const RemoteObject &) {
  return std::tuple(readQueryItems(results.getItems()), results.getNextOffset(), getError(results));
};
constexpr auto readOneItem = [](auto results, const RemoteObject &) {
  return std::tuple(getQueryItem(results), getError(results));
};
constexpr auto readOneURL = [](auto results, const RemoteObject &) {
  return std::tuple(getURL(results), getError(results));
};
constexpr auto readOneAccount = [](auto results, const RemoteObject &) {
  return std::tuple(getAccount(results), getError(results));
};
constexpr auto readOutcome = [](auto results, const RemoteObject &) { return std::tuple(getError(results)); };

constexpr auto readSender = [](auto results, const RemoteObject &via) {
  std::map<std::string, std::string> information;
  for (const auto entry : results.getInformation()) {
    information[xpcString(entry.getKey())] = xpcString(entry.getValue());
  }
  return std::tuple(results.hasSender() ? receivedSender(via, results.getSender()) : nullptr,
                    std::move(information), getError(results));
};

}  // namespace

void QVProtocolProxy::enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder,
                                             std::int64_t sortOrder, std::uint64_t offset,
                                             std::uint64_t limit, QVItemsCompletion completion) {
  call(
      &Client::enumerateItemsInFolderRequest,
      [folder, sortOrder, offset, limit](auto params, Session &) {
        if (folder) params.setFolder(xpcBytes(folder->asString()));
        params.setSortOrder(sortOrder);
        params.setOffset(offset);
        params.setLimit(limit);
      },
      std::move(completion), readPage);
}

void QVProtocolProxy::enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset,
                                                       std::uint64_t limit, QVItemsCompletion completion) {
  call(
      &Client::enumerateAllFoldersWithSortOrderRequest,
      [sortOrder, offset, limit](auto params, Session &) {
        params.setSortOrder(sortOrder);
        params.setOffset(offset);
        params.setLimit(limit);
      },
      std::move(completion), readPage);
}

void QVProtocolProxy::currentNotifRankWithReply(QVRankReply reply) {
  call(&Client::currentNotifRankWithReplyRequest, writeNothing, std::move(reply),
       [](auto results, const RemoteObject &) { return std::tuple(results.getRank(), getError(results)); });
}

void QVProtocolProxy::enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                                QVWorkingSetCompletion completion) {
  call(
      &Client::enumerateWorkingSetChangesFromChangeTokenRequest,
      [token, limit](auto params, Session &) {
        if (token) params.setToken(xpcBytes(token));
        params.setLimit(limit);
      },
      std::move(completion),
      [](auto results, const RemoteObject &) {
        std::vector<QVFileObjectID> deleted;
        deleted.reserve(results.getDeleted().size());
        for (const auto identifier : results.getDeleted()) deleted.push_back(readFileObjectID(identifier));
        return std::tuple(readQueryItems(results.getUpdated()), std::move(deleted),
                          results.hasNewToken() ? xpcData(results.getNewToken()) : NSData(),
                          getError(results));
      });
}

void QVProtocolProxy::getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                                      QVSenderReply reply) {
  call(
      &Client::getItemUpdateSenderWithReceiverRequest,
      [receiver = std::move(receiver)](auto params, Session &session) {
        if (receiver) params.setReceiver(exportReceiver(session, receiver));
      },
      std::move(reply), readSender);
}

void QVProtocolProxy::getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) {
  call(
      &Client::getURLForItemIdentifierRequest,
      [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); }, std::move(reply),
      readOneURL);
}

void QVProtocolProxy::getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) {
  call(
      &Client::getURLForFileObjectIDRequest,
      [fileObjectID](auto params, Session &) { params.setIdentifier(xpcBytes(fileObjectID.asString())); },
      std::move(reply), readOneURL);
}

void QVProtocolProxy::getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) {
  call(
      &Client::getQueryItemForURLRequest,
      [url, fakeFSEvent](auto params, Session &) {
        setURL(params, url);
        params.setFakeFSEvent(fakeFSEvent);
      },
      std::move(reply), readOneItem);
}

void QVProtocolProxy::getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) {
  call(
      &Client::getContainerItemRequest,
      [containerID, forceScan](auto params, Session &) {
        params.setContainerID(xpcBytes(containerID));
        params.setForceScan(forceScan);
      },
      std::move(reply), readOneItem);
}

void QVProtocolProxy::getContainers(QVContainersReply reply) {
  call(&Client::getContainersRequest, writeNothing, std::move(reply), [](auto results, const RemoteObject &) {
    return std::tuple(readContainers(results.getContainers()), getError(results));
  });
}

void QVProtocolProxy::setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change,
                                       QVErrorReply reply) {
  call(
      &Client::setMetadataAtURLRequest,
      [url, change](auto params, Session &) {
        setURL(params, url);
        writeMetadataChange(params.initChange(), change);
      },
      std::move(reply), readOutcome);
}

void QVProtocolProxy::subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                               QVErrorReply reply) {
  call(
      &Client::subscribeToNotificationsRequest,
      [receiver = std::move(receiver)](auto params, Session &session) {
        if (receiver) params.setReceiver(exportDaemonReceiver(session, receiver));
      },
      std::move(reply), readOutcome);
}

void QVProtocolProxy::getAccount(QVAccountReply reply) {
  call(&Client::getAccountRequest, writeNothing, std::move(reply), readOneAccount);
}

void QVProtocolProxy::signIn(const std::string &name, QVAccountReply reply) {
  call(
      &Client::signInRequest, [name](auto params, Session &) { params.setName(xpcBytes(name)); },
      std::move(reply), readOneAccount);
}

void QVProtocolProxy::signOut(QVErrorReply reply) {
  call(&Client::signOutRequest, writeNothing, std::move(reply), readOutcome);
}

void QVProtocolProxy::getStatus(QVStatusReply reply) {
  call(&Client::getStatusRequest, writeNothing, std::move(reply), [](auto results, const RemoteObject &) {
    return std::tuple(readStatus(results.getStatus()), getError(results));
  });
}

}  // namespace droxa
