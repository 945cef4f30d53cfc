#include "keld/sync/CloudErrors.h"

#include "platform/cloudkit/CKError.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

NSError ErrorForClients(const NSError &error, const std::string &path) {
  if (!error) return error;
  const std::string text = (path.empty() ? "" : path + ": ") + error.localizedDescription();
  const auto made = [&](const char *domain, std::int64_t code) {
    return NSError(domain, code, {{NSLocalizedDescriptionKey, text}, {NSUnderlyingErrorKey, error}});
  };
  if (CKErrorIs(error, CKErrorCode::quotaExceeded))
    return made(NSCocoaErrorDomain, NSUbiquitousFileNotUploadedDueToQuotaError);
  if (CKErrorIs(error, CKErrorCode::operationCancelled)) return made(QVTessalyErrorDomain, QVErrorCancelled);
  if (CKErrorIs(error, CKErrorCode::notAuthenticated)) return made(QVTessalyErrorDomain, QVErrorLoggedOut);
  if (CKErrorIs(error, CKErrorCode::assetNotAvailable) || CKErrorIs(error, CKErrorCode::unknownItem))
    return made(QVTessalyErrorDomain, QVErrorChecksumMismatch);
  if (error.domain() == CKErrorDomain)
    return made(NSCocoaErrorDomain, NSUbiquitousFileUbiquityServerNotAvailable);
  return made(error.domain().c_str(), error.code());
}

}  // namespace droxa::keld
