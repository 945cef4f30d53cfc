// The sharing operations. No cloud that this daemon knows takes shares, so each of them says so.

#include "keld/KeldSession.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {
namespace {

NSError noSharing() {
  return qvc_error(QVErrorSharingUnavailable, "sharing isn't available");
}

}  // namespace

void KeldSession::startOperation_toCopySharingInfoAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                        const NSURL & /*url*/, QVShareAndURLReply reply) {
  reply(std::nullopt, {}, noSharing());
}

void KeldSession::startOperation_toCopyShareURLForShare(std::shared_ptr<QVOperationClient> /*op*/,
                                                        const std::optional<CKShare> & /*share*/,
                                                        const std::optional<std::string> & /*appName*/,
                                                        QVShareAndURLReply reply) {
  reply(std::nullopt, {}, noSharing());
}

void KeldSession::startOperation_toSaveSharingInfo(std::shared_ptr<QVOperationClient> /*op*/,
                                                   const std::optional<CKShare> & /*share*/,
                                                   QVShareReply reply) {
  reply(std::nullopt, noSharing());
}

void KeldSession::createSharingInfoForURL(const NSURL & /*url*/, QVShareReply reply) {
  reply(std::nullopt, noSharing());
}

void KeldSession::startOperation_toUnshareShare(std::shared_ptr<QVOperationClient> /*op*/,
                                                const std::optional<CKShare> & /*share*/,
                                                bool /*forceDelete*/, QVShareOutcomeReply reply) {
  reply(noSharing());
}

void KeldSession::startOperation_toModifyRecordAccessAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                           const NSURL & /*url*/, bool /*allowAccess*/,
                                                           QVRecordAccessReply reply) {
  reply({}, std::nullopt, noSharing());
}

void KeldSession::startOperation_toCopyParticipantTokenAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                             const NSURL & /*url*/,
                                                             QVParticipantTokenReply reply) {
  reply(std::nullopt, std::nullopt, noSharing());
}

void KeldSession::startOperation_toPrepFolderForSharingAt(std::shared_ptr<QVOperationClient> /*op*/,
                                                          const NSURL & /*url*/, QVShareOutcomeReply reply) {
  reply(noSharing());
}

void KeldSession::copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) {
  reply(std::nullopt, std::nullopt, std::nullopt, std::nullopt, noSharing());
}

void KeldSession::startOperation_toProcessSubitemsAtURL(std::shared_ptr<QVOperationClient> /*op*/,
                                                        const NSURL & /*url*/,
                                                        std::uint64_t /*maxSubsharesFailures*/,
                                                        std::uint64_t /*processType*/,
                                                        QVShareOutcomeReply reply) {
  reply(noSharing());
}

void KeldSession::startOperation_toLookupShareParticipants(std::shared_ptr<QVOperationClient> /*op*/,
                                                           const QVShareParticipants & /*participants*/,
                                                           QVParticipantsReply reply) {
  reply(std::nullopt, noSharing());
}

void KeldSession::startOperation_toCopyDocumentURLForRecordID(std::shared_ptr<QVOperationClient> /*op*/,
                                                              const std::optional<CKRecordID> & /*recordID*/,
                                                              bool /*syncIfNeeded*/,
                                                              QVSandboxingURLReply reply) {
  reply(nullptr, noSharing());
}

void KeldSession::checkIfItemIsShareableWithInode(std::uint64_t /*inode*/, QVBoolReply reply) {
  reply(false, noSharing());
}

void KeldSession::getShareOptionsOfItemIdentifier(const std::string & /*identifier*/,
                                                  QVShareOptionsReply reply) {
  reply(false, false, false, std::nullopt, noSharing());
}

void KeldSession::refreshSharingStateForItemIdentifier(const std::string & /*identifier*/,
                                                       QVErrorReply reply) {
  reply(noSharing());
}

void KeldSession::acceptShareWithURL(const NSURL &shareURL, QVURLReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply({}, error);
  daemon_->sharedZones().acceptShare(shareURL, std::move(reply));
}

void KeldSession::resolveFileObjectIDsToContentRecordIDs(const std::vector<QVFileObjectID> & /*identifiers*/,
                                                         QVRecordIDsReply reply) {
  reply({}, noSharing());
}

void KeldSession::getContainerURLForID(const std::string & /*containerID*/,
                                       bool /*recreateDocumentsIfNeeded*/, QVURLReply reply) {
  reply({}, noSharing());
}

}  // namespace droxa::keld
