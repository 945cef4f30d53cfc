#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/NSObject.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/ThreadSafety.h"
#include "tessaly/QVSharingService.h"

namespace droxa {

// The sharing service of one item, for one client: what tessaly/QVSharingService.h promises, by the Tessaly
// library's share operations on the extension's queue. It keeps the last share that it fetched or saved, and
// answers from it until the share is withdrawn.
//
// Thread contract: any thread; replies come on the thread of the call or on those of the operations. The lock
// guards the share alone: where calls overlap, the last one to write it wins.
class QVSharingProxy final : public QVSharingService,
                             public NSObject,
                             public std::enable_shared_from_this<QVSharingProxy> {
 public:
  // The file's URL isn't kept: the item may move, so each call looks for it anew, and what saves or withdraws
  // a share goes by the share alone.
  QVSharingProxy(std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
                 const NSURL &fileURL, std::shared_ptr<NSOperationQueue> operationQueue);
  ~QVSharingProxy() override;
  QVSharingProxy(const QVSharingProxy &) = delete;
  QVSharingProxy &operator=(const QVSharingProxy &) = delete;

  void fetchSharingInfo(QVSharingInfoReply reply) override;
  Progress preflightCheckIfCurrentlyShareableWithCompletion(QVSharingPreflightReply completion) override;
  Progress fetchParticipantListAndPublicPermission(QVSharingParticipantsReply completion) override;
  void startPreparingForShareWhenForcing(bool force) override;
  Progress fetchShareWithCompletion(QVShareReply completion) override;
  Progress fetchShareURLWithCompletion(QVSharingURLReply completion) override;
  Progress saveShare(const std::optional<CKShare> &share, QVShareReply completion) override;
  Progress unshareWithCompletion(QVShareOutcomeReply completion) override;

 private:
  class Section;
  struct Unsharing;

  NSURL itemURL() const;
  NSError readIsShared(bool *isShared) const;
  void rootShareCame(const NSURL &asked, const std::optional<CKShare> &share, const NSURL &url,
                     const NSError &error, const QVShareReply &reply);
  void unshare(const std::shared_ptr<Unsharing> &unsharing, const std::optional<CKShare> &share,
               const NSError &error);
  void destroy(const std::shared_ptr<Unsharing> &unsharing, const std::optional<CKShare> &share);
  // What logs a reply with this object before it gives it.
  QVShareReply loggedShareReply(QVShareReply reply);

  std::optional<CKShare> cachedShare() const;
  void setCachedShare(std::optional<CKShare> share);

  // Constant after construction.
  const std::shared_ptr<NSFileProviderExtension> _fileProviderExtension;
  const std::string _itemIdentifier;
  const std::shared_ptr<NSOperationQueue> _operationQueue;
  const NSURL _fileURL;  // always nil

  mutable Mutex _lock;
  std::optional<CKShare> _cachedShare GUARDED_BY(_lock);
};

}  // namespace droxa
