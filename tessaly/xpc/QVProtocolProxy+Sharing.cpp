// What is asked about sharing and about the records behind items.

#include "tessaly/xpc/QVProtocolProxy.h"
#include "tessaly/xpc/QVShareValues.h"
#include "tessaly/xpc/QVValues.h"

namespace droxa {
namespace {

constexpr auto readOneURL = [](auto results, const RemoteObject &) {
  return std::tuple(getURL(results), getError(results));
};
constexpr auto readOutcome = [](auto results, const RemoteObject &) { return std::tuple(getError(results)); };

constexpr auto readShareOptions = [](auto results, const RemoteObject &) {
  std::optional<std::string> name;
  if (results.hasSharedFolderName()) name = xpcString(results.getSharedFolderName());
  return std::tuple(static_cast<bool>(results.getIsShared()),
                    static_cast<bool>(results.getIsSharedByOthers()),
                    static_cast<bool>(results.getIsSharedByItself()), std::move(name), getError(results));
};

constexpr auto readRecordIDs = [](auto results, const RemoteObject &) {
  std::map<QVFileObjectID, CKRecordID> recordIDs;
  for (const auto entry : results.getRecordIDs())
    recordIDs.emplace(readFileObjectID(entry.getIdentifier()), readRecordID(entry.getRecordID()));
  return std::tuple(std::move(recordIDs), getError(results));
};

}  // namespace

void QVProtocolProxy::checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) {
  call(
      &Client::checkIfItemIsShareableWithInodeRequest,
      [inode](auto params, Session &) { params.setInode(inode); }, std::move(reply),
      [](auto results, const RemoteObject &) {
        return std::tuple(static_cast<bool>(results.getIsShareable()), getError(results));
      });
}

void QVProtocolProxy::getShareOptionsOfItemIdentifier(const std::string &identifier,
                                                      QVShareOptionsReply reply) {
  call(
      &Client::getShareOptionsOfItemIdentifierRequest,
      [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); }, std::move(reply),
      readShareOptions);
}

void QVProtocolProxy::refreshSharingStateForItemIdentifier(const std::string &identifier,
                                                           QVErrorReply reply) {
  call(
      &Client::refreshSharingStateForItemIdentifierRequest,
      [identifier](auto params, Session &) { params.setIdentifier(xpcBytes(identifier)); }, std::move(reply),
      readOutcome);
}

void QVProtocolProxy::acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) {
  call(
      &Client::acceptShareWithURLRequest, [shareURL](auto params, Session &) { setURL(params, shareURL); },
      std::move(reply), readOneURL);
}

void QVProtocolProxy::resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                                             QVRecordIDsReply reply) {
  call(
      &Client::resolveFileObjectIDsToContentRecordIDsRequest,
      [identifiers](auto params, Session &) {
        auto list = params.initIdentifiers(xpcCount(identifiers));
        unsigned index = 0;
        for (const QVFileObjectID &identifier : identifiers)
          list.set(index++, xpcBytes(identifier.asString()));
      },
      std::move(reply), readRecordIDs);
}

void QVProtocolProxy::getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                                           QVURLReply reply) {
  call(
      &Client::getContainerURLForIDRequest,
      [containerID, recreateDocumentsIfNeeded](auto params, Session &) {
        params.setContainerID(xpcBytes(containerID));
        params.setRecreateDocumentsIfNeeded(recreateDocumentsIfNeeded);
      },
      std::move(reply), readOneURL);
}

}  // namespace droxa
