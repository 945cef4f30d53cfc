#include <map>

#include "additions/NSError+QVFPAdditions.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVErrors.h"

namespace droxa {
namespace {

using CodeTable = std::map<long, long>;

// Codes of the source domains, each with the NSFileProviderErrorDomain code that stands for it.
struct ErrorTables {
  CodeTable foundation;  // of NSCocoaErrorDomain
  CodeTable tessaly;     // of QVTessalyErrorDomain
};

constexpr long NSUbiquitousFileNotUploadedDueToQuotaError = 4354;
constexpr long NSUbiquitousFileUbiquityServerNotAvailable = 4355;

// Built together by whoever asks first, on any thread, and kept for the life of the process.
const ErrorTables &Tables() {
  static const ErrorTables &tables =
      *new ErrorTables{{{NSUbiquitousFileNotUploadedDueToQuotaError, NSFileProviderErrorInsufficientQuota},
                        {NSUbiquitousFileUbiquityServerNotAvailable, NSFileProviderErrorServerUnreachable}},
                       // 16 and 17 have no public name. They are positive among negative ones deliberately:
                       // the framework knows them by these numbers.
                       {{QVErrorLoggedOut, NSFileProviderErrorNotAuthenticated},
                        {QVErrorNoSuchItem, NSFileProviderErrorNoSuchItem},
                        {60, 16},
                        {59, 17}}};
  return tables;
}

const CodeTable *TableOfDomain(const std::string &domain) {
  const ErrorTables &tables = Tables();
  if (domain == NSCocoaErrorDomain) return &tables.foundation;
  if (domain == QVTessalyErrorDomain) return &tables.tessaly;
  return nullptr;
}

}  // namespace

bool _qv_getFileProviderDomainErrorCode(const NSError &error, long *code) {
  if (!error) return false;
  const CodeTable *table = TableOfDomain(error.domain());
  if (table == nullptr) return false;
  const auto found = table->find(static_cast<long>(error.code()));
  if (found == table->end()) return false;
  *code = found->second;
  return true;
}

NSError qv_fileProviderError(const NSError &error) {
  long code = 0;
  if (!_qv_getFileProviderDomainErrorCode(error, &code)) return error;
  return NSError(NSFileProviderErrorDomain, code, NSUserInfo{{NSUnderlyingErrorKey, error}});
}

NSError qv_errorWithPOSIXCode(int code, const std::string &description) {
  return NSError::errorWithPOSIXCode(code, description);
}

}  // namespace droxa
