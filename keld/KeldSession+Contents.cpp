// What a client asks about contents goes to the one service of the daemon.

#include "keld/KeldSession.h"

namespace droxa::keld {

void KeldSession::startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(nullptr, error);
  daemon_->contents().startDownloadAtURL(url, options, std::move(reply));
}

void KeldSession::evictItemAtURL(const NSURL &url, QVContentsResultReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply({}, error);
  daemon_->contents().evictItemAtURL(url, std::move(reply));
}

void KeldSession::setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(error);
  daemon_->contents().setPinnedAtURL(url, isPinned, std::move(reply));
}

void KeldSession::getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply({}, error);
  daemon_->contents().getContentsStatusAtURL(url, std::move(reply));
}

void KeldSession::getTransferStatus(QVTransferStatusReply reply) {
  daemon_->contents().getTransferStatus(std::move(reply));
}

void KeldSession::waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(error);
  daemon_->contents().waitForUploadAtURL(url, std::move(reply));
}

void KeldSession::getMoveCapability(const NSURL &source, const NSURL &destination,
                                    QVMoveCapabilityReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(0, error);
  daemon_->contents().getMoveCapability(source, destination, std::move(reply));
}

// What was meant while nobody is signed in is still meant when somebody is.
void KeldSession::allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) {
  daemon_->contents().allowDeletionAtURL(url, std::move(reply));
}

void KeldSession::confirmDeletions(bool carryOut, QVContentsErrorReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(error);
  daemon_->contents().confirmDeletions(carryOut, std::move(reply));
}

}  // namespace droxa::keld
