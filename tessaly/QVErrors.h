#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <type_traits>

#include "platform/foundation/NSError.h"
#include "platform/oslog/LogFormat.h"

namespace droxa {

inline constexpr char QVTessalyErrorDomain[] = "QVTessalyErrorDomain";

inline constexpr std::int64_t QVErrorNotEntitled = 1;  // to any container of the cloud
inline constexpr std::int64_t QVErrorLoggedOut = 2;
inline constexpr std::int64_t QVErrorNoSuchItem = 14;
inline constexpr std::int64_t QVErrorNoShare = 20;  // there is no share of this item
inline constexpr std::int64_t QVErrorInvalidArgument = 22;
inline constexpr std::int64_t QVErrorPrivilegeRequired = 26;  // the client isn't entitled to it
inline constexpr std::int64_t QVErrorDatabase = 30;
inline constexpr std::int64_t QVErrorUnreadable = 31;          // the file system refused to show the item
inline constexpr std::int64_t QVErrorChangeTokenExpired = 32;  // of the working-set feed
inline constexpr std::int64_t QVErrorShuttingDown = 33;
inline constexpr std::int64_t QVErrorCancelled = 34;  // a transfer or an operation that nobody wants any more
inline constexpr std::int64_t QVErrorChecksumMismatch = 35;  // what came isn't what the cloud promised
inline constexpr std::int64_t QVErrorUnsentChanges = 36;     // the cloud doesn't have the contents yet
inline constexpr std::int64_t QVErrorDocumentInUse = 37;
inline constexpr std::int64_t QVErrorPinned = 38;
inline constexpr std::int64_t QVErrorSharingUnavailable = 39;  // this daemon's cloud takes no shares
// Of what others share: it may only be read, and what was changed is kept on this machine alone.
inline constexpr std::int64_t QVErrorReadOnlyShare = 46;
// Of what was put beside the shared folders instead of into one: it is kept on this machine alone.
inline constexpr std::int64_t QVErrorNotInSharedFolder = 47;
inline constexpr std::int64_t QVErrorBusy = 40;  // too much is under way already; to be asked again later
inline constexpr std::int64_t QVErrorNotShareable =
    41;  // the item is of a kind, or in a place, that isn't shared

// "Operation not supported" as clients of the sharing service know it, of NSPOSIXErrorDomain: the protocol's
// number, whatever this system's own for it is.
inline constexpr int QVPOSIXErrorNotSupported = 45;

NSError qvc_errorLoggedOut();
// Of NSPOSIXErrorDomain.
NSError qv_errorWithPOSIXCode(int code, std::string description = {});
// Describes it by a checked format (platform/oslog/LogFormat.h).
template <class... Args>
NSError qv_errorWithDomain(const char *domain, std::int64_t code,
                           LogFormat<std::type_identity_t<Args>...> description, const Args &...args) {
  return NSError(domain, code, {{NSLocalizedDescriptionKey, description.print(args...)}});
}
NSError qvc_error(std::int64_t code, std::string description);
// 22: a parameter, named in the text, has a value that it can't have.
NSError qvc_errorInvalidParameter(const std::string &parameter, const std::optional<std::string> &value);
NSError qvc_errorNoSuchItem(const std::string &asked);

// Whether it is one of QVTessalyErrorDomain with that code; a nil error isn't.
bool qv_isTessalyErrorCode(const NSError &error, std::int64_t code);
// Whether the cloud has no such record (CKErrorDomain).
bool qvc_isCloudKitUnknownItemError(const NSError &error);
// Whether `test` holds for the error or one of those beneath it: what the cloud said may be wrapped in what
// the daemon makes of it. Not for a nil error, for which the test isn't asked.
bool qvc_checkErrorsFromCloudKit(const NSError &error, const std::function<bool(const NSError &error)> &test);

}  // namespace droxa
