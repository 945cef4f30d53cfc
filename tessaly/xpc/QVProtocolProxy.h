#pragma once

#include "platform/xpc/capnp/Proxy.h"
#include "tessaly/QVProtocol.h"
#include "tessaly/xpc/QVProtocol.capnp.h"
#include "tessaly/xpc/QVShareOperationCalls.h"

namespace droxa {

// Stands in for the daemon's object in another process.
// Thread contract: any thread, never the loop.
class QVProtocolProxy final : public QVShareOperationCalls<schema::QVProtocol, QVProtocol, QVProtocolProxy> {
 public:
  using QVShareOperationCalls::QVShareOperationCalls;

  void enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                              std::uint64_t offset, std::uint64_t limit,
                              QVItemsCompletion completion) override;
  void enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset, std::uint64_t limit,
                                        QVItemsCompletion completion) override;
  void currentNotifRankWithReply(QVRankReply reply) override;
  void enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                 QVWorkingSetCompletion completion) override;
  void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                       QVSenderReply reply) override;
  void getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) override;
  void getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) override;
  void getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) override;
  void getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) override;
  void getContainers(QVContainersReply reply) override;
  void setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) override;
  void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                QVErrorReply reply) override;
  void getAccount(QVAccountReply reply) override;
  void signIn(const std::string &name, QVAccountReply reply) override;
  void signOut(QVErrorReply reply) override;
  void getStatus(QVStatusReply reply) override;

  void startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) override;
  void evictItemAtURL(const NSURL &url, QVContentsResultReply reply) override;
  void setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) override;
  void getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) override;
  void getTransferStatus(QVTransferStatusReply reply) override;
  void waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) override;
  void getMoveCapability(const NSURL &source, const NSURL &destination, QVMoveCapabilityReply reply) override;
  void allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) override;
  void confirmDeletions(bool carryOut, QVContentsErrorReply reply) override;

  void checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) override;
  void getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) override;
  void refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) override;
  void acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) override;
  void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                              QVRecordIDsReply reply) override;
  void getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                            QVURLReply reply) override;
};

}  // namespace droxa
