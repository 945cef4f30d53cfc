#include "sharing/QVSharingProxy.h"

#include <utility>

#include "additions/QVLogSection.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSURLResources.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVShareOperations.h"
#include "tessaly/QVShareTypes.h"

namespace droxa {
namespace {

using Item = std::shared_ptr<const NSFileProviderItem>;

bool IsFolderShare(const std::optional<CKShare> &share) {
  const auto *type = share ? share->get<std::string>(CKShareTypeKey) : nullptr;
  return type && *type == QVFolderShareType;
}

// Cancelling the progress cancels the operation, unless that is over and gone.
void CancelsOperation(NSProgress &progress, const std::shared_ptr<NSOperation> &operation) {
  progress.setCancellable(true);
  progress.setCancellationHandler([weak = std::weak_ptr(operation)] {
    if (const auto cancelled = weak.lock()) cancelled->cancel();
  });
}

}  // namespace

// The log section of a call, which ends when the call returns.
class QVSharingProxy::Section {
 public:
  Section(const QVSharingProxy &proxy, const char *method) {
    os_log_info(qvc_default_log(), "[INFO] ┏%llx %@ %s %@", section_.tag(), proxy, method,
                proxy._itemIdentifier);
  }

 private:
  const QVLogSection section_{true};
};

// The withdrawal of a share: first the share is fetched, then destroyed.
struct QVSharingProxy::Unsharing {
  const std::shared_ptr<NSProgress> progress = NSProgress::progressWithTotalUnitCount(2);
  QVShareOutcomeReply reply;
  // Held while one step's cancellation takes the place of the other's.
  Mutex mutex;
  bool isDestroying GUARDED_BY(mutex) = false;
};

QVSharingProxy::QVSharingProxy(std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
                               const NSURL & /*fileURL*/, std::shared_ptr<NSOperationQueue> operationQueue)
    : _fileProviderExtension(std::move(extension)),
      _itemIdentifier(std::move(itemIdentifier)),
      _operationQueue(std::move(operationQueue)) {}

QVSharingProxy::~QVSharingProxy() = default;

NSURL QVSharingProxy::itemURL() const {
  return _fileProviderExtension->URLForItemWithPersistentIdentifier(_itemIdentifier);
}

std::optional<CKShare> QVSharingProxy::cachedShare() const {
  const Lock lock(_lock);
  return _cachedShare;
}

void QVSharingProxy::setCachedShare(std::optional<CKShare> share) {
  const Lock lock(_lock);
  _cachedShare.swap(share);
}

QVShareReply QVSharingProxy::loggedShareReply(QVShareReply reply) {
  return [self = shared_from_this(), reply = std::move(reply)](const std::optional<CKShare> &share,
                                                               const NSError &error) {
    os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%@, %@)", *self, share, error);
    reply(share, error);
  };
}

NSError QVSharingProxy::readIsShared(bool *isShared) const {
  const NSURL url = itemURL();
  if (!url) return fileProviderErrorForNonExistentItemWithIdentifier(_itemIdentifier);
  NSError error;
  if (getResourceValue(url, isShared, NSURLUbiquitousItemIsSharedKey, &error)) return NSError();
  *isShared = false;
  return error;
}

void QVSharingProxy::fetchSharingInfo(QVSharingInfoReply reply) {
  const Section section(*this, "-[QVSharingProxy fetchSharingInfo:]");
  bool isShared = false;
  const NSError error = readIsShared(&isShared);
  const Item none;
  os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%d, %@, %@)", *this, isShared, none, error);
  reply(isShared, none, error);
}

// Deliberately no test of its own: the answer is how the item is now.
QVSharingService::Progress QVSharingProxy::preflightCheckIfCurrentlyShareableWithCompletion(
    QVSharingPreflightReply completion) {
  const Section section(*this, "-[QVSharingProxy preflightCheckIfCurrentlyShareableWithCompletion:]");
  bool isShared = false;
  const NSError error = readIsShared(&isShared);
  const Item none;
  const QVSharingStrings nothing;
  os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%d, %@, %@, %@, %@)", *this, isShared, none, nothing,
               nothing, error);
  completion(isShared, none, nothing, nothing, error);
  return nullptr;
}

QVSharingService::Progress QVSharingProxy::fetchParticipantListAndPublicPermission(
    QVSharingParticipantsReply completion) {
  const Section section(*this, "-[QVSharingProxy fetchParticipantListAndPublicPermission:]");
  return fetchShareWithCompletion([self = shared_from_this(), completion = std::move(completion)](
                                      const std::optional<CKShare> &share, const NSError &error) {
    const auto participants = share ? QVShareParticipants(share->participants) : std::nullopt;
    const auto publicPermission = share ? static_cast<std::int64_t>(share->publicPermission) : 0;
    os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%@, %ld, %@)", *self, participants, publicPermission,
                 error);
    completion(participants, publicPermission, error);
  });
}

void QVSharingProxy::startPreparingForShareWhenForcing(bool /*force*/) {
  const Section section(*this, "-[QVSharingProxy startPreparingForShareWhenForcing:]");
}

QVSharingService::Progress QVSharingProxy::fetchShareWithCompletion(QVShareReply completion) {
  const Section section(*this, "-[QVSharingProxy fetchShareWithCompletion:]");
  const QVShareReply reply = loggedShareReply(std::move(completion));
  if (const auto share = cachedShare()) {
    reply(share, NSError());
    return nullptr;
  }
  const NSURL url = itemURL();
  auto progress = NSProgress::progressWithTotalUnitCount(1);
  const auto operation = QVShareCopyOperation::initWithURL(url);
  operation->setRootShareCopyCompletionBlock(
      [self = shared_from_this(), url, progress, reply](const std::optional<CKShare> &share,
                                                        const NSURL &shareURL, const NSError &error) {
        progress->setTotalUnitCount(1);  // the total, deliberately; the completed count stays
        self->rootShareCame(url, share, shareURL, error, reply);
      });
  CancelsOperation(*progress, operation);
  _operationQueue->addOperation(operation);
  return progress;
}

// Whether the share is kept goes by the URL, deliberately, and not by the error.
void QVSharingProxy::rootShareCame(const NSURL &asked, const std::optional<CKShare> &share, const NSURL &url,
                                   const NSError &error, const QVShareReply &reply) {
  if (!url) setCachedShare(share);
  const bool isUnshared = qvc_checkErrorsFromCloudKit(error, [](const NSError &one) {
    return qvc_isCloudKitUnknownItemError(one) || qv_isTessalyErrorCode(one, QVErrorNoShare);
  });
  if (isUnshared) {
    NSError problem;
    const auto made = QVSharingCreateShareForItemAtURL(asked, &problem);
    return reply(made, problem);
  }
  if (error) return reply(std::nullopt, error);
  reply(share, NSError());
}

QVSharingService::Progress QVSharingProxy::fetchShareURLWithCompletion(QVSharingURLReply completion) {
  const Section section(*this, "-[QVSharingProxy fetchShareURLWithCompletion:]");
  const auto reply = [self = shared_from_this(), completion = std::move(completion)](const NSURL &url,
                                                                                     const NSError &error) {
    os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%@, %@)", *self, url, error);
    completion(url, error);
  };
  const NSURL url = itemURL();
  NSError error;
  const auto type = qv_typeIdentifierWithError(url, &error);
  if (error) {
    reply(NSURL(), error);
    return nullptr;
  }
  auto progress = NSProgress::progressWithTotalUnitCount(1);
  const auto operation = QVShareCopyShareURLOperation::initWithFileURL(url, type);
  operation->setCopyShareURLCompletionBlock([progress, reply](const NSURL &shareURL, const NSError &problem) {
    progress->setCompletedUnitCount(1);
    reply(shareURL, problem);
  });
  CancelsOperation(*progress, operation);
  _operationQueue->addOperation(operation);
  return progress;
}

QVSharingService::Progress QVSharingProxy::saveShare(const std::optional<CKShare> &share,
                                                     QVShareReply completion) {
  const Section section(*this, "-[QVSharingProxy saveShare:completion:]");
  const QVShareReply reply = loggedShareReply(std::move(completion));
  if (IsFolderShare(share)) {
    reply(std::nullopt, qv_errorWithPOSIXCode(QVPOSIXErrorNotSupported));
    return nullptr;
  }
  setCachedShare(share);
  auto progress = NSProgress::progressWithTotalUnitCount(1);
  const auto operation = QVShareSaveOperation::initWithShare(share, _fileURL);
  operation->setShareSaveCompletionBlock([self = shared_from_this(), progress, reply](
                                             const std::optional<CKShare> &saved, const NSError &error) {
    progress->setCompletedUnitCount(1);
    self->setCachedShare(saved);
    reply(saved, error);
  });
  CancelsOperation(*progress, operation);
  _operationQueue->addOperation(operation);
  return progress;
}

QVSharingService::Progress QVSharingProxy::unshareWithCompletion(QVShareOutcomeReply completion) {
  const Section section(*this, "-[QVSharingProxy unshareWithCompletion:]");
  const auto self = shared_from_this();
  const auto unsharing = std::make_shared<Unsharing>();
  unsharing->reply = [self, completion = std::move(completion)](const NSError &error) {
    os_log_debug(qvc_default_log(), "[DEBUG] %@: reply(%@)", *self, error);
    completion(error);
  };
  unsharing->progress->setCancellable(true);
  const Progress fetching =
      fetchShareWithCompletion([self, unsharing](const std::optional<CKShare> &share, const NSError &error) {
        self->unshare(unsharing, share, error);
      });
  const Lock lock(unsharing->mutex);
  if (!unsharing->isDestroying)
    unsharing->progress->setCancellationHandler([fetching] {
      if (fetching) fetching->cancel();
    });
  return unsharing->progress;
}

void QVSharingProxy::unshare(const std::shared_ptr<Unsharing> &unsharing, const std::optional<CKShare> &share,
                             const NSError &error) {
  if (error) return unsharing->reply(error);
  if (!share || !share->isKnownToServer()) return unsharing->reply(NSError());  // nothing to withdraw
  if (IsFolderShare(share) && !_itemIdentifier.starts_with('i'))
    return unsharing->reply(qv_errorWithPOSIXCode(QVPOSIXErrorNotSupported));
  destroy(unsharing, share);
}

void QVSharingProxy::destroy(const std::shared_ptr<Unsharing> &unsharing,
                             const std::optional<CKShare> &share) {
  setCachedShare(std::nullopt);
  const auto operation = QVShareDestroyOperation::initWithShare(share, _fileURL);
  operation->setShareDestroyCompletionBlock([unsharing](const NSError &error) {
    unsharing->reply(error);
    unsharing->progress->setCompletedUnitCount(2);
  });
  {
    const Lock lock(unsharing->mutex);
    unsharing->isDestroying = true;
    unsharing->progress->setCompletedUnitCount(1);
    CancelsOperation(*unsharing->progress, operation);
  }
  _operationQueue->addOperation(operation);
}

}  // namespace droxa
