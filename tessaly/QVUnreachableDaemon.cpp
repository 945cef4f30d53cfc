#include "tessaly/QVUnreachableDaemon.h"

#include <utility>

namespace droxa {

namespace {

class UnreachableDaemon final : public QVProtocol {
 public:
  explicit UnreachableDaemon(std::function<void()> failed) : failed_(std::move(failed)) {}

  void enumerateItemsInFolder(const std::optional<QVFileObjectID> & /*folder*/, std::int64_t /*sortOrder*/,
                              std::uint64_t /*offset*/, std::uint64_t /*limit*/,
                              QVItemsCompletion /*completion*/) override {
    failed_();
  }
  void enumerateAllFoldersWithSortOrder(std::int64_t /*sortOrder*/, std::uint64_t /*offset*/,
                                        std::uint64_t /*limit*/, QVItemsCompletion /*completion*/) override {
    failed_();
  }
  void currentNotifRankWithReply(QVRankReply /*reply*/) override { failed_(); }
  void enumerateWorkingSetChangesFromChangeToken(const NSData & /*token*/, std::uint64_t /*limit*/,
                                                 QVWorkingSetCompletion /*completion*/) override {
    failed_();
  }
  void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> /*receiver*/,
                                       QVSenderReply /*reply*/) override {
    failed_();
  }
  void getURLForItemIdentifier(const std::string & /*identifier*/, QVURLReply /*reply*/) override {
    failed_();
  }
  void getURLForFileObjectID(const QVFileObjectID & /*fileObjectID*/, QVURLReply /*reply*/) override {
    failed_();
  }
  void getQueryItemForURL(const NSURL & /*url*/, bool /*fakeFSEvent*/, QVItemReply /*reply*/) override {
    failed_();
  }
  void getContainerItem(const std::string & /*containerID*/, bool /*forceScan*/,
                        QVItemReply /*reply*/) override {
    failed_();
  }
  void getContainers(QVContainersReply /*reply*/) override { failed_(); }
  void setMetadataAtURL(const NSURL & /*url*/, const QVItemMetadataChange & /*change*/,
                        QVErrorReply /*reply*/) override {
    failed_();
  }
  void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> /*receiver*/,
                                QVErrorReply /*reply*/) override {
    failed_();
  }
  void getAccount(QVAccountReply /*reply*/) override { failed_(); }
  void signIn(const std::string & /*name*/, QVAccountReply /*reply*/) override { failed_(); }
  void signOut(QVErrorReply /*reply*/) override { failed_(); }
  void getStatus(QVStatusReply /*reply*/) override { failed_(); }
  void startDownloadAtURL(const NSURL & /*url*/, std::uint64_t /*options*/,
                          QVTransferReply /*reply*/) override {
    failed_();
  }
  void evictItemAtURL(const NSURL & /*url*/, QVContentsResultReply /*reply*/) override { failed_(); }
  void setPinnedAtURL(const NSURL & /*url*/, bool /*isPinned*/, QVContentsErrorReply /*reply*/) override {
    failed_();
  }
  void getContentsStatusAtURL(const NSURL & /*url*/, QVContentsStatusReply /*reply*/) override { failed_(); }
  void getTransferStatus(QVTransferStatusReply /*reply*/) override { failed_(); }
  void waitForUploadAtURL(const NSURL & /*url*/, QVContentsErrorReply /*reply*/) override { failed_(); }
  void getMoveCapability(const NSURL & /*source*/, const NSURL & /*destination*/,
                         QVMoveCapabilityReply /*reply*/) override {
    failed_();
  }
  void allowDeletionAtURL(const NSURL & /*url*/, QVContentsErrorReply /*reply*/) override { failed_(); }
  void confirmDeletions(bool /*carryOut*/, QVContentsErrorReply /*reply*/) override { failed_(); }
  void startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> /*op*/, const NSURL & /*url*/,
                                             QVShareAndURLReply /*reply*/) override {
    failed_();
  }
  void startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> /*op*/,
                                             const std::optional<CKShare> & /*share*/,
                                             const std::optional<std::string> & /*appName*/,
                                             QVShareAndURLReply /*reply*/) override {
    failed_();
  }
  void startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> /*op*/,
                                        const std::optional<CKShare> & /*share*/,
                                        QVShareReply /*reply*/) override {
    failed_();
  }
  void createSharingInfoForURL(const NSURL & /*url*/, QVShareReply /*reply*/) override { failed_(); }
  void startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> /*op*/,
                                     const std::optional<CKShare> & /*share*/, bool /*forceDelete*/,
                                     QVShareOutcomeReply /*reply*/) override {
    failed_();
  }
  void startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                const NSURL & /*url*/, bool /*allowAccess*/,
                                                QVRecordAccessReply /*reply*/) override {
    failed_();
  }
  void startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                  const NSURL & /*url*/,
                                                  QVParticipantTokenReply /*reply*/) override {
    failed_();
  }
  void startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> /*op*/,
                                               const NSURL & /*url*/,
                                               QVShareOutcomeReply /*reply*/) override {
    failed_();
  }
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply /*reply*/) override { failed_(); }
  void startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> /*op*/, const NSURL & /*url*/,
                                             std::uint64_t /*maxSubsharesFailures*/,
                                             std::uint64_t /*processType*/,
                                             QVShareOutcomeReply /*reply*/) override {
    failed_();
  }
  void startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> /*op*/,
                                                const QVShareParticipants & /*participants*/,
                                                QVParticipantsReply /*reply*/) override {
    failed_();
  }
  void startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> /*op*/,
                                                   const std::optional<CKRecordID> & /*recordID*/,
                                                   bool /*syncIfNeeded*/,
                                                   QVSandboxingURLReply /*reply*/) override {
    failed_();
  }
  void checkIfItemIsShareableWithInode(std::uint64_t /*inode*/, QVBoolReply /*reply*/) override { failed_(); }
  void getShareOptionsOfItemIdentifier(const std::string & /*identifier*/,
                                       QVShareOptionsReply /*reply*/) override {
    failed_();
  }
  void refreshSharingStateForItemIdentifier(const std::string & /*identifier*/,
                                            QVErrorReply /*reply*/) override {
    failed_();
  }
  void acceptShareWithURL(const NSURL & /*shareURL*/, QVURLReply /*reply*/) override { failed_(); }
  void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> & /*identifiers*/,
                                              QVRecordIDsReply /*reply*/) override {
    failed_();
  }
  void getContainerURLForID(const std::string & /*containerID*/, bool /*recreateDocumentsIfNeeded*/,
                            QVURLReply /*reply*/) override {
    failed_();
  }

 private:
  const std::function<void()> failed_;
};

}  // namespace

std::shared_ptr<QVProtocol> QVUnreachableDaemon(std::function<void()> failed) {
  return std::make_shared<UnreachableDaemon>(std::move(failed));
}

}  // namespace droxa
