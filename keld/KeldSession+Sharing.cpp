// What a client asks about sharing goes to the one service of the daemon; its operations end with it.

#include <cerrno>
#include <sys/stat.h>

#include "keld/KeldSession.h"
#include "keld/Placement.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {
namespace {

NSError databaseFailed(const SqlError &error) {
  return qvc_error(QVErrorDatabase, std::string("the sync's database: ") + error.what());
}

// The container's folder and the documents' in it, where they are missing.
NSError makeContainer(const std::string &folder, const std::string &documents) {
  for (const std::string &path : {folder, documents})
    if (::mkdir(path.c_str(), 0700) != 0 && errno != EEXIST) return NSError::errorWithPOSIXCode(errno, path);
  return NSError();
}

bool isFolder(const std::string &path) {
  struct stat status = {};
  return ::lstat(path.c_str(), &status) == 0 && S_ISDIR(status.st_mode);
}

}  // namespace

void KeldSession::startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> op,
                                                        const NSURL &url, QVShareAndURLReply reply) {
  daemon_->sharing().copySharingInfo(caller(std::move(op)), url, std::move(reply));
}

void KeldSession::startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> op,
                                                        const std::optional<CKShare> &share,
                                                        const std::optional<std::string> &appName,
                                                        QVShareAndURLReply reply) {
  daemon_->sharing().copyShareURL(caller(std::move(op)), share, appName, std::move(reply));
}

void KeldSession::startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> op,
                                                   const std::optional<CKShare> &share, QVShareReply reply) {
  daemon_->sharing().saveSharingInfo(caller(std::move(op)), share, std::move(reply));
}

void KeldSession::createSharingInfoForURL(const NSURL &url, QVShareReply reply) {
  daemon_->sharing().createSharingInfo(caller(nullptr), url, std::move(reply));
}

void KeldSession::startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> op,
                                                const std::optional<CKShare> &share, bool forceDelete,
                                                QVShareOutcomeReply reply) {
  daemon_->sharing().unshare(caller(std::move(op)), share, forceDelete, std::move(reply));
}

void KeldSession::startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> op,
                                                           const NSURL &url, bool allowAccess,
                                                           QVRecordAccessReply reply) {
  daemon_->sharing().modifyRecordAccess(caller(std::move(op)), url, allowAccess, std::move(reply));
}

void KeldSession::startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> op,
                                                             const NSURL &url,
                                                             QVParticipantTokenReply reply) {
  daemon_->sharing().copyParticipantToken(caller(std::move(op)), url, std::move(reply));
}

void KeldSession::startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> op,
                                                          const NSURL &url, QVShareOutcomeReply reply) {
  daemon_->sharing().prepFolder(caller(std::move(op)), url, std::move(reply));
}

void KeldSession::copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) {
  daemon_->sharing().copyCurrentUser(caller(nullptr), std::move(reply));
}

void KeldSession::startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> op,
                                                        const NSURL &url, std::uint64_t maxSubsharesFailures,
                                                        std::uint64_t processType,
                                                        QVShareOutcomeReply reply) {
  daemon_->sharing().processSubitems(caller(std::move(op)), url, maxSubsharesFailures, processType,
                                     std::move(reply));
}

void KeldSession::startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> op,
                                                           const QVShareParticipants &participants,
                                                           QVParticipantsReply reply) {
  daemon_->sharing().lookUpParticipants(caller(std::move(op)), participants, std::move(reply));
}

void KeldSession::startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> op,
                                                              const std::optional<CKRecordID> &recordID,
                                                              bool syncIfNeeded, QVSandboxingURLReply reply) {
  daemon_->sharing().copyDocumentURL(caller(std::move(op)), recordID, syncIfNeeded, std::move(reply));
}

// --- What is known of sharing here.

void KeldSession::checkIfItemIsShareableWithInode(std::uint64_t inode, QVBoolReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(false, error);
  NSError error;
  try {
    error = daemon_->sharing().checkShareable(inode);
  } catch (const SqlError &problem) {
    error = databaseFailed(problem);
  }
  reply(!error, error);
}

std::optional<ItemRecord> KeldSession::itemWithIdentifier(const std::string &identifier, NSError *error) {
  const bool isRoot = identifier == NSFileProviderRootContainerItemIdentifier;
  const auto asked = isRoot ? QVFileObjectID::folderOrAliasID(daemon_->containers()->root())
                            : QVFileObjectID::fileObjectIDWithString(identifier);
  if (!asked) {
    *error = qvc_error(QVErrorInvalidArgument, "\"" + identifier + "\" isn't an item identifier");
    return std::nullopt;
  }
  std::optional<ItemRecord> found;
  *error =
      daemon_->read([&](ItemQueries &queries, const ItemPresenter &) { found = RecordOf(queries, *asked); });
  if (!found && !*error) *error = qvc_errorNoSuchItem(identifier);
  return found;
}

void KeldSession::getShareOptionsOfItemIdentifier(const std::string &identifier, QVShareOptionsReply reply) {
  NSError error;
  const auto item = itemWithIdentifier(identifier, &error);
  ShareOptions options;
  try {
    if (item) options = daemon_->sharing().shareOptions(*item);
  } catch (const SqlError &problem) {
    error = databaseFailed(problem);
  }
  reply(options.isShared, options.isSharedByOthers, options.isSharedByItself, options.sharedFolderName,
        error);
}

void KeldSession::refreshSharingStateForItemIdentifier(const std::string &identifier, QVErrorReply reply) {
  NSError error;
  const auto item = itemWithIdentifier(identifier, &error);
  if (!item) return reply(error);
  daemon_->sharing().refreshSharingState(caller(nullptr), item->id, std::move(reply));
}

void KeldSession::acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply({}, error);
  daemon_->sharedZones().acceptShare(shareURL, std::move(reply));
}

void KeldSession::resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> &identifiers,
                                                         QVRecordIDsReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply({}, error);
  std::map<QVFileObjectID, CKRecordID> records;
  NSError error;
  try {
    records = daemon_->sharing().contentRecords(identifiers);
  } catch (const SqlError &problem) {
    error = databaseFailed(problem);
  }
  reply(records, error);
}

// --- Containers.

void KeldSession::getContainerURLForID(const std::string &containerID, bool recreateDocumentsIfNeeded,
                                       QVURLReply reply) {
  const bool isName = IsContainerName(containerID) && containerID.size() <= 255 &&
                      containerID.find('/') == std::string::npos &&
                      containerID.find('\0') == std::string::npos;
  if (!isName)
    return reply({},
                 qvc_error(QVErrorInvalidArgument, "\"" + containerID + "\" isn't a container's identifier"));
  const std::string folder = daemon_->replicaPath() + "/" + containerID;
  const std::string documents = folder + "/" + QVDocumentsFolderName(containerID);
  const bool isThere = isFolder(documents);
  if (!isThere && !recreateDocumentsIfNeeded) return reply({}, qvc_errorNoSuchItem(containerID));
  const NSError error = isThere ? NSError() : makeContainer(folder, documents);
  if (error) return reply({}, error);
  const NSURL url = NSURL::fileURLWithPath(documents);
  if (isThere) return reply(url, NSError());
  daemon_->keeper().lookAt(containerID + "/" + QVDocumentsFolderName(containerID),
                           [url, reply = std::move(reply)] { reply(url, NSError()); });
}

}  // namespace droxa::keld
