// Putting something new into the drive: a document from elsewhere, and an empty folder.

#include <utility>

#include "additions/QVLogSection.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {

void QVFileProviderExtension::importDocumentAtURL(const NSURL &url, const std::string &parentItemIdentifier,
                                                  NSFileProviderItemCompletion completion) {
  const NSURL parent = URLForItemWithPersistentIdentifier(parentItemIdentifier);
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx importing document at %@ to %@", section.tag(), url, parent);
  if (!parent) {
    return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(parentItemIdentifier));
  }
  fp_importUnderFolder(
      url, parent,
      [extension = self(), completion = std::move(completion)](const NSURL &newURL, const NSError &error) {
        extension->documentWasImported(newURL, error, completion);
      });
}

// Why the new document can't be described is only logged: the import itself was done.
void QVFileProviderExtension::documentWasImported(const NSURL &newURL, const NSError &error,
                                                  const NSFileProviderItemCompletion &completion) const {
  os_log_debug(qvc_default_log(), "[DEBUG] got new URL %@; %@", newURL, error);
  if (const NSError translated = fileProviderErrorFromFSError(error)) return completion(nullptr, translated);
  NSError lookupError;
  const auto item = _propertiesForNewItemAtURL(newURL, &lookupError);
  if (!item) {
    os_log_debug(qvc_default_log(), "[DEBUG] couldn't find item after importing it: %@", lookupError);
  }
  completion(item, {});
}

void QVFileProviderExtension::createDirectoryWithName(const std::string &name,
                                                      const std::string &parentItemIdentifier,
                                                      NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx creating directory %@ under %@", section.tag(), name,
               parentItemIdentifier);
  const NSURL parent = URLForItemWithPersistentIdentifier(parentItemIdentifier);
  if (!parent) {
    return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(parentItemIdentifier));
  }
  fp_createSubFolder(
      parent, name,
      [extension = self(), completion = std::move(completion)](const NSURL &newURL, const NSError &error) {
        os_log_debug(qvc_default_log(), "[DEBUG] got new URL %@; %@", newURL, error);
        if (const NSError translated = extension->fileProviderErrorFromFSError(error)) {
          return completion(nullptr, translated);
        }
        extension->completeWithNewItem(newURL, completion);
      });
}

}  // namespace droxa
