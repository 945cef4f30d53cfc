#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKShare.h"
#include "platform/fileprovider/FPSandboxingURLWrapper.h"
#include "platform/foundation/NSData.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSPersonNameComponents.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVOperationClient.h"

namespace droxa {

using QVShareParticipants = std::optional<std::vector<CKShareParticipant>>;

using QVShareOutcomeReply = std::function<void(const NSError &error)>;
using QVShareReply = std::function<void(const std::optional<CKShare> &share, const NSError &error)>;
using QVShareAndURLReply =
    std::function<void(const std::optional<CKShare> &share, const NSURL &url, const NSError &error)>;
using QVRecordAccessReply =
    std::function<void(const NSData &data, const std::optional<std::string> &text, const NSError &error)>;
using QVParticipantTokenReply = std::function<void(
    const std::optional<std::string> &first, const std::optional<std::string> &second, const NSError &error)>;
using QVCurrentUserReply = std::function<void(
    const std::optional<NSPersonNameComponents> &name, const std::optional<std::string> &first,
    const std::optional<std::string> &second, const std::optional<std::string> &third, const NSError &error)>;
using QVParticipantsReply =
    std::function<void(const QVShareParticipants &participants, const NSError &error)>;
using QVSandboxingURLReply = std::function<void(
    const std::shared_ptr<const FPSandboxingURLWrapper> &urlWrapper, const NSError &error)>;

// The sharing operations of the daemon, as privileged clients reach them too (through the extension). `op` is
// the caller's side of the operation: while the call is under way it is told of progress, and given what the
// call is cancelled by; null: nobody wants to know. What is asked for may be nil wherever it can: the answer
// is the daemon's. A reply is called exactly once, on any thread, unless the connection fails first: then the
// error handler of the proxy is called instead. A value that isn't there is nil, the error is the last one.
// Of an item that isn't shared, toCopySharingInfoAtURL's error is QVErrorNoShare; its URL is nil unless the
// daemon has a reason to hand one out.
class QVShareOperationProtocol {
 public:
  using Operation = std::shared_ptr<QVOperationClient>;

  virtual ~QVShareOperationProtocol() = default;
  virtual void startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                                     QVShareAndURLReply reply) = 0;
  virtual void startOperation_toCopyShareURLForShare(Operation op, const std::optional<CKShare> &share,
                                                     const std::optional<std::string> &appName,
                                                     QVShareAndURLReply reply) = 0;
  virtual void startOperation_toSaveSharingInfo(Operation op, const std::optional<CKShare> &share,
                                                QVShareReply reply) = 0;
  virtual void createSharingInfoForURL(const NSURL &url, QVShareReply reply) = 0;
  virtual void startOperation_toUnshareShare(Operation op, const std::optional<CKShare> &share,
                                             bool forceDelete, QVShareOutcomeReply reply) = 0;
  virtual void startOperation_toModifyRecordAccessAtURL(Operation op, const NSURL &url, bool allowAccess,
                                                        QVRecordAccessReply reply) = 0;
  virtual void startOperation_toCopyParticipantTokenAtURL(Operation op, const NSURL &url,
                                                          QVParticipantTokenReply reply) = 0;
  virtual void startOperation_toPrepFolderForSharingAt(Operation op, const NSURL &url,
                                                       QVShareOutcomeReply reply) = 0;
  virtual void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) = 0;
  virtual void startOperation_toProcessSubitemsAtURL(Operation op, const NSURL &url,
                                                     std::uint64_t maxSubsharesFailures,
                                                     std::uint64_t processType,
                                                     QVShareOutcomeReply reply) = 0;
  virtual void startOperation_toLookupShareParticipants(Operation op, const QVShareParticipants &participants,
                                                        QVParticipantsReply reply) = 0;
  // The URL comes with what lets its receiver open the document.
  virtual void startOperation_toCopyDocumentURLForRecordID(Operation op,
                                                           const std::optional<CKRecordID> &recordID,
                                                           bool syncIfNeeded, QVSandboxingURLReply reply) = 0;
};

}  // namespace droxa
