#include "cli/ExitStatus.h"

#include <cerrno>
#include <cstring>
#include <sysexits.h>

#include "cli/Text.h"
#include "platform/cloudkit/CKError.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

// Of NSCocoaErrorDomain: what the daemon says of the cloud.
constexpr std::int64_t kCloudIsFull = 4354;
constexpr std::int64_t kCloudIsAway = 4355;

enum class Meaning {
  noSuchItem,
  notSignedIn,
  unreadable,
  unwritable,
  nameIsTaken,
  partIsAway,
  noAnswer,
  cloudIsAway,
  cloudIsFull,
  diskIsFull,
  diskIsReadOnly,
  diskFailed,
  wrongContents,
  unsentChanges,
  documentInUse,
  pinned,
  cancelled,
  notAllowed,
  notShared,
  changedMeanwhile,
  other
};

struct Known {
  const char *domain;
  std::int64_t code;
  Meaning meaning;
};

constexpr Known kKnown[] = {
    {NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem, Meaning::noSuchItem},
    {NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated, Meaning::notSignedIn},
    {NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision, Meaning::nameIsTaken},
    {NSFileProviderErrorDomain, NSFileProviderErrorInsufficientQuota, Meaning::cloudIsFull},
    {NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable, Meaning::partIsAway},
    {QVTessalyErrorDomain, QVErrorNoSuchItem, Meaning::noSuchItem},
    {QVTessalyErrorDomain, QVErrorLoggedOut, Meaning::notSignedIn},
    {QVTessalyErrorDomain, QVErrorUnreadable, Meaning::unreadable},
    {QVTessalyErrorDomain, QVErrorShuttingDown, Meaning::partIsAway},
    {QVTessalyErrorDomain, QVErrorCancelled, Meaning::cancelled},
    {QVTessalyErrorDomain, QVErrorChecksumMismatch, Meaning::wrongContents},
    {QVTessalyErrorDomain, QVErrorUnsentChanges, Meaning::unsentChanges},
    {QVTessalyErrorDomain, QVErrorDocumentInUse, Meaning::documentInUse},
    {QVTessalyErrorDomain, QVErrorPinned, Meaning::pinned},
    {QVTessalyErrorDomain, QVErrorPrivilegeRequired, Meaning::notAllowed},
    {QVTessalyErrorDomain, QVErrorNoShare, Meaning::notShared},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::permissionFailure), Meaning::notAllowed},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::serverRecordChanged), Meaning::changedMeanwhile},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::networkUnavailable), Meaning::cloudIsAway},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::networkFailure), Meaning::cloudIsAway},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::serviceUnavailable), Meaning::cloudIsAway},
    {CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::quotaExceeded), Meaning::cloudIsFull},
    {NSCocoaErrorDomain, kCloudIsFull, Meaning::cloudIsFull},
    {NSCocoaErrorDomain, kCloudIsAway, Meaning::cloudIsAway},
    {NSCocoaErrorDomain, NSUserCancelledError, Meaning::cancelled},
    {NSCocoaErrorDomain, NSFileNoSuchFileError, Meaning::noSuchItem},
    {NSCocoaErrorDomain, NSFileReadNoSuchFileError, Meaning::noSuchItem},
    {NSCocoaErrorDomain, NSFileWriteNoPermissionError, Meaning::unwritable},
    {NSCocoaErrorDomain, NSFileWriteFileExistsError, Meaning::nameIsTaken},
    {NSCocoaErrorDomain, NSFileWriteOutOfSpaceError, Meaning::diskIsFull},
    {NSCocoaErrorDomain, NSFileWriteVolumeReadOnlyError, Meaning::diskIsReadOnly},
    {NSCocoaErrorDomain, NSXPCConnectionInterrupted, Meaning::partIsAway},
    {NSCocoaErrorDomain, NSXPCConnectionInvalid, Meaning::partIsAway},
    {NSCocoaErrorDomain, NSXPCConnectionReplyInvalid, Meaning::noAnswer},
    {NSPOSIXErrorDomain, ENOENT, Meaning::noSuchItem},
    {NSPOSIXErrorDomain, EACCES, Meaning::unreadable},
    {NSPOSIXErrorDomain, EPERM, Meaning::unreadable},
    {NSPOSIXErrorDomain, ENOSPC, Meaning::diskIsFull},
    {NSPOSIXErrorDomain, EDQUOT, Meaning::diskIsFull},
    {NSPOSIXErrorDomain, EROFS, Meaning::diskIsReadOnly},
    {NSPOSIXErrorDomain, EIO, Meaning::diskFailed},
};

Meaning meaningOf(const NSError &error) {
  // The framework has one code for a cloud that is away and a part of the system that is: the cause tells.
  for (NSError cause = error.underlyingError(); cause; cause = cause.underlyingError())
    if (cause.is(NSCocoaErrorDomain, kCloudIsAway)) return Meaning::cloudIsAway;
  for (const Known &known : kKnown)
    if (error.is(known.domain, known.code)) return known.meaning;
  return Meaning::other;
}

// The words of whoever knows most of it: an error that was only translated has none of its own.
std::string words(const NSError &error) {
  const NSError cause = error.underlyingError();
  return cause && error.userInfo().count(NSLocalizedDescriptionKey) == 0 ? words(cause)
                                                                         : error.localizedDescription();
}

// " (a.txt, d12)", when the error tells.
std::string collidingItem(const NSError &error) {
  const auto found = error.userInfo().find(NSFileProviderErrorCollidingItemKey);
  if (found == error.userInfo().end()) {
    const NSURL url = fp_collidingURL(error);
    return url ? " (" + escapedText(url.path()) + ")" : std::string();
  }
  const auto *object = std::get_if<std::shared_ptr<const NSObject>>(&found->second);
  const auto *item = object ? dynamic_cast<const NSFileProviderItem *>(object->get()) : nullptr;
  return item ? " (" + escapedText(item->fields().filename) + ", " + item->itemIdentifier() + ")"
              : std::string();
}

}  // namespace

int exitStatusForError(const NSError &error) {
  switch (meaningOf(error)) {
    case Meaning::noSuchItem:
      return EX_NOINPUT;
    case Meaning::notSignedIn:
    case Meaning::unreadable:
    case Meaning::unwritable:
    case Meaning::notAllowed:
      return EX_NOPERM;
    case Meaning::partIsAway:
      return EX_UNAVAILABLE;
    case Meaning::noAnswer:
    case Meaning::cloudIsAway:
      return EX_TEMPFAIL;
    case Meaning::cloudIsFull:
    case Meaning::diskIsFull:
    case Meaning::diskIsReadOnly:
      return EX_CANTCREAT;
    case Meaning::diskFailed:
    case Meaning::wrongContents:
      return EX_IOERR;
    default:
      return kExitFailure;
  }
}

std::string explanationOfError(const NSError &error) {
  switch (meaningOf(error)) {
    case Meaning::noSuchItem:
      return "there is no such item; `droxa ls` shows what there is";
    case Meaning::notSignedIn:
      return "nobody is signed in; `droxa account sign-in NAME` signs somebody in";
    case Meaning::unreadable:
      return "it can't be read: " + error.localizedDescription();
    case Meaning::unwritable:
      return "it may not be changed: " + words(error);
    case Meaning::nameIsTaken:
      return "something has that name already" + collidingItem(error) + "; choose another name";
    case Meaning::partIsAway:
      return words(error) + "; `droxa status` shows what runs, `droxa run` starts it";
    case Meaning::noAnswer:
      return "no answer in time; `droxa status` shows what runs, --timeout waits longer";
    case Meaning::cloudIsAway:
      return "the cloud can't be reached (" + words(error) +
             "); `droxa status` shows why, try again when it can";
    case Meaning::cloudIsFull:
      return "the cloud has no room for it: " + words(error);
    case Meaning::diskIsFull:
      return "the disk is full; `droxa evict` lets go of documents that the cloud has";
    case Meaning::diskIsReadOnly:
      return "the drive's disk can't be written: it is mounted for reading alone";
    case Meaning::diskFailed:
      return "the disk failed: " + words(error);
    case Meaning::unsentChanges:
      return "the cloud doesn't have its contents yet; `droxa wait` waits until it does";
    case Meaning::documentInUse:
      return "a program has it open; close it there, and try again";
    case Meaning::pinned:
      return "it is pinned, or below a folder that is; `droxa unpin` unpins it";
    case Meaning::cancelled:
      return "it was cancelled";
    case Meaning::notAllowed:
      return "it isn't allowed: " + words(error);
    case Meaning::notShared:
      return "it isn't shared; `droxa share create` shares it";
    case Meaning::changedMeanwhile:
      return "somebody else changed it in the same moment; look at it, and try again";
    default:
      return words(error);
  }
}

}  // namespace droxa
