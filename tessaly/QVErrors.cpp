#include "tessaly/QVErrors.h"

#include <utility>

#include "platform/cloudkit/CKError.h"

namespace droxa {

NSError qvc_error(std::int64_t code, std::string description) {
  return NSError(QVTessalyErrorDomain, code, {{NSLocalizedDescriptionKey, std::move(description)}});
}

NSError qvc_errorLoggedOut() {
  return qvc_error(QVErrorLoggedOut, "nobody is signed in");
}

NSError qvc_errorInvalidParameter(const std::string &parameter, const std::optional<std::string> &value) {
  return qvc_error(QVErrorInvalidArgument,
                   NSStringWithFormat("invalid parameter \"%@\": %@", parameter, value));
}

NSError qvc_errorNoSuchItem(const std::string &asked) {
  return qvc_error(QVErrorNoSuchItem, "there is no item " + asked);
}

NSError qv_errorWithPOSIXCode(int code, std::string description) {
  if (description.empty() && code == QVPOSIXErrorNotSupported) description = "operation not supported";
  return NSError::errorWithPOSIXCode(code, std::move(description));
}

bool qv_isTessalyErrorCode(const NSError &error, std::int64_t code) {
  return error.is(QVTessalyErrorDomain, code);
}

bool qvc_isCloudKitUnknownItemError(const NSError &error) {
  return error.is(CKErrorDomain, static_cast<std::int64_t>(CKErrorCode::unknownItem));
}

bool qvc_checkErrorsFromCloudKit(const NSError &error,
                                 const std::function<bool(const NSError &error)> &test) {
  for (NSError one = error; one; one = one.underlyingError())
    if (test(one)) return true;
  return false;
}

}  // namespace droxa
