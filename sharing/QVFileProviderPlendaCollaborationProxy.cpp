#include "sharing/QVFileProviderPlendaCollaborationProxy.h"

#include <optional>
#include <utility>

#include "tessaly/ACAccountStore.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVFileProvidingOperation.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVShareOperations.h"

namespace droxa {
namespace {

using Text = std::optional<std::string>;

constexpr char kProviderIdentifier[] = "com.quorva.Tessaly";
constexpr std::int64_t kProtocolVersion = 1;
constexpr std::int64_t kCapabilities = 2 | 16 | 64 | 128;

std::shared_ptr<QVProtocol> Daemon(NSXPCErrorHandler handler) {
  return QVDaemonConnection::defaultConnection()->remoteObjectProxyWithErrorHandler(std::move(handler));
}

}  // namespace

QVFileProviderPlendaCollaborationProxy::QVFileProviderPlendaCollaborationProxy(
    std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
    std::shared_ptr<NSOperationQueue> operationQueue)
    : _fileProviderExtension(std::move(extension)),
      _itemIdentifier(std::move(itemIdentifier)),
      _operationQueue(std::move(operationQueue)) {}

void QVFileProviderPlendaCollaborationProxy::fetchVersionAndCapabilitiesWithCompletionHandler(
    QVCollaborationVersionHandler handler) {
  handler(kProtocolVersion, kCapabilities, NSError());
}

// The two tokens reach the client in the reverse of the order in which the operation gives them: that is the
// protocol.
QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::fetchCollaborationTokenWithCompletionHandler(
    QVCollaborationTokenHandler handler) {
  const NSDate expiry = NSDate::distantFuture();
  const NSURL url = _fileProviderExtension->URLForItemWithPersistentIdentifier(_itemIdentifier);
  const auto operation = QVSharingCopyShareTokenOperation::initWithURL(url);
  operation->setShareAndBaseTokenCompletionBlock(
      [handler = std::move(handler), expiry](const Text &shareToken, const Text &baseToken,
                                             const NSError &error) {
        if (!handler) return;
        if (error) return handler(std::nullopt, std::nullopt, std::nullopt, NSDate(), error);
        handler(kProviderIdentifier, baseToken, shareToken, expiry, NSError());
      });
  _operationQueue->addOperation(operation);
  return _newProgressWithCancellationHandler([operation] { operation->cancel(); });
}

QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::fetchLatestRevisionWithCompletionHandler(
    QVCollaborationErrorHandler handler) {
  const NSURL url = _fileProviderExtension->URLForItemWithPersistentIdentifier(_itemIdentifier);
  os_log_debug(qvc_default_log(), "[DEBUG] fetchLatestRevisionWithCompletionHandler: %@, %@", _itemIdentifier,
               url);
  const auto operation = QVFileProvidingOperation::initWithURL(url, 0);
  operation->setWantsCurrentVersion(true);
  operation->setFileProvidingCompletion(std::move(handler));
  _operationQueue->addOperation(operation);
  return _newProgressWithCancellationHandler([operation] { operation->cancel(); });
}

QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::refreshSharingStateWithCompletionHandler(
    QVCollaborationErrorHandler handler) {
  Daemon(handler)->refreshSharingStateForItemIdentifier(
      _itemIdentifier, [identifier = _itemIdentifier, handler](const NSError &error) {
        if (error) {
          os_log_debug(qvc_default_log(), "[DEBUG] error refreshing state for item identifier %@: %@",
                       identifier, error);
        } else {
          os_log_debug(qvc_default_log(), "[DEBUG] finished refreshing state for item identifier: %@",
                       identifier);
        }
        handler(error);
      });
  return NSProgress::progressWithTotalUnitCount(0);
}

void QVFileProviderPlendaCollaborationProxy::fetchFileProviderIdentifierWithCompletionHandler(
    QVCollaborationStringHandler handler) {
  handler(kProviderIdentifier, NSError());
}

void QVFileProviderPlendaCollaborationProxy::fetchURLForSharingFileWithCompletionHandler(
    QVCollaborationURLHandler handler) {
  handler(NSURL(), NSError());
}

QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::fetchFolderSharingStateWithCompletionHandler(
    QVCollaborationStateHandler handler) {
  Daemon([handler](const NSError &error) { handler(false, error); })
      ->getShareOptionsOfItemIdentifier(
          _itemIdentifier, [handler](bool isShared, bool /*byOthers*/, bool byItself, const Text & /*folder*/,
                                     const NSError &error) { handler(isShared && !byItself, error); });
  return nullptr;
}

QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::fetchSharedFolderInfoWithCompletionHandler(
    QVCollaborationFolderHandler handler) {
  Daemon([handler](const NSError &error) { handler(false, std::nullopt, error); })
      ->getShareOptionsOfItemIdentifier(
          _itemIdentifier,
          [handler](bool isShared, bool /*byOthers*/, bool byItself, const Text &folder,
                    const NSError &error) { handler(isShared && !byItself, folder, error); });
  return nullptr;
}

void QVFileProviderPlendaCollaborationProxy::fetchAccountIdentifierWithCompletionHandler(
    QVCollaborationStringHandler handler) {
  const auto account = qv_accountForCurrentPersona(ACAccountStore::defaultStore());
  const Text identifier = account ? account->identifier() : std::nullopt;
  os_log_debug(qvc_default_log(), "[DEBUG] Current account id is: %@", identifier);
  handler(identifier, identifier ? NSError() : qvc_errorLoggedOut());
}

QVFileProviderPlendaCollaboration::Progress
QVFileProviderPlendaCollaborationProxy::_newProgressWithCancellationHandler(std::function<void()> handler) {
  auto progress = NSProgress::progressWithTotalUnitCount(0);
  progress->setCancellationHandler(std::move(handler));
  return progress;
}

}  // namespace droxa
