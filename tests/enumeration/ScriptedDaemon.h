#pragma once

#include <functional>
#include <gtest/gtest.h>
#include <memory>
#include <string>
#include <utility>

#include "tessaly/QVContainer.h"
#include "tessaly/QVDaemonConnection.h"

namespace droxa {

// A daemon that answers listings with what the test says, for answers that no drive gives. Any other call
// fails the test. It is the process's daemon while it lives.
//
// Thread contract: set up before the first call.
class ScriptedDaemon final : public QVDaemonConnection {
 public:
  ScriptedDaemon() : protocol_(std::make_shared<Protocol>()) {}

  // Makes it the process's daemon until the returned object goes.
  static std::shared_ptr<ScriptedDaemon> install() {
    const auto daemon = std::make_shared<ScriptedDaemon>();
    setDefaultConnection(daemon);
    return {daemon.get(), [daemon](ScriptedDaemon *) { setDefaultConnection(nullptr); }};
  }

  struct Page {
    QVQueryItems items;
    std::uint64_t nextOffset = 0;
    NSError error;
  };
  struct Changes {
    QVQueryItems updated;
    std::vector<QVFileObjectID> deleted;
    NSData token;
    NSError error;
  };
  void answerListingsWith(Page page) { protocol_->page = std::move(page); }
  void answerChangesWith(Changes changes) { protocol_->changes = std::move(changes); }
  NSData lastToken() const { return protocol_->token; }

  std::shared_ptr<QVProtocol> remoteObjectProxyWithErrorHandler(NSXPCErrorHandler) override {
    return protocol_;
  }
  std::unique_ptr<QVSyncProxy> newSyncProxy() override {
    ADD_FAILURE() << "a synchronous call";
    return nullptr;
  }

 private:
  struct Protocol final : QVProtocol {
    Page page;
    Changes changes;
    NSData token;

    void enumerateItemsInFolder(const std::optional<QVFileObjectID> &, std::int64_t, std::uint64_t,
                                std::uint64_t, QVItemsCompletion completion) override {
      completion(page.items, page.nextOffset, page.error);
    }
    void enumerateAllFoldersWithSortOrder(std::int64_t, std::uint64_t, std::uint64_t,
                                          QVItemsCompletion completion) override {
      completion(page.items, page.nextOffset, page.error);
    }
    void enumerateWorkingSetChangesFromChangeToken(const NSData &asked, std::uint64_t,
                                                   QVWorkingSetCompletion completion) override {
      token = asked;
      completion(changes.updated, changes.deleted, changes.token, changes.error);
    }
    void currentNotifRankWithReply(QVRankReply reply) override { reply(0, page.error); }
    // Neither a sender nor an error.
    void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving>,
                                         QVSenderReply reply) override {
      reply(nullptr, {}, NSError());
    }
    void getURLForItemIdentifier(const std::string &, QVURLReply) override { unexpected(); }
    void getURLForFileObjectID(const QVFileObjectID &, QVURLReply) override { unexpected(); }
    void getQueryItemForURL(const NSURL &, bool, QVItemReply) override { unexpected(); }
    void getContainerItem(const std::string &, bool, QVItemReply) override { unexpected(); }
    void getContainers(QVContainersReply) override { unexpected(); }
    void setMetadataAtURL(const NSURL &, const QVItemMetadataChange &, QVErrorReply) override {
      unexpected();
    }
    void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving>, QVErrorReply) override {
      unexpected();
    }
    void getAccount(QVAccountReply) override { unexpected(); }
    void signIn(const std::string &, QVAccountReply) override { unexpected(); }
    void signOut(QVErrorReply) override { unexpected(); }
    void getStatus(QVStatusReply) override { unexpected(); }
    void startDownloadAtURL(const NSURL &, std::uint64_t, QVTransferReply) override { unexpected(); }
    void evictItemAtURL(const NSURL &, QVContentsResultReply) override { unexpected(); }
    void setPinnedAtURL(const NSURL &, bool, QVContentsErrorReply) override { unexpected(); }
    void getContentsStatusAtURL(const NSURL &, QVContentsStatusReply) override { unexpected(); }
    void getTransferStatus(QVTransferStatusReply) override { unexpected(); }
    void waitForUploadAtURL(const NSURL &, QVContentsErrorReply) override { unexpected(); }
    void getMoveCapability(const NSURL &, const NSURL &, QVMoveCapabilityReply) override { unexpected(); }
    void allowDeletionAtURL(const NSURL &, QVContentsErrorReply) override { unexpected(); }
    void confirmDeletions(bool, QVContentsErrorReply) override { unexpected(); }
    void startOperation_toCopySharingInfoAtURL(Operation, const NSURL &, QVShareAndURLReply) override {
      unexpected();
    }
    void startOperation_toCopyShareURLForShare(Operation, const std::optional<CKShare> &,
                                               const std::optional<std::string> &,
                                               QVShareAndURLReply) override {
      unexpected();
    }
    void startOperation_toSaveSharingInfo(Operation, const std::optional<CKShare> &, QVShareReply) override {
      unexpected();
    }
    void createSharingInfoForURL(const NSURL &, QVShareReply) override { unexpected(); }
    void startOperation_toUnshareShare(Operation, const std::optional<CKShare> &, bool,
                                       QVShareOutcomeReply) override {
      unexpected();
    }
    void startOperation_toModifyRecordAccessAtURL(Operation, const NSURL &, bool,
                                                  QVRecordAccessReply) override {
      unexpected();
    }
    void startOperation_toCopyParticipantTokenAtURL(Operation, const NSURL &,
                                                    QVParticipantTokenReply) override {
      unexpected();
    }
    void startOperation_toPrepFolderForSharingAt(Operation, const NSURL &, QVShareOutcomeReply) override {
      unexpected();
    }
    void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply) override { unexpected(); }
    void startOperation_toProcessSubitemsAtURL(Operation, const NSURL &, std::uint64_t, std::uint64_t,
                                               QVShareOutcomeReply) override {
      unexpected();
    }
    void startOperation_toLookupShareParticipants(Operation, const QVShareParticipants &,
                                                  QVParticipantsReply) override {
      unexpected();
    }
    void startOperation_toCopyDocumentURLForRecordID(Operation, const std::optional<CKRecordID> &, bool,
                                                     QVSandboxingURLReply) override {
      unexpected();
    }
    void checkIfItemIsShareableWithInode(std::uint64_t, QVBoolReply) override { unexpected(); }
    void getShareOptionsOfItemIdentifier(const std::string &, QVShareOptionsReply) override { unexpected(); }
    void refreshSharingStateForItemIdentifier(const std::string &, QVErrorReply) override { unexpected(); }
    void acceptShareWithURL(const NSURL &, QVURLReply) override { unexpected(); }
    void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &,
                                                QVRecordIDsReply) override {
      unexpected();
    }
    void getContainerURLForID(const std::string &, bool, QVURLReply) override { unexpected(); }
    static void unexpected() { ADD_FAILURE() << "a call that this test doesn't expect"; }
  };

  const std::shared_ptr<Protocol> protocol_;
};

}  // namespace droxa
