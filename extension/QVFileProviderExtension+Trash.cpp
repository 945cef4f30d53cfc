// Moving an item to the trash, bringing it back, and deleting it for good.

#include <utility>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSURLResources.h"
#include "tessaly/QVItemActions.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {
namespace {

// Where an item was before it was trashed, as long as that folder is still there; otherwise the documents
// folder of the container that it is in. nil when there is neither.
NSURL FolderToPutBackInto(const NSURL &url) {
  const NSURL putBack = qv_putBackURLForTrashedItemAtURL(NSFileManager::defaultManager(), url, nullptr);
  os_log_debug(qvc_default_log(), "[DEBUG] untrash with putback url: %@", putBack);
  const NSURL folder = putBack ? putBack.URLByDeletingLastPathComponent() : NSURL();
  if (folder && checkResourceIsReachableAndReturnError(folder, nullptr)) return folder;

  os_log_debug(qvc_default_log(), "[DEBUG] couldn't use putback url, fallback to default container");
  const auto container = qv_tessalyContainer(url);
  return container ? container->documentsURL() : NSURL();
}

}  // namespace

// Errors are passed on as they stand, deliberately.
void QVFileProviderExtension::trashItemWithIdentifier(const std::string &identifier,
                                                      NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx trashing item %@", section.tag(), identifier);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, false, true);
  if (!url) return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));

  NSURL urlToTrash;
  NSError error;
  fp_coordinatedDeleteWithHandler(url, [&](const NSURL &coordinatedURL, const NSError &coordinationError) {
    if (coordinationError) {
      os_log_debug(qvc_default_log(), "[DEBUG] failed to coordinate the deletion: %@", coordinationError);
      error = coordinationError;
    } else {
      urlToTrash = coordinatedURL;
    }
  });
  if (error) return completion(nullptr, error);

  os_log_debug(qvc_default_log(), "[DEBUG] trashing %@", fp_obfuscatedPath(urlToTrash.path()));
  NSURL resultingURL;
  qv_trashItemAtURL(NSFileManager::defaultManager(), urlToTrash, &resultingURL, &error);
  std::shared_ptr<const QVQueryItem> item;
  if (resultingURL && !error) item = _propertiesForNewItemAtURL(resultingURL, &error);
  completion(item, error);
}

void QVFileProviderExtension::untrashItemWithIdentifier(const std::string &identifier,
                                                        const std::optional<std::string> &parentIdentifier,
                                                        NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx untrashing item %@", section.tag(), identifier);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, false, true);
  if (!url) return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  os_log_debug(qvc_default_log(), "[DEBUG] untrashing from url: %@", url);

  NSURL folder = parentIdentifier ? URLForItemWithPersistentIdentifier(*parentIdentifier) : NSURL();
  if (!folder) folder = FolderToPutBackInto(url);
  if (!folder) {
    // It is the destination that is named, deliberately, also where none was given.
    return completion(nullptr,
                      fileProviderErrorForNonExistentItemWithIdentifier(parentIdentifier.value_or("")));
  }
  os_log_debug(qvc_default_log(), "[DEBUG] untrashing item to %@", folder);
  constexpr bool allowBouncing = true;
  fp_reparentUnderFolder_allowBouncing(url, folder, allowBouncing,
                                       [extension = self(), folder, completion = std::move(completion)](
                                           const NSURL &newURL, const NSError &error) {
                                         extension->itemWasUntrashed(folder, newURL, error, completion);
                                       });
}

void QVFileProviderExtension::itemWasUntrashed(const NSURL &folder, const NSURL &newURL, const NSError &error,
                                               const NSFileProviderItemCompletion &completion) const {
  if (error) {
    os_log_error(qvc_default_log(), "[ERROR] error untrashing item to %@: %@", folder, error);
  } else {
    os_log_debug(qvc_default_log(), "[DEBUG] item was untrashed to %@", newURL);
  }
  if (const NSError translated = fileProviderErrorFromFSError(error)) {
    return completion(nullptr, qv_fileProviderError(translated));
  }
  completeWithNewItem(newURL, completion);
}

void QVFileProviderExtension::deleteItemWithIdentifier(const std::string &identifier,
                                                       NSFileProviderErrorCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx deleting item %@", section.tag(), identifier);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, false, true);
  if (!url) return completion(fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  fp_deleteWithCompletionHandler(url, [url, completion = std::move(completion)](const NSError &error) {
    if (!error.is(NSCocoaErrorDomain, NSFileNoSuchFileError)) return completion(qv_fileProviderError(error));
    const NSURL physicalURL = qv_physicalURL(url);
    os_log_debug(qvc_default_log(), "[DEBUG] couldn't delete %@, retrying with physical url %@", url,
                 physicalURL);
    fp_deleteWithCompletionHandler(
        physicalURL, [completion](const NSError &second) { completion(qv_fileProviderError(second)); });
  });
}

// For callers that hold the coordination already.
void QVFileProviderExtension::_trashItemAtURLWithoutCoordination(const NSURL &url,
                                                                 FPURLCompletion completion) const {
  os_log_debug(qvc_default_log(), "[DEBUG] trashing %@", url);
  NSURL resultingURL;
  NSError error;
  qv_trashItemAtURL(NSFileManager::defaultManager(), url, &resultingURL, &error);
  completion(resultingURL, error);
}

}  // namespace droxa
