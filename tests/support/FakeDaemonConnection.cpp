#include "tests/support/FakeDaemonConnection.h"

#include <utility>

#include "tessaly/QVAccount.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVSyncProxyOverAsynchronous.h"

namespace droxa {

// The calls under way, each with the error handler of its proxy.
struct FakeDaemonConnection::State {
  Mutex mutex;
  std::map<std::uint64_t, NSXPCErrorHandler> underWay GUARDED_BY(mutex);
  std::uint64_t nextCall GUARDED_BY(mutex) = 1;
  std::size_t proxies GUARDED_BY(mutex) = 0;
  std::size_t syncProxies GUARDED_BY(mutex) = 0;
  NSError unreachable GUARDED_BY(mutex);
  std::function<void()> interruptionHandler GUARDED_BY(mutex);

  std::uint64_t begin(NSXPCErrorHandler handler) {
    const Lock lock(mutex);
    underWay[nextCall] = std::move(handler);
    return nextCall++;
  }
  // Whether the call is still to be ended; whoever comes first ends it.
  bool end(std::uint64_t call) {
    const Lock lock(mutex);
    return underWay.erase(call) == 1;
  }
  NSError unreachableError() {
    const Lock lock(mutex);
    return unreachable;
  }
};

// Ends each call by its reply or by the error handler, whichever comes first.
template <class... Args>
std::function<void(Args...)> trackedCall(const std::shared_ptr<FakeDaemonConnection::State> &state,
                                         const NSXPCErrorHandler &handler,
                                         std::function<void(Args...)> reply) {
  return [state, call = state->begin(handler), reply = std::move(reply)](Args... args) {
    if (state->end(call)) reply(args...);
  };
}

// A transfer as it comes over the connection.
class FakeConnectedTransfer final : public QVTransfer {
 public:
  FakeConnectedTransfer(std::shared_ptr<FakeDaemon> daemon,
                        std::shared_ptr<FakeDaemonConnection::State> state,
                        std::shared_ptr<QVTransferring> transfer, NSXPCErrorHandler handler)
      : daemon_(std::move(daemon)),
        state_(std::move(state)),
        transfer_(std::move(transfer)),
        handler_(std::move(handler)) {}

  void waitWithReply(QVContentsErrorReply reply) override {
    if (failed("waitWithReply")) return;
    transfer_->waitWithReply(trackedCall(state_, handler_, std::move(reply)));
  }
  void getProgress(QVProgressReply reply) override {
    if (failed("getProgress")) return;
    transfer_->getProgress(trackedCall(state_, handler_, std::move(reply)));
  }
  void cancel() override {
    if (!failed("cancel")) transfer_->cancel();
  }
  std::shared_ptr<QVTransferring> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler handler) override {
    return std::make_shared<FakeConnectedTransfer>(daemon_, state_, transfer_, std::move(handler));
  }

 private:
  bool failed(const char *operation) {
    const NSError failure = daemon_->replies().takeTransportFailure(operation);
    if (!failure) return false;
    daemon_->log().add(std::string(operation) + " failed in transport");
    daemon_->replies().give(operation, [handler = handler_, failure] { handler(failure); });
    return true;
  }

  const std::shared_ptr<FakeDaemon> daemon_;
  const std::shared_ptr<FakeDaemonConnection::State> state_;
  const std::shared_ptr<QVTransferring> transfer_;
  const NSXPCErrorHandler handler_;
};

// One proxy of the daemon: each call is ended by its reply or by the error handler.
class FakeDaemonProxy final : public QVProtocol {
 public:
  FakeDaemonProxy(std::shared_ptr<FakeDaemon> daemon, std::shared_ptr<FakeDaemonConnection::State> state,
                  NSXPCErrorHandler handler)
      : daemon_(std::move(daemon)), state_(std::move(state)), handler_(std::move(handler)) {}

  void enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                              std::uint64_t offset, std::uint64_t limit,
                              QVItemsCompletion completion) override {
    if (failed("enumerateItemsInFolder")) return;
    daemon_->enumerateItemsInFolder(folder, sortOrder, offset, limit, tracked(std::move(completion)));
  }
  void enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset, std::uint64_t limit,
                                        QVItemsCompletion completion) override {
    if (failed("enumerateAllFoldersWithSortOrder")) return;
    daemon_->enumerateAllFoldersWithSortOrder(sortOrder, offset, limit, tracked(std::move(completion)));
  }
  void currentNotifRankWithReply(QVRankReply reply) override {
    if (failed("currentNotifRankWithReply")) return;
    daemon_->currentNotifRankWithReply(tracked(std::move(reply)));
  }
  void enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                 QVWorkingSetCompletion completion) override {
    if (failed("enumerateWorkingSetChangesFromChangeToken")) return;
    daemon_->enumerateWorkingSetChangesFromChangeToken(token, limit, tracked(std::move(completion)));
  }
  void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                       QVSenderReply reply) override {
    if (failed("getItemUpdateSenderWithReceiver")) return;
    daemon_->getItemUpdateSenderWithReceiver(std::move(receiver), tracked(std::move(reply)));
  }
  void getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) override {
    if (failed("getURLForItemIdentifier")) return;
    daemon_->getURLForItemIdentifier(identifier, tracked(std::move(reply)));
  }
  void getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) override {
    if (failed("getURLForFileObjectID")) return;
    daemon_->getURLForFileObjectID(fileObjectID, tracked(std::move(reply)));
  }
  void getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) override {
    if (failed("getQueryItemForURL")) return;
    daemon_->getQueryItemForURL(url, fakeFSEvent, tracked(std::move(reply)));
  }
  void getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) override {
    if (failed("getContainerItem")) return;
    daemon_->getContainerItem(containerID, forceScan, tracked(std::move(reply)));
  }
  void getContainers(QVContainersReply reply) override {
    if (failed("getContainers")) return;
    daemon_->getContainers(tracked(std::move(reply)));
  }
  void setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) override {
    if (failed("setMetadataAtURL")) return;
    daemon_->setMetadataAtURL(url, change, tracked(std::move(reply)));
  }
  void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                QVErrorReply reply) override {
    if (failed("subscribeToNotifications")) return;
    daemon_->subscribeToNotifications(std::move(receiver), tracked(std::move(reply)));
  }
  void getAccount(QVAccountReply reply) override {
    if (failed("getAccount")) return;
    daemon_->getAccount(tracked(std::move(reply)));
  }
  void signIn(const std::string &name, QVAccountReply reply) override {
    if (failed("signIn")) return;
    daemon_->signIn(name, tracked(std::move(reply)));
  }
  void signOut(QVErrorReply reply) override {
    if (failed("signOut")) return;
    daemon_->signOut(tracked(std::move(reply)));
  }
  void getStatus(QVStatusReply reply) override {
    if (failed("getStatus")) return;
    daemon_->getStatus(tracked(std::move(reply)));
  }
  void startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) override {
    if (failed("startDownloadAtURL")) return;
    const QVTransferReply wrapped = [daemon = daemon_, state = state_, handler = handler_,
                                     answer = std::move(reply)](const std::shared_ptr<QVTransfer> &transfer,
                                                                const NSError &error) {
      answer(transfer ? std::make_shared<FakeConnectedTransfer>(daemon, state, transfer, handler) : nullptr,
             error);
    };
    daemon_->startDownloadAtURL(url, options, tracked(wrapped));
  }
  void evictItemAtURL(const NSURL &url, QVContentsResultReply reply) override {
    if (failed("evictItemAtURL")) return;
    daemon_->evictItemAtURL(url, tracked(std::move(reply)));
  }
  void setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) override {
    if (failed("setPinnedAtURL")) return;
    daemon_->setPinnedAtURL(url, isPinned, tracked(std::move(reply)));
  }
  void getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) override {
    if (failed("getContentsStatusAtURL")) return;
    daemon_->getContentsStatusAtURL(url, tracked(std::move(reply)));
  }
  void getTransferStatus(QVTransferStatusReply reply) override {
    if (failed("getTransferStatus")) return;
    daemon_->getTransferStatus(tracked(std::move(reply)));
  }
  void waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) override {
    if (failed("waitForUploadAtURL")) return;
    daemon_->waitForUploadAtURL(url, tracked(std::move(reply)));
  }
  void getMoveCapability(const NSURL &source, const NSURL &destination,
                         QVMoveCapabilityReply reply) override {
    if (failed("getMoveCapability")) return;
    daemon_->getMoveCapability(source, destination, tracked(std::move(reply)));
  }
  void allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) override {
    if (failed("allowDeletionAtURL")) return;
    daemon_->allowDeletionAtURL(url, tracked(std::move(reply)));
  }
  void confirmDeletions(bool carryOut, QVContentsErrorReply reply) override {
    if (failed("confirmDeletions")) return;
    daemon_->confirmDeletions(carryOut, tracked(std::move(reply)));
  }
  void startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             QVShareAndURLReply reply) override {
    if (failed("startOperation_toCopySharingInfoAtURL")) return;
    daemon_->startOperation_toCopySharingInfoAtURL(std::move(op), url, tracked(std::move(reply)));
  }
  void startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> op,
                                             const std::optional<CKShare> &share,
                                             const std::optional<std::string> &appName,
                                             QVShareAndURLReply reply) override {
    if (failed("startOperation_toCopyShareURLForShare")) return;
    daemon_->startOperation_toCopyShareURLForShare(std::move(op), share, appName, tracked(std::move(reply)));
  }
  void startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> op,
                                        const std::optional<CKShare> &share, QVShareReply reply) override {
    if (failed("startOperation_toSaveSharingInfo")) return;
    daemon_->startOperation_toSaveSharingInfo(std::move(op), share, tracked(std::move(reply)));
  }
  void createSharingInfoForURL(const NSURL &url, QVShareReply reply) override {
    if (failed("createSharingInfoForURL")) return;
    daemon_->createSharingInfoForURL(url, tracked(std::move(reply)));
  }
  void startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> op,
                                     const std::optional<CKShare> &share, bool forceDelete,
                                     QVShareOutcomeReply reply) override {
    if (failed("startOperation_toUnshareShare")) return;
    daemon_->startOperation_toUnshareShare(std::move(op), share, forceDelete, tracked(std::move(reply)));
  }
  void startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                bool allowAccess, QVRecordAccessReply reply) override {
    if (failed("startOperation_toModifyRecordAccessAtURL")) return;
    daemon_->startOperation_toModifyRecordAccessAtURL(std::move(op), url, allowAccess,
                                                      tracked(std::move(reply)));
  }
  void startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                                  QVParticipantTokenReply reply) override {
    if (failed("startOperation_toCopyParticipantTokenAtURL")) return;
    daemon_->startOperation_toCopyParticipantTokenAtURL(std::move(op), url, tracked(std::move(reply)));
  }
  void startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                               QVShareOutcomeReply reply) override {
    if (failed("startOperation_toPrepFolderForSharingAt")) return;
    daemon_->startOperation_toPrepFolderForSharingAt(std::move(op), url, tracked(std::move(reply)));
  }
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override {
    if (failed("copyCurrentUserNameAndDisplayHandleWithReply")) return;
    daemon_->copyCurrentUserNameAndDisplayHandleWithReply(tracked(std::move(reply)));
  }
  void startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> op, const NSURL &url,
                                             std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                             QVShareOutcomeReply reply) override {
    if (failed("startOperation_toProcessSubitemsAtURL")) return;
    daemon_->startOperation_toProcessSubitemsAtURL(std::move(op), url, maxSubsharesFailures, processType,
                                                   tracked(std::move(reply)));
  }
  void startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> op,
                                                const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override {
    if (failed("startOperation_toLookupShareParticipants")) return;
    daemon_->startOperation_toLookupShareParticipants(std::move(op), participants, tracked(std::move(reply)));
  }
  void startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> op,
                                                   const std::optional<CKRecordID> &recordID,
                                                   bool syncIfNeeded, QVSandboxingURLReply reply) override {
    if (failed("startOperation_toCopyDocumentURLForRecordID")) return;
    daemon_->startOperation_toCopyDocumentURLForRecordID(std::move(op), recordID, syncIfNeeded,
                                                         tracked(std::move(reply)));
  }
  void checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) override {
    if (failed("checkIfItemIsShareableWithInode")) return;
    daemon_->checkIfItemIsShareableWithInode(inode, tracked(std::move(reply)));
  }
  void getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) override {
    if (failed("getShareOptionsOfItemIdentifier")) return;
    daemon_->getShareOptionsOfItemIdentifier(identifier, tracked(std::move(reply)));
  }
  void refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) override {
    if (failed("refreshSharingStateForItemIdentifier")) return;
    daemon_->refreshSharingStateForItemIdentifier(identifier, tracked(std::move(reply)));
  }
  void acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) override {
    if (failed("acceptShareWithURL")) return;
    daemon_->acceptShareWithURL(shareURL, tracked(std::move(reply)));
  }
  void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                              QVRecordIDsReply reply) override {
    if (failed("resolveFileObjectIDsToContentRecordIDs")) return;
    daemon_->resolveFileObjectIDsToContentRecordIDs(identifiers, tracked(std::move(reply)));
  }
  void getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                            QVURLReply reply) override {
    if (failed("getContainerURLForID")) return;
    daemon_->getContainerURLForID(containerID, recreateDocumentsIfNeeded, tracked(std::move(reply)));
  }

 private:
  bool failed(const char *operation) {
    NSError failure = daemon_->replies().takeTransportFailure(operation);
    if (!failure) failure = state_->unreachableError();
    if (!failure) return false;
    daemon_->log().add(std::string(operation) + " failed in transport");
    daemon_->replies().give(operation, [handler = handler_, failure] { handler(failure); });
    return true;
  }
  template <class... Args>
  std::function<void(Args...)> tracked(std::function<void(Args...)> reply) {
    return trackedCall(state_, handler_, std::move(reply));
  }

  const std::shared_ptr<FakeDaemon> daemon_;
  const std::shared_ptr<FakeDaemonConnection::State> state_;
  const NSXPCErrorHandler handler_;
};

FakeDaemonConnection::FakeDaemonConnection(std::shared_ptr<FakeDaemon> daemon)
    : daemon_(std::move(daemon)), state_(std::make_shared<State>()) {}

FakeDaemonConnection::~FakeDaemonConnection() = default;

std::shared_ptr<QVProtocol> FakeDaemonConnection::remoteObjectProxyWithErrorHandler(
    NSXPCErrorHandler handler) {
  {
    const Lock lock(state_->mutex);
    ++state_->proxies;
  }
  return std::make_shared<FakeDaemonProxy>(daemon_, state_, std::move(handler));
}

std::unique_ptr<QVSyncProxy> FakeDaemonConnection::newSyncProxy() {
  {
    const Lock lock(state_->mutex);
    ++state_->syncProxies;
  }
  return QVSyncProxyOverAsynchronous([daemon = daemon_, state = state_](NSXPCErrorHandler handler) {
    return std::make_shared<FakeDaemonProxy>(daemon, state, std::move(handler));
  });
}

std::size_t FakeDaemonConnection::proxiesMade() const {
  const Lock lock(state_->mutex);
  return state_->proxies;
}

std::size_t FakeDaemonConnection::syncProxiesMade() const {
  const Lock lock(state_->mutex);
  return state_->syncProxies;
}

std::size_t FakeDaemonConnection::callsUnderWay() const {
  const Lock lock(state_->mutex);
  return state_->underWay.size();
}

void FakeDaemonConnection::breakOff(const NSError &error) {
  std::map<std::uint64_t, NSXPCErrorHandler> calls;
  {
    const Lock lock(state_->mutex);
    calls.swap(state_->underWay);
  }
  for (const auto &call : calls) call.second(error);
}

void FakeDaemonConnection::loseDaemon(const NSError &error) {
  std::function<void()> handler;
  {
    const Lock lock(state_->mutex);
    handler = state_->interruptionHandler;
  }
  daemon_->forgetSubscribers();
  breakOff(error);
  for (const auto &sender : daemon_->senders())
    if (!sender->isInvalidated()) sender->callErrorHandlers(error);
  if (handler) handler();
}

void FakeDaemonConnection::setInterruptionHandler(std::function<void()> handler) {
  const Lock lock(state_->mutex);
  state_->interruptionHandler = std::move(handler);
}

void FakeDaemonConnection::setUnreachable(NSError error) {
  const Lock lock(state_->mutex);
  state_->unreachable = std::move(error);
}

FakeDaemonScope::FakeDaemonScope()
    : daemon(FakeDaemon::make()), connection(std::make_shared<FakeDaemonConnection>(daemon)) {
  QVDaemonConnection::setDefaultConnection(connection);
  QVContainerCache::forget();
}

FakeDaemonScope::~FakeDaemonScope() {
  QVDaemonConnection::setDefaultConnection(nullptr);
  QVContainerCache::forget();
  QVAccount::forgetCachedAccount();
}

}  // namespace droxa
