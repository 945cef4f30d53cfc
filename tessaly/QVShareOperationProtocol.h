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

// What startOperation_toProcessSubitemsAtURL does with the shares of items below a folder.
inline constexpr std::uint64_t QVProcessCheckSubshares = 0;     // only finds those that can't be withdrawn
inline constexpr std::uint64_t QVProcessWithdrawSubshares = 1;  // withdraws them

// The sharing operations of the daemon, as privileged clients reach them too (through the extension). `op` is
// the caller's side of the operation: while the call is under way it is told of progress
// (tessaly/QVSharingTopics.h), and given what the call is cancelled by; null: nobody wants to know. What is
// asked for may be nil wherever it can: the answer is the daemon's. A reply is called exactly once, on any
// thread, unless the connection fails first: then the error handler of the proxy is called instead. A value
// that isn't there is nil, the error is the last one.
//
// Errors of every call: 2 when nobody is signed in; 22 for a URL, share or record that is nil; 14 when there
// is nothing at the URL in the drive; 41 for what isn't shared: aliases, containers' own folders, what lies
// in the trash or in private storage, or is kept local; 34 when it was cancelled, also by the end of the
// connection; 40 when too many calls wait already; 33 when the daemon ends. The cloud's errors
// (CKErrorDomain) come as they are; what doesn't move for a minute ends with CKErrorIsTimeout.
class QVShareOperationProtocol {
 public:
  using Operation = std::shared_ptr<QVOperationClient>;

  virtual ~QVShareOperationProtocol() = default;
  // The share that the item is in, as the cloud has it now: its own, or that of the nearest folder above it,
  // as its rootRecordID tells. The URL is nil. 20 when there is none.
  virtual void startOperation_toCopySharingInfoAtURL(Operation op, const NSURL &url,
                                                     QVShareAndURLReply reply) = 0;
  // The share, with its URL; one that was never saved is saved first, on behalf of the application.
  virtual void startOperation_toCopyShareURLForShare(Operation op, const std::optional<CKShare> &share,
                                                     const std::optional<std::string> &appName,
                                                     QVShareAndURLReply reply) = 0;
  // The share as the cloud has saved it. A conflict comes with the cloud's record (CKErrorServerRecord).
  virtual void startOperation_toSaveSharingInfo(Operation op, const std::optional<CKShare> &share,
                                                QVShareReply reply) = 0;
  // A new share of the item, not saved yet: its title is the item's name, its type one of
  // tessaly/QVShareTypes.h. An item that isn't in the cloud is sent there first; the sync's errors when it
  // can't be. 41 for what somebody else shares with this account.
  virtual void createSharingInfoForURL(const NSURL &url, QVShareReply reply) = 0;
  // The owner withdraws the share, a participant leaves it. With `forceDelete` also when it was changed
  // meanwhile, and when it is gone it is done. One that was never saved needs nothing.
  virtual void startOperation_toUnshareShare(Operation op, const std::optional<CKShare> &share,
                                             bool forceDelete, QVShareOutcomeReply reply) = 0;
  // Lets everybody who has the URL of the item's own share read, where they can't even do that yet; or takes
  // the URL's access away altogether. Replies the share's URL: as UTF-8 text in data, and as a string. 20
  // when the item has no share of its own.
  virtual void startOperation_toModifyRecordAccessAtURL(Operation op, const NSURL &url, bool allowAccess,
                                                        QVRecordAccessReply reply) = 0;
  // Tokens by which the account shows others that it may read the item (CKShareTokens): first the share's, by
  // which it may where the item is in a share, then the item's own.
  virtual void startOperation_toCopyParticipantTokenAtURL(Operation op, const NSURL &url,
                                                          QVParticipantTokenReply reply) = 0;
  // Replies when the item, and everything below it that has changed so far, is safe in the cloud; or with why
  // one of them can't be.
  virtual void startOperation_toPrepFolderForSharingAt(Operation op, const NSURL &url,
                                                       QVShareOutcomeReply reply) = 0;
  // The account in the cloud: its name for people, in parts (the last word is the family's name); then its
  // account name, its handle, and its name for people as a whole. nil for what it doesn't have.
  virtual void copyCurrentUserNameAndDisplayHandleWithReply(QVCurrentUserReply reply) = 0;
  // What is shared by itself below the folder would be shared twice once the folder is. Does what the process
  // type says (QVProcess…Subshares) with each such share; others' can't be withdrawn. All are tried. The
  // error is partialFailure, and names the first, when more than `maxSubsharesFailures` can't be.
  virtual void startOperation_toProcessSubitemsAtURL(Operation op, const NSURL &url,
                                                     std::uint64_t maxSubsharesFailures,
                                                     std::uint64_t processType,
                                                     QVShareOutcomeReply reply) = 0;
  // The participants, by account name or, where that is "", by handle, as they can be put into a share, with
  // the permissions asked for. Those that the cloud doesn't know are left out, and partialFailure names them.
  virtual void startOperation_toLookupShareParticipants(Operation op, const QVShareParticipants &participants,
                                                        QVParticipantsReply reply) = 0;
  // Where the document (or folder) of a record is, with its contents here, and open for reading. With
  // `syncIfNeeded` the cloud's changes are fetched first. CKErrorDomain unknownItem when it isn't in the
  // drive.
  virtual void startOperation_toCopyDocumentURLForRecordID(Operation op,
                                                           const std::optional<CKRecordID> &recordID,
                                                           bool syncIfNeeded, QVSandboxingURLReply reply) = 0;
};

}  // namespace droxa
