#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSURL.h"
#include "platform/xpc/NSXPCProxyCreating.h"
#include "tessaly/QVContents.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVItemMetadata.h"
#include "tessaly/QVQueryItem.h"
#include "tessaly/QVShareOperationProtocol.h"

// The daemon's protocol. The same abstract classes are called in process (the fake daemon of the tests,
// keld's own object) and through a connection. Every completion and reply is called exactly once, on any
// thread, unless the connection fails first: then the error handler of the proxy is called instead.

namespace droxa {

using QVReply = std::function<void()>;
using QVErrorReply = std::function<void(const NSError &error)>;

// Receives what the daemon pushes of a watched item. Implemented by the enumerators.
// Called by the daemon connection, one call at a time, in the order of the changes.
class QVItemNotificationReceiving {
 public:
  virtual ~QVItemNotificationReceiving() = default;
  // The daemon sends the next batch after the reply.
  virtual void receiveUpdates(const QVQueryItems &items, const std::vector<std::string> &logicalExtensions,
                              const std::vector<std::string> &physicalExtensions, QVReply reply) = 0;
  virtual void receiveProgressUpdates(const std::vector<std::string> &updates, QVReply reply) = 0;
};

// Watch options.
inline constexpr std::uint64_t QVWatchUpdates = 1;  // push what changes after the watch is set up
inline constexpr std::uint64_t QVWatchDeaths = 2;   // push dead items too
inline constexpr std::uint64_t QVWatchSubtree = 4;  // the whole subtree, not the direct children alone
inline constexpr std::uint64_t QVWatchCoalesced =
    16;  // several changes of one item may be pushed as the last of them

// The daemon's side of one receiver: what is pushed into it.
class QVItemNotificationSending {
 public:
  virtual ~QVItemNotificationSending() = default;
  // Gives this sender's pushes precedence. The block is called when the boost ends, which is when the sender
  // is invalidated; a daemon that dies first is told through the proxy's error handler.
  virtual void boostPriority(QVReply block) = 0;
  // From now on, and until invalidate(), changes of the children of the item at `url` go to the receiver; a
  // child that moved from one folder to another goes, as it is now, to those who watch either. The reply
  // tells that the watch stands: QVTessalyErrorDomain 14 when there is no such item. A second watch of the
  // same sender replaces the first. When the watched item itself dies, its death is pushed, and no more after
  // it.
  virtual void watchItemAtURL(const NSURL &url, std::uint64_t options, QVErrorReply gatherReply) = 0;
  virtual void invalidate() = 0;
};

// A sender as it is received: it makes proxies with an error handler.
class QVItemNotificationSender : public QVItemNotificationSending,
                                 public NSXPCProxyCreating<QVItemNotificationSender> {};

// Receives the daemon's process-wide notifications (tessaly/QVNotifications.h has the names).
class QVDaemonNotificationReceiving {
 public:
  virtual ~QVDaemonNotificationReceiving() = default;
  virtual void receiveNotification(const std::string &name, QVReply reply) = 0;
};

struct QVContainerDescription {
  std::string containerID;
  NSURL url;                                  // the container's folder
  NSURL documentsURL;                         // the folder whose contents are shown
  std::optional<QVFileObjectID> documentsID;  // nullopt for the default container: its folder is the root
  bool operator==(const QVContainerDescription &) const = default;
};

struct QVAccountDescription {
  std::string name;
  std::optional<std::string> perAppAccountIdentifier;
  bool operator==(const QVAccountDescription &) const = default;
};

struct QVDaemonStatus {
  std::uint32_t processIdentifier = 0;
  std::int64_t startedNanoseconds = 0;  // since 1970
  std::uint64_t rank = 0;               // of the newest change
  std::uint64_t documents = 0, folders = 0, aliases = 0;
  std::uint64_t pendingScans = 0;  // folders still to be looked at
  std::uint64_t senders = 0;       // update senders alive
  std::string watcher;             // "fanotify", "inotify", "scanning" and why
  bool firstScanDone = false;
  std::uint64_t databaseBytes = 0;
};

enum class QVSortOrder : std::uint8_t { byName = 0, byDate = 1 };

using QVItemsCompletion =
    std::function<void(const QVQueryItems &items, std::uint64_t nextOffset, const NSError &error)>;
using QVRankReply = std::function<void(std::uint64_t rank, const NSError &error)>;
using QVWorkingSetCompletion =
    std::function<void(const QVQueryItems &updated, const std::vector<QVFileObjectID> &deleted,
                       const NSData &newToken, const NSError &error)>;
using QVSenderReply =
    std::function<void(const std::shared_ptr<QVItemNotificationSender> &sender,
                       const std::map<std::string, std::string> &information, const NSError &error)>;
using QVURLReply = std::function<void(const NSURL &url, const NSError &error)>;
using QVItemReply = std::function<void(const std::shared_ptr<const QVQueryItem> &item, const NSError &error)>;
using QVContainersReply =
    std::function<void(const std::vector<QVContainerDescription> &containers, const NSError &error)>;
using QVAccountReply =
    std::function<void(const std::optional<QVAccountDescription> &account, const NSError &error)>;
using QVBoolReply = std::function<void(bool result, const NSError &error)>;
using QVShareOptionsReply =
    std::function<void(bool isShared, bool isSharedByOthers, bool isSharedByItself,
                       const std::optional<std::string> &sharedFolderName, const NSError &error)>;
using QVRecordIDsReply =
    std::function<void(const std::map<QVFileObjectID, CKRecordID> &recordIDs, const NSError &error)>;
using QVStatusReply = std::function<void(const QVDaemonStatus &status, const NSError &error)>;

// What the daemon offers. Errors are QVTessalyErrorDomain (tessaly/QVErrors.h) unless said otherwise.
class QVProtocol : public QVContentsProtocol, public QVShareOperationProtocol {
 public:
  // The root is the documents folder of the default container. Besides its entries it lists a folder for
  // every other container but the trash, which stands for that container's documents folder: "Documents",
  // "Desktop", else the last component of the container's identifier; "name (identifier)" where an entry has
  // that name.
  //
  // The children of `folder` (nullopt: the root), at most `limit`, from `offset` on. The next offset is 0
  // when there are no more. Sort orders other than byDate read as byName. By name: byte order of the names;
  // by date: newest contents first, then by name. 14 when there is no such folder, 31 when it can't be read,
  // 2 when nobody is signed in, 22 when `limit` is 0 or over 1000.
  virtual void enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                                      std::uint64_t offset, std::uint64_t limit,
                                      QVItemsCompletion completion) = 0;
  // Every folder of the drive, the same way.
  virtual void enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset,
                                                std::uint64_t limit, QVItemsCompletion completion) = 0;
  // The rank of the newest change. 2 when nobody is signed in.
  virtual void currentNotifRankWithReply(QVRankReply reply) = 0;
  // The working set's changes since `token` (nil: from the start), oldest first, at most `limit` of both
  // kinds together; each item once, as it is now. A new token equal to `token` means that there was nothing.
  // 32 for a token that this database didn't issue.
  virtual void enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                         QVWorkingSetCompletion completion) = 0;
  // A sender that pushes to `receiver`; it lives until it is invalidated or the connection ends.
  virtual void getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                               QVSenderReply reply) = 0;

  // Where the item's file really is. 14 when there is no such item, 22 for what isn't an identifier.
  virtual void getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) = 0;
  virtual void getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) = 0;
  virtual void getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) = 0;
  virtual void getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) = 0;
  virtual void getContainers(QVContainersReply reply) = 0;

  // Notes what the user set on the item at `url`: on its file, or with the item where the file can't bear it
  // (a symbolic link, a file system without extended attributes). Replies when the item shows it. 14 when
  // there is no such item, 22 for tags that can't be kept (tessaly/QVItemMetadata.h), POSIX errors of the
  // file system.
  virtual void setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) = 0;

  // Until the connection ends, the receiver is told of account and container-list changes.
  virtual void subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                        QVErrorReply reply) = 0;

  virtual void getAccount(QVAccountReply reply) = 0;  // nullopt: nobody is signed in
  // Signs `name` in, replacing who was. 22 for an empty name or one with control characters.
  virtual void signIn(const std::string &name, QVAccountReply reply) = 0;
  virtual void signOut(QVErrorReply reply) = 0;

  virtual void getStatus(QVStatusReply reply) = 0;

  // Whether the folder or alias of that number (QVFileObjectID::number()) may be shared; the error, when
  // there is one, tells why not.
  virtual void checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) = 0;
  // How an item is shared, as far as it is known here: whether it is shared at all, by itself or with a
  // folder that it is below; whether by somebody else with this account; whether by itself. And the name of
  // the uppermost shared folder that it is, or is below; nil when there is none. Errors as
  // getURLForItemIdentifier's.
  virtual void getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) = 0;
  // Asks the cloud how the item is shared, so that what is known of it is as new as can be. The cloud's
  // errors come as they are.
  virtual void refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) = 0;
  // Accepts what somebody shares, by the share's URL. Replies where it is now, when it is there. 22 for what
  // isn't the URL of a share; the cloud's errors come as they are.
  virtual void acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) = 0;

  // The cloud's records that hold what these documents are. An identifier whose item isn't in the cloud, or
  // isn't a document, is left out. Of the call: 2 when nobody is signed in.
  virtual void resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                                      QVRecordIDsReply reply) = 0;
  // The documents folder of a container, that of an application among them; with
  // `recreateDocumentsIfNeeded` it is made where it is missing, and the container with it. 22 for what can't
  // be a container's identifier, 14 when there is none, POSIX errors of the file system.
  virtual void getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                                    QVURLReply reply) = 0;
};

}  // namespace droxa
