#include "extension/QVReportError.h"

#include "tessaly/QVLog.h"

namespace droxa {

void QVReportError(const char *method, NSError *outPointer, const NSError &error) {
  os_log_error(qvc_default_log(), "[ERROR] %s: %s error: %@", method,
               outPointer ? "(passed to caller)" : "(ignored by caller)", error);
  if (outPointer) *outPointer = error;
}

}  // namespace droxa
