#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKShare.h"
#include "platform/fileprovider/NSFileProviderItem.h"
#include "platform/foundation/NSError.h"
#include "platform/foundation/NSProgress.h"
#include "platform/foundation/NSURL.h"
#include "tessaly/QVShareOperationProtocol.h"

namespace droxa {

inline constexpr char QVSharingServiceName[] = "com.quorva.Tessaly.SharingV1";

using QVSharingInfoReply = std::function<void(
    bool isShared, const std::shared_ptr<const NSFileProviderItem> &item, const NSError &error)>;
using QVSharingStrings = std::optional<std::vector<std::string>>;
using QVSharingPreflightReply =
    std::function<void(bool isShared, const std::shared_ptr<const NSFileProviderItem> &item,
                       const QVSharingStrings &first, const QVSharingStrings &second, const NSError &error)>;
using QVSharingParticipantsReply = std::function<void(const QVShareParticipants &participants,
                                                      std::int64_t publicPermission, const NSError &error)>;
using QVSharingURLReply = std::function<void(const NSURL &url, const NSError &error)>;

// What an application may ask about the sharing of one item, and change: the service QVSharingServiceName of
// the item. Any application may; each connection is about the item on which the service was asked for.
//
// Errors are the daemon's and the cloud's (QVTessalyErrorDomain, CKErrorDomain) unless said otherwise. A
// reply is called exactly once, on any thread and also before the call returns, unless the connection fails
// first: then the error handler of the proxy is called instead.
//
// A returned progress counts steps, and cancelling it cancels the work, which then replies QVErrorCancelled
// unless it was too late. Nil: there is nothing to wait for. Through a connection a call gives a progress of
// the client's own, which shows what the real one does and stays at 0 of -1 when there is none; it may lag
// behind the reply. Letting go of it, or of the connection, cancels nothing.
class QVSharingService {
 public:
  using Progress = std::shared_ptr<NSProgress>;

  virtual ~QVSharingService() = default;

  // Whether the item is shared, as the drive shows it; the item is always nil. NSFileProviderErrorNoSuchItem
  // when there is no such item (any more).
  virtual void fetchSharingInfo(QVSharingInfoReply reply) = 0;
  // The same answer, in the form in which clients ask before they offer to share. The progress and the other
  // values are always nil.
  virtual Progress preflightCheckIfCurrentlyShareableWithCompletion(QVSharingPreflightReply completion) = 0;
  // The participants of the share (nil without one) and its public permission, a
  // CKShareParticipantPermission.
  virtual Progress fetchParticipantListAndPublicPermission(QVSharingParticipantsReply completion) = 0;
  // Does nothing, deliberately: there is nothing to prepare.
  virtual void startPreparingForShareWhenForcing(bool force) = 0;
  // The item's share. One that isn't shared gets a new share that nobody knows before it is saved
  // (CKShare::isKnownToServer()).
  virtual Progress fetchShareWithCompletion(QVShareReply completion) = 0;
  // By which others reach the item. QVErrorNoShare when it isn't shared.
  virtual Progress fetchShareURLWithCompletion(QVSharingURLReply completion) = 0;
  // Saves the share with all that was changed in it; replies the share as the cloud has it then. A folder's
  // share isn't saved here: NSPOSIXErrorDomain QVPOSIXErrorNotSupported. CKErrorCode::serverRecordChanged
  // when somebody else has changed it since it was fetched.
  virtual Progress saveShare(const std::optional<CKShare> &share, QVShareReply completion) = 0;
  // Withdraws the share, or leaves it when it is another's. nil also when the item wasn't shared.
  virtual Progress unshareWithCompletion(QVShareOutcomeReply completion) = 0;
};

}  // namespace droxa
