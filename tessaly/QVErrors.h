#pragma once

#include <optional>
#include <string>

#include "platform/foundation/NSError.h"
#include "platform/oslog/LogFormat.h"

namespace droxa {

inline constexpr char QVTessalyErrorDomain[] = "QVTessalyErrorDomain";

inline constexpr std::int64_t QVErrorNotEntitled = 1;  // to any container of the cloud
inline constexpr std::int64_t QVErrorLoggedOut = 2;
inline constexpr std::int64_t QVErrorNoSuchItem = 14;
inline constexpr std::int64_t QVErrorInvalidArgument = 22;
inline constexpr std::int64_t QVErrorPrivilegeRequired = 26;  // the client isn't entitled to it
inline constexpr std::int64_t QVErrorDatabase = 30;
inline constexpr std::int64_t QVErrorUnreadable = 31;          // the file system refused to show the item
inline constexpr std::int64_t QVErrorChangeTokenExpired = 32;  // of the working-set feed
inline constexpr std::int64_t QVErrorShuttingDown = 33;
inline constexpr std::int64_t QVErrorCancelled = 34;         // a transfer that nobody wants any more
inline constexpr std::int64_t QVErrorChecksumMismatch = 35;  // what came isn't what the cloud promised
inline constexpr std::int64_t QVErrorUnsentChanges = 36;     // the cloud doesn't have the contents yet
inline constexpr std::int64_t QVErrorDocumentInUse = 37;
inline constexpr std::int64_t QVErrorPinned = 38;
inline constexpr std::int64_t QVErrorSharingUnavailable = 39;  // this daemon's cloud takes no shares

NSError qvc_errorLoggedOut();
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

}  // namespace droxa
