#pragma once

#include <atomic>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <vector>

#include "platform/foundation/Paths.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVProtocol.h"
#include "tests/support/CallLog.h"
#include "tests/support/FakeDrive.h"
#include "tests/support/FakeItemNotificationSender.h"
#include "tests/support/FakeReplies.h"
#include "tests/support/FakeSharing.h"
#include "tests/support/FakeTransfer.h"

namespace droxa {

// The daemon in process, over a drive in memory. It writes every call into its log
// ("enumerateItemsInFolder(i12, sort 0, offset 0, limit 200)"), answers as its replies() say, and pushes what
// the mutators do to its senders. Somebody is signed in from the start. Paths are those of FakeDrive. Thread
// contract: any thread.
class FakeDaemon final : public QVProtocol, public std::enable_shared_from_this<FakeDaemon> {
 public:
  static std::shared_ptr<FakeDaemon> make(std::string replica = DroxaProcessHome().replica());
  ~FakeDaemon() override;

  // What was asked, in order.
  std::vector<std::string> calls() const { return log_->calls(); }
  CallLog &log() { return *log_; }
  // How it is answered.
  FakeReplies &replies() { return *replies_; }
  // What the sharing operations are answered with.
  FakeSharing &sharing() { return *sharing_; }

  // Changes of the drive; a path that doesn't fit fails the test.
  QVFileObjectID addDocument(const std::string &path, std::uint64_t size = 0);
  QVFileObjectID addDatalessDocument(const std::string &path, std::uint64_t size = 0);
  QVFileObjectID addFolder(const std::string &path);
  QVFileObjectID addAlias(const std::string &path);
  QVFileObjectID addSymbolicLink(const std::string &path);
  QVFileObjectID add(const std::string &path, const FakeDrive::Attributes &attributes);
  void setContents(const std::string &path, std::uint64_t size,
                   std::int64_t modifiedNanoseconds = 1'700'000'001'000'000'000);
  void rename(const std::string &from, const std::string &to);
  void remove(const std::string &path);
  // These two also notify the subscribers.
  void addContainer(const std::string &containerID);
  void removeContainer(const std::string &containerID);
  void setReadable(const std::string &path, bool readable);
  // Who is signed in, without a notification.
  void setAccount(std::optional<QVAccountDescription> account);

  // What an item shows; without a new rank.
  void setShared(const std::string &path, bool shared);
  // What makes an eviction refused.
  void setUnsent(const std::string &path, bool unsent);
  void setInUse(const std::string &path, bool inUse);
  // The answer to every question about a move; nullopt: by the drive (tessaly/QVMoveCapability.h).
  void setMoveCapability(std::optional<std::uint64_t> capability);

  // Downloads. One ends before its startDownloadAtURL returns, as replies().failNext("download", …) says, or
  // after replies().hold("download") when the test says, all by release() or one by one:
  void progressDownload(const std::string &path, std::uint64_t bytes);
  void finishDownload(const std::string &path);
  void failDownload(const std::string &path, const NSError &error);
  bool isDownloading(const std::string &path) const;
  std::size_t interests(const std::string &path) const;  // in the document's download
  std::size_t downloadsStarted() const;

  std::shared_ptr<const QVQueryItem> item(const std::string &path) const;
  QVFileObjectID identifier(const std::string &path) const;
  NSURL url(const std::string &path) const;  // "": the root
  std::uint64_t numberAtPath(const std::string &path) const;
  std::uint64_t rank() const;

  // The senders given out, in order; the last of them; those not invalidated.
  std::vector<std::shared_ptr<FakeItemNotificationSender>> senders() const;
  std::shared_ptr<FakeItemNotificationSender> lastSender() const;
  std::size_t liveSenders() const;

  // Tells every subscriber, as the daemon does of account and container changes.
  void notify(const std::string &name);
  std::size_t subscribers() const;
  std::size_t notificationsReplied() const;  // how many of them the subscribers have answered
  void forgetSubscribers();                  // as a daemon that was started anew

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
  friend class FakeTransfer;
  // One document on its way.
  struct Download {
    std::uint64_t serial = 0;  // a later download of the same document is another one
    std::uint64_t bytes = 0;
    bool isPinned = false;                                           // wanted without an interest
    std::map<std::uint64_t, std::weak_ptr<FakeTransfer>> interests;  // by the transfers' indices
  };
  struct UploadWaiter {
    std::set<std::uint64_t> documents;
    QVContentsErrorReply reply;
  };

  explicit FakeDaemon(std::string replica);
  NSError begin(const char *operation, const std::string &arguments);
  NSError loggedOut() const REQUIRES(mutex_);
  template <class Change>
  void change(const std::string &what, const Change &change);
  void tellSenders(const std::vector<FakeDriveChange> &changes);
  NSError findItem(const NSURL &url, std::uint64_t *number) const REQUIRES(mutex_);
  std::uint64_t beginDownload(std::uint64_t number) REQUIRES(mutex_);
  NSError refusalToEvict(std::uint64_t number) const REQUIRES(mutex_);
  QVContentsStatus documentStatus(std::uint64_t number) const REQUIRES(mutex_);
  std::uint64_t moveCapability(std::uint64_t source, const NSURL &destination) const REQUIRES(mutex_);
  void runDownload(std::uint64_t number, std::uint64_t serial);
  bool isCurrentDownload(std::uint64_t number, std::uint64_t serial) const;
  void endDownload(std::uint64_t number, std::uint64_t serial, const NSError &error);
  std::pair<std::uint64_t, std::uint64_t> downloadAt(const std::string &path) const;
  void releaseInterest(std::uint64_t transfer, const std::set<std::uint64_t> &documents);
  std::uint64_t bytesLeft(const std::set<std::uint64_t> &documents) const;

  const std::shared_ptr<CallLog> log_ = std::make_shared<CallLog>();
  const std::shared_ptr<FakeReplies> replies_ = std::make_shared<FakeReplies>();
  const std::shared_ptr<FakeSharing> sharing_ = std::make_shared<FakeSharing>();
  const std::shared_ptr<std::atomic<std::size_t>> notificationsReplied_ =
      std::make_shared<std::atomic<std::size_t>>(0);
  mutable Mutex mutex_;
  FakeDrive drive_ GUARDED_BY(mutex_);
  std::optional<QVAccountDescription> account_ GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<FakeItemNotificationSender>> senders_ GUARDED_BY(mutex_);
  std::vector<std::shared_ptr<QVDaemonNotificationReceiving>> subscribers_ GUARDED_BY(mutex_);
  std::map<std::uint64_t, Download> downloads_ GUARDED_BY(mutex_);  // by the documents' numbers
  std::size_t downloadsStarted_ GUARDED_BY(mutex_) = 0;
  std::size_t transfersMade_ GUARDED_BY(mutex_) = 0;
  QVTransferCounts downloadCounts_ GUARDED_BY(mutex_);
  std::vector<UploadWaiter> uploadWaiters_ GUARDED_BY(mutex_);
  std::optional<std::uint64_t> moveCapability_ GUARDED_BY(mutex_);
};

}  // namespace droxa
