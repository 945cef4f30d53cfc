#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/NSOperationQueue.h"
#include "platform/foundation/ThreadSafety.h"
#include "sharing/QVFileProviderXPCAutomaticErrorProxy.h"
#include "tessaly/QVCClientPrivilegesDescriptor.h"
#include "tessaly/QVShareOperationProtocol.h"

namespace droxa {

class _QVFileProviderShareOperationWrapper;

// One client's way to the daemon's sharing operations: each call is refused at once when the client isn't
// entitled to it, and otherwise goes to the daemon as it is, as does its answer back. A refused call never
// reaches the daemon, and its operation is left alone. What a client passes isn't looked at, and isn't tied
// to the item that the service was offered on: privileges are the only gate.
//
// Refusals: QVTessalyErrorDomain, QVErrorPrivilegeRequired, with the missing privilege's name. A daemon that
// goes away: the connection's error, as it is. When the client goes away, and this with its connection, what
// the daemon still does for it is cancelled.
//
// Thread contract: any thread, any number of calls under way; the lock guards the operations alone. A refusal
// replies before the call returns, an answer of the daemon where the daemon's connection delivers it.
class QVFileProviderShareOperationProxy final : public QVShareOperationProtocol {
 public:
  QVFileProviderShareOperationProxy(
      std::shared_ptr<NSFileProviderExtension> extension, std::string itemIdentifier,
      std::shared_ptr<NSOperationQueue> operationQueue,
      std::shared_ptr<const QVCClientPrivilegesDescriptor> clientPriviledgesDescriptor);
  ~QVFileProviderShareOperationProxy() override;
  QVFileProviderShareOperationProxy(const QVFileProviderShareOperationProxy &) = delete;
  QVFileProviderShareOperationProxy &operator=(const QVFileProviderShareOperationProxy &) = delete;

  // The daemon, made anew for each call.
  static std::shared_ptr<QVFileProviderXPCAutomaticErrorProxy> remoteObject();

  void startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                             QVShareAndURLReply reply) override;
  void startOperation_toCopyShareURLForShare(Operation op, const std::optional<CKShare> &share,
                                             const std::optional<std::string> &appName,
                                             QVShareAndURLReply reply) override;
  void startOperation_toSaveSharingInfo(Operation op, const std::optional<CKShare> &share,
                                        QVShareReply reply) override;
  void createSharingInfoForURL(const NSURL &url, QVShareReply reply) override;
  void startOperation_toUnshareShare(Operation op, const std::optional<CKShare> &share, bool forceDelete,
                                     QVShareOutcomeReply reply) override;
  void startOperation_toModifyRecordAccessAtURL(Operation op, const NSURL &url, bool allowAccess,
                                                QVRecordAccessReply reply) override;
  void startOperation_toCopyParticipantTokenAtURL(Operation op, const NSURL &url,
                                                  QVParticipantTokenReply reply) override;
  void startOperation_toPrepFolderForSharingAt(Operation op, const NSURL &url,
                                               QVShareOutcomeReply reply) override;
  void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) override;
  void startOperation_toProcessSubitemsAtURL(Operation op, const NSURL &url,
                                             std::uint64_t maxSubsharesFailures, std::uint64_t processType,
                                             QVShareOutcomeReply reply) override;
  void startOperation_toLookupShareParticipants(Operation op, const QVShareParticipants &participants,
                                                QVParticipantsReply reply) override;
  void startOperation_toCopyDocumentURLForRecordID(Operation op, const std::optional<CKRecordID> &recordID,
                                                   bool syncIfNeeded, QVSandboxingURLReply reply) override;

 private:
  struct Privilege;
  static const Privilege kSharingProxy, kSharingPrivateInterface, kFolderSharingProxy;

  template <class Method, class... Values, class... Arguments>
  void forward(const char *name, const char *replyName, const Privilege &privilege, Method method,
               const std::function<void(Values...)> &reply, Arguments &&...arguments) const;

  // What the daemon gets instead of the client's operation.
  std::shared_ptr<QVOperationClient> wrapped(const Operation &operation) const;

  // Kept for as long as the client's connection; no call needs the first three.
  const std::shared_ptr<NSFileProviderExtension> _fileProviderExtension;
  const std::string _itemIdentifier;
  const std::shared_ptr<NSOperationQueue> _operationQueue;
  const std::shared_ptr<const QVCClientPrivilegesDescriptor> _clientPriviledgesDescriptor;

  mutable Mutex _lock;
  // The operations that the daemon has, or had a moment ago.
  mutable std::vector<std::weak_ptr<_QVFileProviderShareOperationWrapper>> _operations GUARDED_BY(_lock);
};

}  // namespace droxa
