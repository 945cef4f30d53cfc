// Changing an item's name or place.

#include <cerrno>
#include <memory>
#include <utility>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "extension/QVDownloadProgress.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/fileprovider/FPURLOperations.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "platform/foundation/NSProgress.h"
#include "tessaly/QVFileCoordinatorReadingOptions.h"
#include "tessaly/QVFileProvidingOperation.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVMoveCapability.h"
#include "tessaly/QVQueryItem.h"

namespace droxa {
namespace {

NSError InvalidMoveError() {
  return NSError(NSCocoaErrorDomain, NSFileWriteUnknownError,
                 NSUserInfo{{NSUnderlyingErrorKey,
                             qv_errorWithPOSIXCode(EACCES, "The move between those locations is invalid")}});
}

}  // namespace

void QVFileProviderExtension::renameItemWithIdentifier(const std::string &identifier, const std::string &name,
                                                       NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx renaming %@ to %@", section.tag(), identifier, name);
  const NSURL url = _URLForItemWithPersistentIdentifier(identifier, true, true);
  os_log_debug(qvc_default_log(), "[DEBUG] source URL: %@", url);
  if (!url) return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  fp_renameWithNewName(
      url, name,
      [extension = self(), completion = std::move(completion)](const NSURL &newURL, const NSError &error) {
        os_log_debug(qvc_default_log(), "[DEBUG] got new URL %@; %@", newURL, error);
        if (const NSError translated = extension->fileProviderErrorFromFSError(error)) {
          return completion(nullptr, qv_fileProviderError(translated));
        }
        extension->completeWithNewItem(newURL, completion);
      });
}

// A move on its way. Thread contract: immutable but for `error`, which one thread at a time uses: the
// caller's, then that of the operation.
struct QVFileProviderExtension::Move {
  std::string identifier;
  NSURL source;
  NSURL folder;
  std::optional<std::string> newName;
  NSFileProviderItemCompletion completion;
  NSError error;  // of the capability, then of the lookup
  const std::shared_ptr<NSProgress> progress = NSProgress::currentProgress();
};

void QVFileProviderExtension::reparentItemWithIdentifier(const std::string &identifier,
                                                         const std::string &parentIdentifier,
                                                         const std::optional<std::string> &newName,
                                                         NSFileProviderItemCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx reparenting %@ under %@", section.tag(), identifier,
               parentIdentifier);
  const NSURL source = _URLForItemWithPersistentIdentifier(identifier, false, true);
  if (!source) return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
  const NSURL folder = URLForItemWithPersistentIdentifier(parentIdentifier);
  if (!folder) {
    return completion(nullptr, fileProviderErrorForNonExistentItemWithIdentifier(parentIdentifier));
  }
  os_log_debug(qvc_default_log(), "[DEBUG] reparenting url %@ under %@", source, folder);

  const auto move =
      std::make_shared<Move>(Move{identifier, source, folder, newName, std::move(completion), {}});
  // The place that is asked about has the name of now, also when there is a new one.
  const NSURL destination = folder.URLByAppendingPathComponent(source.lastPathComponent());
  const std::uint64_t capability = qv_capabilityToMoveToURL(source, destination, &move->error);
  if (!(capability & QVMoveAllowed)) {
    if (!move->error) move->error = InvalidMoveError();
    os_log_error(qvc_default_log(), "[ERROR] can't move %@ to %@; %@", source, folder, move->error);
    return move->completion(nullptr, qv_fileProviderError(move->error));
  }
  if (capability & QVMoveNeedsContents) return moveAfterDownload(move);
  performMove(move);
}

void QVFileProviderExtension::performMove(const std::shared_ptr<Move> &move) {
  const NSCurrentProgress current(move->progress);
  fp_reparentUnderFolder_withNewName(
      move->source, move->folder, move->newName,
      [extension = self(), move](const NSURL &newURL, const NSError &error) {
        os_log_debug(qvc_default_log(), "[DEBUG] got new URL %@; %@", newURL, error);
        if (const NSError translated = extension->fileProviderErrorFromFSError(error)) {
          return move->completion(nullptr, qv_fileProviderError(translated));
        }
        const auto item = extension->_propertiesForNewItemAtURL(newURL, &move->error);
        move->completion(item, move->error);
      });
}

// The queue is the move's own, and lives until the completion has run.
void QVFileProviderExtension::moveAfterDownload(const std::shared_ptr<Move> &move) {
  os_log_debug(qvc_default_log(),
               "[DEBUG] Taking coordinated read on source url %@ because it needs downloading",
               move->source.path());
  const auto operation =
      QVFileProvidingOperation::initWithURL(move->source, QVFileCoordinatorReadingForcedDownload);
  const auto queue = std::make_shared<NSOperationQueue>();
  _beginForcedDownload(move->identifier);
  operation->setFileProvidingCompletion([extension = self(), move, queue](const NSError &error) {
    os_log_debug(qvc_default_log(), "[DEBUG] Finished providing %@ with error %@", move->source, error);
    if (error) {
      // As it stands, deliberately.
      move->completion(nullptr, error);
    } else {
      extension->performMove(move);
    }
    extension->_endForcedDownload(move->identifier);
  });
  QVDownloadReportsToProgress(operation, move->progress);
  queue->addOperation(operation);
}

}  // namespace droxa
