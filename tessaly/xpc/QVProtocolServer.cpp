#include "tessaly/xpc/QVProtocolServer.h"

#include <utility>

#include "tessaly/xpc/QVPassedObjects.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto writePage = [](auto results, Session &, const QVQueryItems &items, std::uint64_t nextOffset,
                              const NSError &error) {
  writeQueryItems(results.initItems(xpcCount(items)), items);
  results.setNextOffset(nextOffset);
  setError(results, error);
};
constexpr auto writeOneItem = [](auto results, Session &, const auto &item, const NSError &error) {
  setQueryItem(results, item);
  setError(results, error);
};
constexpr auto writeOneURL = [](auto results, Session &, const NSURL &url, const NSError &error) {
  setURL(results, url);
  setError(results, error);
};
constexpr auto writeOneAccount = [](auto results, Session &, const auto &account, const NSError &error) {
  setAccount(results, account);
  setError(results, error);
};
constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };

void writeSender(schema::QVProtocol::GetItemUpdateSenderWithReceiverResults::Builder results,
                 Session &session, const std::shared_ptr<QVItemNotificationSender> &sender,
                 const std::map<std::string, std::string> &information, const NSError &error) {
  if (sender) results.setSender(exportSender(session, sender));
  auto list = results.initInformation(xpcCount(information));
  unsigned index = 0;
  for (const auto &[key, value] : information) {
    list[index].setKey(xpcBytes(key));
    list[index++].setValue(xpcBytes(value));
  }
  setError(results, error);
}

}  // namespace

kj::Promise<void> QVProtocolServer::enumerateItemsInFolder(EnumerateItemsInFolderContext context) {
  const auto params = context.getParams();
  std::optional<QVFileObjectID> folder;
  if (params.hasFolder()) folder = readFileObjectID(params.getFolder());
  return exported_.serve(context, [folder, order = params.getSortOrder(), offset = params.getOffset(),
                                   limit = params.getLimit()](auto &object, auto reply) {
    object.enumerateItemsInFolder(folder, order, offset, limit, reply(writePage));
  });
}

kj::Promise<void> QVProtocolServer::enumerateAllFoldersWithSortOrder(
    EnumerateAllFoldersWithSortOrderContext context) {
  const auto params = context.getParams();
  return exported_.serve(context, [order = params.getSortOrder(), offset = params.getOffset(),
                                   limit = params.getLimit()](auto &object, auto reply) {
    object.enumerateAllFoldersWithSortOrder(order, offset, limit, reply(writePage));
  });
}

kj::Promise<void> QVProtocolServer::currentNotifRankWithReply(CurrentNotifRankWithReplyContext context) {
  return exported_.serve(context, [](auto &object, auto reply) {
    object.currentNotifRankWithReply(
        reply([](auto results, Session &, std::uint64_t rank, const NSError &error) {
          results.setRank(rank);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::enumerateWorkingSetChangesFromChangeToken(
    EnumerateWorkingSetChangesFromChangeTokenContext context) {
  const auto params = context.getParams();
  return exported_.serve(context, [token = params.hasToken() ? xpcData(params.getToken()) : NSData(),
                                   limit = params.getLimit()](auto &object, auto reply) {
    object.enumerateWorkingSetChangesFromChangeToken(
        token, limit,
        reply([](auto results, Session &, const QVQueryItems &updated,
                 const std::vector<QVFileObjectID> &deleted, const NSData &newToken, const NSError &error) {
          writeQueryItems(results.initUpdated(xpcCount(updated)), updated);
          auto list = results.initDeleted(xpcCount(deleted));
          for (unsigned index = 0; index < list.size(); ++index) {
            list.set(index, xpcBytes(deleted[index].asString()));
          }
          if (newToken) results.setNewToken(xpcBytes(newToken));
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::getItemUpdateSenderWithReceiver(
    GetItemUpdateSenderWithReceiverContext context) {
  const auto params = context.getParams();
  KJ_REQUIRE(params.hasReceiver(), "updates without a receiver");
  auto receiver = receivedReceiver(*exported_.session(), params.getReceiver());
  return exported_.serve(context, [receiver = std::move(receiver)](auto &object, auto reply) {
    object.getItemUpdateSenderWithReceiver(receiver, reply(writeSender));
  });
}

kj::Promise<void> QVProtocolServer::getURLForItemIdentifier(GetURLForItemIdentifierContext context) {
  return exported_.serve(
      context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
        object.getURLForItemIdentifier(identifier, reply(writeOneURL));
      });
}

kj::Promise<void> QVProtocolServer::getURLForFileObjectID(GetURLForFileObjectIDContext context) {
  return exported_.serve(context, [identifier = readFileObjectID(context.getParams().getIdentifier())](
                                      auto &object, auto reply) {
    object.getURLForFileObjectID(identifier, reply(writeOneURL));
  });
}

kj::Promise<void> QVProtocolServer::getQueryItemForURL(GetQueryItemForURLContext context) {
  const auto params = context.getParams();
  return exported_.serve(
      context, [url = getURL(params), fakeFSEvent = bool(params.getFakeFSEvent())](auto &object, auto reply) {
        object.getQueryItemForURL(url, fakeFSEvent, reply(writeOneItem));
      });
}

kj::Promise<void> QVProtocolServer::getContainerItem(GetContainerItemContext context) {
  const auto params = context.getParams();
  return exported_.serve(context, [containerID = xpcString(params.getContainerID()),
                                   forceScan = bool(params.getForceScan())](auto &object, auto reply) {
    object.getContainerItem(containerID, forceScan, reply(writeOneItem));
  });
}

kj::Promise<void> QVProtocolServer::getContainers(GetContainersContext context) {
  return exported_.serve(context, [](auto &object, auto reply) {
    object.getContainers(
        reply([](auto results, Session &, const std::vector<QVContainerDescription> &containers,
                 const NSError &error) {
          writeContainers(results.initContainers(xpcCount(containers)), containers);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::setMetadataAtURL(SetMetadataAtURLContext context) {
  const auto params = context.getParams();
  return exported_.serve(
      context, [url = getURL(params), change = readMetadataChange(params.getChange())](
                   auto &object, auto reply) { object.setMetadataAtURL(url, change, reply(writeOutcome)); });
}

kj::Promise<void> QVProtocolServer::subscribeToNotifications(SubscribeToNotificationsContext context) {
  const auto params = context.getParams();
  KJ_REQUIRE(params.hasReceiver(), "a subscription without a receiver");
  auto receiver = receivedDaemonReceiver(*exported_.session(), params.getReceiver());
  return exported_.serve(context, [receiver = std::move(receiver)](auto &object, auto reply) {
    object.subscribeToNotifications(receiver, reply(writeOutcome));
  });
}

kj::Promise<void> QVProtocolServer::getAccount(GetAccountContext context) {
  return exported_.serve(context,
                         [](auto &object, auto reply) { object.getAccount(reply(writeOneAccount)); });
}

kj::Promise<void> QVProtocolServer::signIn(SignInContext context) {
  return exported_.serve(context,
                         [name = xpcString(context.getParams().getName())](auto &object, auto reply) {
                           object.signIn(name, reply(writeOneAccount));
                         });
}

kj::Promise<void> QVProtocolServer::signOut(SignOutContext context) {
  return exported_.serve(context, [](auto &object, auto reply) { object.signOut(reply(writeOutcome)); });
}

kj::Promise<void> QVProtocolServer::getStatus(GetStatusContext context) {
  return exported_.serve(context, [](auto &object, auto reply) {
    object.getStatus(reply([](auto results, Session &, const QVDaemonStatus &status, const NSError &error) {
      writeStatus(results.initStatus(), status);
      setError(results, error);
    }));
  });
}

}  // namespace droxa
