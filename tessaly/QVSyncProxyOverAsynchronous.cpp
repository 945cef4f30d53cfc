#include "tessaly/QVSyncProxyOverAsynchronous.h"

#include <condition_variable>
#include <optional>
#include <tuple>
#include <type_traits>
#include <utility>

#include "platform/foundation/ThreadSafety.h"

namespace droxa {

namespace {

// Where the answer of one call is put by one thread and waited for by another.
template <class... Args>
class Slot {
 public:
  void put(std::optional<std::tuple<std::decay_t<Args>...>> values, NSError failure) {
    const Lock lock(mutex_);
    values_ = std::move(values);
    failure_ = std::move(failure);
    answered_ = true;
    condition_.notify_all();
  }
  // The values of the reply; nullopt, with the error handler's error, when that was called instead.
  std::optional<std::tuple<std::decay_t<Args>...>> wait(NSError *failure) {
    const Lock lock(mutex_);
    while (!answered_) condition_.wait(mutex_);
    *failure = failure_;
    return std::move(values_);
  }

 private:
  Mutex mutex_;
  std::condition_variable_any condition_;
  bool answered_ GUARDED_BY(mutex_) = false;
  std::optional<std::tuple<std::decay_t<Args>...>> values_ GUARDED_BY(mutex_);
  NSError failure_ GUARDED_BY(mutex_);
};

class BlockingProxy final : public QVSyncProxy, public QVProtocol {
 public:
  explicit BlockingProxy(QVProxyMaker maker) : maker_(std::move(maker)) {}

  QVProtocol *operator->() override { return this; }

  void enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                              std::uint64_t offset, std::uint64_t limit,
                              QVItemsCompletion completion) override {
    wait(completion, [&](QVProtocol &daemon, QVItemsCompletion answer) {
      daemon.enumerateItemsInFolder(folder, sortOrder, offset, limit, std::move(answer));
    });
  }
  void enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset, std::uint64_t limit,
                                        QVItemsCompletion completion) override {
    wait(completion, [&](QVProtocol &daemon, QVItemsCompletion answer) {
      daemon.enumerateAllFoldersWithSortOrder(sortOrder, offset, limit, std::move(answer));
    });
  }
  void currentNotifRankWithReply(QVRankReply reply) override {
    wait(reply,
         [](QVProtocol &daemon, QVRankReply answer) { daemon.currentNotifRankWithReply(std::move(answer)); });
  }
  void enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                 QVWorkingSetCompletion completion) override {
    wait(completion, [&](QVProtocol &daemon, QVWorkingSetCompletion answer) {
      daemon.enumerateWorkingSetChangesFromChangeToken(token, limit, std::move(answer));
    });
  }
  void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                       QVSenderReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVSenderReply answer) {
      daemon.getItemUpdateSenderWithReceiver(std::move(receiver), std::move(answer));
    });
  }
  void getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVURLReply answer) {
      daemon.getURLForItemIdentifier(identifier, std::move(answer));
    });
  }
  void getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVURLReply answer) {
      daemon.getURLForFileObjectID(fileObjectID, std::move(answer));
    });
  }
  void getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVItemReply answer) {
      daemon.getQueryItemForURL(url, fakeFSEvent, std::move(answer));
    });
  }
  void getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVItemReply answer) {
      daemon.getContainerItem(containerID, forceScan, std::move(answer));
    });
  }
  void getContainers(QVContainersReply reply) override {
    wait(reply,
         [](QVProtocol &daemon, QVContainersReply answer) { daemon.getContainers(std::move(answer)); });
  }
  void setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVErrorReply answer) {
      daemon.setMetadataAtURL(url, change, std::move(answer));
    });
  }
  void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                QVErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVErrorReply answer) {
      daemon.subscribeToNotifications(std::move(receiver), std::move(answer));
    });
  }
  void getAccount(QVAccountReply reply) override {
    wait(reply, [](QVProtocol &daemon, QVAccountReply answer) { daemon.getAccount(std::move(answer)); });
  }
  void signIn(const std::string &name, QVAccountReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVAccountReply answer) { daemon.signIn(name, std::move(answer)); });
  }
  void signOut(QVErrorReply reply) override {
    wait(reply, [](QVProtocol &daemon, QVErrorReply answer) { daemon.signOut(std::move(answer)); });
  }
  void getStatus(QVStatusReply reply) override {
    wait(reply, [](QVProtocol &daemon, QVStatusReply answer) { daemon.getStatus(std::move(answer)); });
  }
  void startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVTransferReply answer) {
      daemon.startDownloadAtURL(url, options, std::move(answer));
    });
  }
  void evictItemAtURL(const NSURL &url, QVContentsResultReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsResultReply answer) {
      daemon.evictItemAtURL(url, std::move(answer));
    });
  }
  void setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsErrorReply answer) {
      daemon.setPinnedAtURL(url, isPinned, std::move(answer));
    });
  }
  void getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsStatusReply answer) {
      daemon.getContentsStatusAtURL(url, std::move(answer));
    });
  }
  void getTransferStatus(QVTransferStatusReply reply) override {
    wait(reply, [](QVProtocol &daemon, QVTransferStatusReply answer) {
      daemon.getTransferStatus(std::move(answer));
    });
  }
  void waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsErrorReply answer) {
      daemon.waitForUploadAtURL(url, std::move(answer));
    });
  }
  void getMoveCapability(const NSURL &source, const NSURL &destination,
                         QVMoveCapabilityReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVMoveCapabilityReply answer) {
      daemon.getMoveCapability(source, destination, std::move(answer));
    });
  }
  void allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsErrorReply answer) {
      daemon.allowDeletionAtURL(url, std::move(answer));
    });
  }
  void confirmDeletions(bool carryOut, QVContentsErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVContentsErrorReply answer) {
      daemon.confirmDeletions(carryOut, std::move(answer));
    });
  }
  void startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             QVShareAndURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareAndURLReply answer) {
      daemon.startOperation_toCopySharingInfoAtURL(std::move(op), url, std::move(answer));
    });
  }
  void startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> op,
                                             const std::optional<CKShare> &share,
                                             const std::optional<std::string> &appName,
                                             QVShareAndURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareAndURLReply answer) {
      daemon.startOperation_toCopyShareURLForShare(std::move(op), share, appName, std::move(answer));
    });
  }
  void startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> op,
                                        const std::optional<CKShare> &share, QVShareReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareReply answer) {
      daemon.startOperation_toSaveSharingInfo(std::move(op), share, std::move(answer));
    });
  }
  void createSharingInfoForURL(const NSURL &url, QVShareReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareReply answer) {
      daemon.createSharingInfoForURL(url, std::move(answer));
    });
  }
  void startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> op,
                                     const std::optional<CKShare> &share, bool forceDelete,
                                     QVShareOutcomeReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareOutcomeReply answer) {
      daemon.startOperation_toUnshareShare(std::move(op), share, forceDelete, std::move(answer));
    });
  }
  void startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                bool allowAccess, QVRecordAccessReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVRecordAccessReply answer) {
      daemon.startOperation_toModifyRecordAccessAtURL(std::move(op), url, allowAccess, std::move(answer));
    });
  }
  void startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                  QVParticipantTokenReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVParticipantTokenReply answer) {
      daemon.startOperation_toCopyParticipantTokenAtURL(std::move(op), url, std::move(answer));
    });
  }
  void startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                               QVShareOutcomeReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareOutcomeReply answer) {
      daemon.startOperation_toPrepFolderForSharingAt(std::move(op), url, std::move(answer));
    });
  }
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVCurrentUserReply answer) {
      daemon.copyCurrentUserNameAndDisplayHandleWithReply(std::move(answer));
    });
  }
  void startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                             QVShareOutcomeReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareOutcomeReply answer) {
      daemon.startOperation_toProcessSubitemsAtURL(std::move(op), url, maxSubsharesFailures, processType,
                                                   std::move(answer));
    });
  }
  void startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> op,
                                                const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVParticipantsReply answer) {
      daemon.startOperation_toLookupShareParticipants(std::move(op), participants, std::move(answer));
    });
  }
  void startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> op,
                                                   const std::optional<CKRecordID> &recordID,
                                                   bool syncIfNeeded, QVSandboxingURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVSandboxingURLReply answer) {
      daemon.startOperation_toCopyDocumentURLForRecordID(std::move(op), recordID, syncIfNeeded,
                                                         std::move(answer));
    });
  }
  void checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVBoolReply answer) {
      daemon.checkIfItemIsShareableWithInode(inode, std::move(answer));
    });
  }
  void getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVShareOptionsReply answer) {
      daemon.getShareOptionsOfItemIdentifier(identifier, std::move(answer));
    });
  }
  void refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVErrorReply answer) {
      daemon.refreshSharingStateForItemIdentifier(identifier, std::move(answer));
    });
  }
  void acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVURLReply answer) {
      daemon.acceptShareWithURL(shareURL, std::move(answer));
    });
  }
  void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                              QVRecordIDsReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVRecordIDsReply answer) {
      daemon.resolveFileObjectIDsToContentRecordIDs(identifiers, std::move(answer));
    });
  }
  void getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                            QVURLReply reply) override {
    wait(reply, [&](QVProtocol &daemon, QVURLReply answer) {
      daemon.getContainerURLForID(containerID, recreateDocumentsIfNeeded, std::move(answer));
    });
  }

 private:
  template <class... Args, class Call>
  void wait(const std::function<void(Args...)> &reply, const Call &call) {
    // Shared, because a late second answer of a faulty daemon must still find it.
    const auto slot = std::make_shared<Slot<Args...>>();
    const std::shared_ptr<QVProtocol> daemon =
        maker_([slot](const NSError &error) { slot->put(std::nullopt, error); });
    call(*daemon, [slot](Args... args) { slot->put(std::make_tuple(args...), NSError()); });
    NSError failure;
    if (auto values = slot->wait(&failure))
      std::apply(reply, *values);
    else
      setObjResult({}, failure);
  }

  const QVProxyMaker maker_;
};

}  // namespace

std::unique_ptr<QVSyncProxy> QVSyncProxyOverAsynchronous(QVProxyMaker maker) {
  return std::make_unique<BlockingProxy>(std::move(maker));
}

}  // namespace droxa
