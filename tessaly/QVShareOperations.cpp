#include "tessaly/QVShareOperations.h"

#include <utility>

namespace droxa {
namespace {

std::string ofShare(const std::optional<CKShare> &share, const NSURL &fileURL) {
  if (fileURL) return fileURL.path();
  return share ? share->recordID.recordName : "no item";
}

}  // namespace

std::shared_ptr<QVShareCopyOperation> QVShareCopyOperation::initWithURL(const NSURL &url) {
  return std::shared_ptr<QVShareCopyOperation>(new QVShareCopyOperation(url));
}

QVShareCopyOperation::QVShareCopyOperation(const NSURL &url)
    : QVShareOperation("fetching the share of " + url.path()), url_(url) {}

void QVShareCopyOperation::ask() {
  daemon()->startOperation_toCopySharingInfoAtURL(client(), url_, ending());
}

std::shared_ptr<QVShareCopyShareURLOperation> QVShareCopyShareURLOperation::initWithFileURL(
    const NSURL &fileURL, const std::optional<std::string> &documentType) {
  return std::shared_ptr<QVShareCopyShareURLOperation>(
      new QVShareCopyShareURLOperation(fileURL, documentType));
}

QVShareCopyShareURLOperation::QVShareCopyShareURLOperation(const NSURL &fileURL,
                                                           const std::optional<std::string> &documentType)
    : QVShareOperation("fetching the share URL of " + fileURL.path()),
      fileURL_(fileURL),
      documentType_(documentType) {}

// The daemon gives the URL of a share, so the item's share is asked for first.
void QVShareCopyShareURLOperation::ask() {
  const auto self = std::static_pointer_cast<QVShareCopyShareURLOperation>(shared_from_this());
  daemon()->startOperation_toCopySharingInfoAtURL(
      client(), fileURL_, [self](const std::optional<CKShare> &share, const NSURL &, const NSError &error) {
        if (error) return self->fail(error);
        self->askForURL(share);
      });
}

void QVShareCopyShareURLOperation::askForURL(const std::optional<CKShare> &share) {
  if (isCancelled()) return;
  daemon()->startOperation_toCopyShareURLForShare(
      client(), share, documentType_,
      [self = std::static_pointer_cast<QVShareCopyShareURLOperation>(shared_from_this())](
          const std::optional<CKShare> &, const NSURL &url, const NSError &error) { self->end(url, error); });
}

std::shared_ptr<QVShareSaveOperation> QVShareSaveOperation::initWithShare(const std::optional<CKShare> &share,
                                                                          const NSURL &fileURL) {
  return std::shared_ptr<QVShareSaveOperation>(new QVShareSaveOperation(share, fileURL));
}

QVShareSaveOperation::QVShareSaveOperation(const std::optional<CKShare> &share, const NSURL &fileURL)
    : QVShareOperation("saving the share of " + ofShare(share, fileURL)), share_(share) {}

void QVShareSaveOperation::ask() {
  daemon()->startOperation_toSaveSharingInfo(client(), share_, ending());
}

std::shared_ptr<QVShareDestroyOperation> QVShareDestroyOperation::initWithShare(
    const std::optional<CKShare> &share, const NSURL &fileURL) {
  return std::shared_ptr<QVShareDestroyOperation>(new QVShareDestroyOperation(share, fileURL));
}

QVShareDestroyOperation::QVShareDestroyOperation(const std::optional<CKShare> &share, const NSURL &fileURL)
    : QVShareOperation("withdrawing the share of " + ofShare(share, fileURL)), share_(share) {}

// Not by force: a share that somebody changed meanwhile is looked at again by whoever withdraws it.
void QVShareDestroyOperation::ask() {
  constexpr bool kForceDelete = false;
  daemon()->startOperation_toUnshareShare(client(), share_, kForceDelete, ending());
}

std::shared_ptr<QVSharingCopyShareTokenOperation> QVSharingCopyShareTokenOperation::initWithURL(
    const NSURL &url) {
  return std::shared_ptr<QVSharingCopyShareTokenOperation>(new QVSharingCopyShareTokenOperation(url));
}

QVSharingCopyShareTokenOperation::QVSharingCopyShareTokenOperation(const NSURL &url)
    : QVShareOperation("fetching the collaboration tokens of " + url.path()), url_(url) {}

void QVSharingCopyShareTokenOperation::ask() {
  daemon()->startOperation_toCopyParticipantTokenAtURL(client(), url_, ending());
}

std::optional<CKShare> QVSharingCreateShareForItemAtURL(const NSURL &url, NSError *error) {
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->createSharingInfoForURL(url,
                                    [&proxy](const std::optional<CKShare> &share, const NSError &problem) {
                                      proxy->setObjResult(share, problem);
                                    });
  auto share = proxy->result<std::optional<CKShare>>();
  if (error && proxy->error()) *error = proxy->error();
  return share;
}

}  // namespace droxa
