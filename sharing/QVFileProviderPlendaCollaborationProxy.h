#pragma once

#include <functional>
#include <memory>
#include <string>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/NSOperationQueue.h"
#include "tessaly/QVPlendaCollaboration.h"

namespace droxa {

// The collaboration service of one item, for one client: what tessaly/QVPlendaCollaboration.h promises. Each
// call is answered with a constant, or by one operation on the extension's queue, or by one call of the
// daemon, whose errors reach the client as they are. What was begun goes on when the client has gone. Thread
// contract: immutable; any thread. Handlers are called before the call returns, on the threads of the
// operations, or where the daemon's connection delivers its replies.
class QVFileProviderPlendaCollaborationProxy final : public QVFileProviderPlendaCollaboration {
 public:
  QVFileProviderPlendaCollaborationProxy(std::shared_ptr<NSFileProviderExtension> extension,
                                         std::string itemIdentifier,
                                         std::shared_ptr<NSOperationQueue> operationQueue);

  void fetchVersionAndCapabilitiesWithCompletionHandler(QVCollaborationVersionHandler handler) override;
  Progress fetchCollaborationTokenWithCompletionHandler(QVCollaborationTokenHandler handler) override;
  Progress fetchLatestRevisionWithCompletionHandler(QVCollaborationErrorHandler handler) override;
  Progress refreshSharingStateWithCompletionHandler(QVCollaborationErrorHandler handler) override;
  void fetchFileProviderIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override;
  void fetchURLForSharingFileWithCompletionHandler(QVCollaborationURLHandler handler) override;
  Progress fetchFolderSharingStateWithCompletionHandler(QVCollaborationStateHandler handler) override;
  Progress fetchSharedFolderInfoWithCompletionHandler(QVCollaborationFolderHandler handler) override;
  void fetchAccountIdentifierWithCompletionHandler(QVCollaborationStringHandler handler) override;

 private:
  // NOLINTNEXTLINE(bugprone-reserved-identifier): the name is given
  static Progress _newProgressWithCancellationHandler(std::function<void()> handler);

  const std::shared_ptr<NSFileProviderExtension> _fileProviderExtension;
  const std::string _itemIdentifier;
  const std::shared_ptr<NSOperationQueue> _operationQueue;
};

}  // namespace droxa
