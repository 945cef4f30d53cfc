#include "fileproviderd/mount/ErrnoForError.h"

#include <cerrno>
#include <string_view>

#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSFileManager.h"

namespace droxa {

namespace {

struct Row {
  const char *domain;
  std::int64_t code;
  int number;
};

// The sync's own errors, which cross as they are.
constexpr char kSyncDomain[] = "QVTessalyErrorDomain";
constexpr std::int64_t kCloudQuota = 4354;
constexpr std::int64_t kCloudUnreachable = 4355;

constexpr Row kRows[] = {
    {NSFileProviderErrorDomain, NSFileProviderErrorNotAuthenticated, EACCES},
    {NSFileProviderErrorDomain, NSFileProviderErrorFilenameCollision, EEXIST},
    {NSFileProviderErrorDomain, NSFileProviderErrorInsufficientQuota, EDQUOT},
    {NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable, ENETDOWN},
    {NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem, ESTALE},
    {NSCocoaErrorDomain, NSFileNoSuchFileError, ESTALE},
    {NSCocoaErrorDomain, NSFileReadNoSuchFileError, ESTALE},
    {NSCocoaErrorDomain, NSFileWriteNoPermissionError, EACCES},
    {NSCocoaErrorDomain, NSFileWriteInvalidFileNameError, EINVAL},
    {NSCocoaErrorDomain, NSFileWriteFileExistsError, EEXIST},
    {NSCocoaErrorDomain, NSFileWriteOutOfSpaceError, ENOSPC},
    {NSCocoaErrorDomain, NSFileWriteVolumeReadOnlyError, EROFS},
    {NSCocoaErrorDomain, NSUserCancelledError, ECANCELED},
    {NSCocoaErrorDomain, NSFeatureUnsupportedError, EOPNOTSUPP},
    {NSCocoaErrorDomain, NSXPCConnectionInterrupted, ENETDOWN},
    {NSCocoaErrorDomain, NSXPCConnectionInvalid, ENETDOWN},
    {NSCocoaErrorDomain, NSXPCConnectionReplyInvalid, ETIMEDOUT},
    {NSCocoaErrorDomain, kCloudQuota, EDQUOT},
    {NSCocoaErrorDomain, kCloudUnreachable, ENETDOWN},
    {kSyncDomain, 2, EACCES},      // nobody is signed in
    {kSyncDomain, 14, ESTALE},     // no such item
    {kSyncDomain, 33, ENETDOWN},   // shutting down
    {kSyncDomain, 34, ECANCELED},  // cancelled
    {kSyncDomain, 35, EIO},        // a wrong checksum
    {kSyncDomain, 37, EBUSY},      // in use
};

bool isUsable(const NSError &error) {
  return error.domain() == NSPOSIXErrorDomain && error.code() > 0 && error.code() < 4096 &&
         error.code() != ENOENT;
}

}  // namespace

int errnoForError(const NSError &error) {
  if (isUsable(error)) return static_cast<int>(error.code());
  if (error.is(NSPOSIXErrorDomain, ENOENT)) return ESTALE;
  for (const Row &row : kRows)
    if (error.is(row.domain, row.code)) return row.number;
  // What wraps an error of the system's is no more than that.
  const NSError beneath = error.underlyingError();
  return isUsable(beneath) ? static_cast<int>(beneath.code()) : EIO;
}

}  // namespace droxa
