#include "cli/ExitStatus.h"

#include <cerrno>
#include <sysexits.h>

#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/xpc/NSXPCConnection.h"
#include "tessaly/QVErrors.h"

namespace droxa {

namespace {

bool isProviderError(const NSError &error, std::int64_t code) {
  return error.is(NSFileProviderErrorDomain, code);
}

bool isTransportError(const NSError &error) {
  return error.is(NSCocoaErrorDomain, NSXPCConnectionInterrupted) ||
         error.is(NSCocoaErrorDomain, NSXPCConnectionInvalid);
}

}  // namespace

int exitStatusForError(const NSError &error) {
  if (isProviderError(error, NSFileProviderErrorNoSuchItem) ||
      error.is(QVTessalyErrorDomain, QVErrorNoSuchItem))
    return EX_NOINPUT;
  if (isProviderError(error, NSFileProviderErrorNotAuthenticated) ||
      error.is(QVTessalyErrorDomain, QVErrorLoggedOut) || error.is(QVTessalyErrorDomain, QVErrorUnreadable) ||
      error.is(NSPOSIXErrorDomain, EACCES))
    return EX_NOPERM;
  if (isProviderError(error, NSFileProviderErrorServerUnreachable) || isTransportError(error) ||
      error.is(QVTessalyErrorDomain, QVErrorShuttingDown))
    return EX_UNAVAILABLE;
  if (error.is(NSCocoaErrorDomain, NSXPCConnectionReplyInvalid)) return EX_TEMPFAIL;
  return kExitFailure;
}

std::string explanationOfError(const NSError &error) {
  switch (exitStatusForError(error)) {
    case EX_NOINPUT:
      return "there is no such item; `droxa ls` shows what there is";
    case EX_NOPERM:
      if (error.is(QVTessalyErrorDomain, QVErrorUnreadable) || error.is(NSPOSIXErrorDomain, EACCES))
        return "it can't be read: " + error.localizedDescription();
      return "nobody is signed in; `droxa account sign-in NAME` signs somebody in";
    case EX_UNAVAILABLE:
      return error.localizedDescription() + "; `droxa status` shows what runs, `droxa run` starts it";
    case EX_TEMPFAIL:
      return "no answer in time; `droxa status` shows what runs, --timeout waits longer";
    default:
      return error.localizedDescription();
  }
}

}  // namespace droxa
