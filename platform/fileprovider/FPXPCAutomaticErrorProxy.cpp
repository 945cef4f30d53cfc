#include "platform/fileprovider/FPXPCAutomaticErrorProxy.h"

#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/oslog/os_log.h"

namespace droxa {

NSError FPSanitizedError(const NSError &error) {
  if (!error) return error;
  for (const char *known : {NSFileProviderErrorDomain, NSCocoaErrorDomain, NSPOSIXErrorDomain})
    if (error.domain() == known) return error;
  return {NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable};
}

void FPLogConnectionFailure(const std::string &name, int requestPid, const NSError &error) {
  static const os_log_t log = os_log_create("com.quorva.FileProvider", "xpc");
  os_log_error(log, "[ERROR] %s failed under a call for process %d: %@", name, requestPid, error);
}

}  // namespace droxa
