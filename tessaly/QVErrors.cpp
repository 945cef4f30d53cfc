#include "tessaly/QVErrors.h"

#include <utility>

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

}  // namespace droxa
