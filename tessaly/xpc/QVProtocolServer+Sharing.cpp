// What is asked about sharing and about the records behind items.

#include "tessaly/xpc/QVProtocolServer.h"
#include "tessaly/xpc/QVShareValues.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto writeOneURL = [](auto results, Session &, const NSURL &url, const NSError &error) {
  setURL(results, url);
  setError(results, error);
};
constexpr auto writeOutcome = [](auto results, Session &, const NSError &error) { setError(results, error); };

constexpr auto writeShareOptions = [](auto results, Session &, bool isShared, bool isSharedByOthers,
                                      bool isSharedByItself, const std::optional<std::string> &name,
                                      const NSError &error) {
  results.setIsShared(isShared);
  results.setIsSharedByOthers(isSharedByOthers);
  results.setIsSharedByItself(isSharedByItself);
  if (name) results.setSharedFolderName(xpcBytes(*name));
  setError(results, error);
};

constexpr auto writeRecordIDs =
    [](auto results, Session &, const std::map<QVFileObjectID, CKRecordID> &recordIDs, const NSError &error) {
      auto list = results.initRecordIDs(xpcCount(recordIDs));
      unsigned index = 0;
      for (const auto &[identifier, recordID] : recordIDs) {
        list[index].setIdentifier(xpcBytes(identifier.asString()));
        writeRecordID(list[index++].initRecordID(), recordID);
      }
      setError(results, error);
    };

}  // namespace

kj::Promise<void> QVProtocolServer::checkIfItemIsShareableWithInode(
    CheckIfItemIsShareableWithInodeContext context) {
  return exported_.serve(context, [inode = context.getParams().getInode()](auto &object, auto reply) {
    object.checkIfItemIsShareableWithInode(
        inode, reply([](auto results, Session &, bool isShareable, const NSError &error) {
          results.setIsShareable(isShareable);
          setError(results, error);
        }));
  });
}

kj::Promise<void> QVProtocolServer::getShareOptionsOfItemIdentifier(
    GetShareOptionsOfItemIdentifierContext context) {
  return exported_.serve(
      context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
        object.getShareOptionsOfItemIdentifier(identifier, reply(writeShareOptions));
      });
}

kj::Promise<void> QVProtocolServer::refreshSharingStateForItemIdentifier(
    RefreshSharingStateForItemIdentifierContext context) {
  return exported_.serve(
      context, [identifier = xpcString(context.getParams().getIdentifier())](auto &object, auto reply) {
        object.refreshSharingStateForItemIdentifier(identifier, reply(writeOutcome));
      });
}

kj::Promise<void> QVProtocolServer::acceptShareWithURL(AcceptShareWithURLContext context) {
  return exported_.serve(context, [url = getURL(context.getParams())](auto &object, auto reply) {
    object.acceptShareWithURL(url, reply(writeOneURL));
  });
}

kj::Promise<void> QVProtocolServer::resolveFileObjectIDsToContentRecordIDs(
    ResolveFileObjectIDsToContentRecordIDsContext context) {
  std::vector<QVFileObjectID> identifiers;
  const auto params = context.getParams();
  identifiers.reserve(params.getIdentifiers().size());
  for (const auto identifier : params.getIdentifiers()) identifiers.push_back(readFileObjectID(identifier));
  return exported_.serve(context, [identifiers = std::move(identifiers)](auto &object, auto reply) {
    object.resolveFileObjectIDsToContentRecordIDs(identifiers, reply(writeRecordIDs));
  });
}

kj::Promise<void> QVProtocolServer::getContainerURLForID(GetContainerURLForIDContext context) {
  const auto params = context.getParams();
  return exported_.serve(context,
                         [containerID = xpcString(params.getContainerID()),
                          recreates = bool(params.getRecreateDocumentsIfNeeded())](auto &object, auto reply) {
                           object.getContainerURLForID(containerID, recreates, reply(writeOneURL));
                         });
}

}  // namespace droxa
