#include "extension/QVFileProviderExtension.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {

NSError QVFileProviderExtension::fileProviderErrorFromFSError(const NSError &error) const {
  if (!error.is(NSCocoaErrorDomain, NSFileWriteFileExistsError)) return error;
  const NSURL collidingURL = fp_collidingURL(error);
  if (!collidingURL) return error;
  const auto item = _propertiesForItemAtURL(collidingURL, nullptr);
  return item ? fileProviderErrorForCollisionWithItem(item) : error;
}

}  // namespace droxa
