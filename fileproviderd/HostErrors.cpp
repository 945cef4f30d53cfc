#include "fileproviderd/HostErrors.h"

#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/fileprovider/NSFileProviderItem.h"

namespace droxa {

NSError unreachableError(const std::string &description) {
  return NSError(NSFileProviderErrorDomain, NSFileProviderErrorServerUnreachable,
                 {{NSLocalizedDescriptionKey, description}});
}

NSError rootIsUnknown() {
  return unreachableError("keld has not told where the drive's root is");
}

NSError explainedError(const std::string &identifier, const NSError &error) {
  const bool isRootMissing = identifier == NSFileProviderRootContainerItemIdentifier &&
                             error.is(NSFileProviderErrorDomain, NSFileProviderErrorNoSuchItem);
  return isRootMissing ? rootIsUnknown() : error;
}

}  // namespace droxa
