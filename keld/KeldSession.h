#pragma once

#include <memory>
#include <string>
#include <vector>

#include "keld/Keld.h"
#include "keld/UpdateSender.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVProtocol.h"

namespace droxa::keld {

// One client's daemon: answers from the item database, and owns the client's senders, subscriptions
// and sharing operations.
// Thread contract: any thread. Questions of what is known are answered before the call returns; those that
// the keeper has to look at first, later on the pool.
class KeldSession final : public QVProtocol, public std::enable_shared_from_this<KeldSession> {
 public:
  explicit KeldSession(std::shared_ptr<Keld> daemon) : daemon_(std::move(daemon)) {}
  ~KeldSession() override { end(); }

  // Ends the client's senders and subscriptions, and cancels its sharing operations: its connection has
  // ended.
  void end();

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

  void startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             QVShareAndURLReply reply) override;
  void startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> op,
                                             const std::optional<CKShare> &share,
                                             const std::optional<std::string> &appName,
                                             QVShareAndURLReply reply) override;
  void startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> op,
                                        const std::optional<CKShare> &share, QVShareReply reply) override;
  void createSharingInfoForURL(const NSURL &url, QVShareReply reply) override;
  void startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> op,
                                     const std::optional<CKShare> &share, bool forceDelete,
                                     QVShareOutcomeReply reply) override;
  void startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                bool allowAccess, QVRecordAccessReply reply) override;
  void startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                  QVParticipantTokenReply reply) override;
  void startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                               QVShareOutcomeReply reply) override;
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override;
  void startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                             QVShareOutcomeReply reply) override;
  void startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> op,
                                                const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override;
  void startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> op,
                                                   const std::optional<CKRecordID> &recordID,
                                                   bool syncIfNeeded, QVSandboxingURLReply reply) override;
  void checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) override;
  void getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) override;
  void refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) override;
  void acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) override;
  void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                              QVRecordIDsReply reply) override;
  void getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                            QVURLReply reply) override;

 private:
  struct Found {
    std::shared_ptr<const QVQueryItem> item;
    NSError error;
  };
  Found findAtPath(const std::string &pathBelowReplica);
  void listPage(ListingRequest request, std::uint64_t offset, std::uint64_t limit,
                const QVItemsCompletion &completion);
  std::optional<ItemRecord> itemWithIdentifier(const std::string &identifier, NSError *error);
  NSError checkListing(std::uint64_t limit) const;
  SharingCaller caller(std::shared_ptr<QVOperationClient> client) { return {sharing_, std::move(client)}; }

  const std::shared_ptr<Keld> daemon_;
  const std::shared_ptr<SharingOwner> sharing_ = std::make_shared<SharingOwner>();
  Mutex mutex_;
  bool ended_ GUARDED_BY(mutex_) = false;
  std::vector<std::weak_ptr<UpdateSender>> senders_ GUARDED_BY(mutex_);
  std::vector<std::uint64_t> subscriptions_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
