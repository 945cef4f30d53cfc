// Making contents available before somebody reads them, and letting go of them.

#include <algorithm>
#include <utility>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "extension/QVFileProviderExtension.h"
#include "platform/foundation/NSFileManager.h"
#include "platform/foundation/NSURLResources.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVFileCoordinatorReadingOptions.h"
#include "tessaly/QVFileObjectID.h"
#include "tessaly/QVFileProvidingOperation.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVMoveCapability.h"

namespace droxa {
namespace {

bool IsFolderButNoPackage(const NSURL &url) {
  bool isDirectory = false;
  bool isPackage = false;
  getResourceValue(url, &isDirectory, NSURLIsDirectoryKey, nullptr);
  getResourceValue(url, &isPackage, NSURLIsPackageKey, nullptr);
  return isDirectory && !isPackage;
}

bool NeedsDownload(const NSURL &url, std::uint64_t options) {
  if (qv_isPromiseURL(url)) {
    os_log_error(qvc_default_log(),
                 "[ERROR] Someone tries to coordinate at the side fault URL '%@', odd, but allow it", url);
    return true;
  }
  if (options & QVFileCoordinatorReadingForcedDownload) return true;
  return !checkResourceIsReachableAndReturnError(url, nullptr) || IsFolderButNoPackage(url);
}

}  // namespace

void QVFileProviderExtension::startProvidingItemAtURL(const NSURL &url,
                                                      NSFileProviderErrorCompletion completion) {
  startProvidingItemAtURL(url, 0, std::move(completion));
}

void QVFileProviderExtension::startProvidingItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                                      NSFileProviderErrorCompletion completion) {
  if (!qv_isInSyncedLocation(url)) return completion({});
  const std::uint64_t section = QVLogSectionCreate(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┣%llx start providing %@ (readingOptions: %@)", section,
               url.path(), QVFileCoordinatorReadingOptionsPrettyPrint(readingOptions));
  if (NeedsDownload(url, readingOptions)) {
    return downloadItemAtURL(url, readingOptions, section, std::move(completion));
  }
  // The section stays open here, deliberately.
  os_log_debug(qvc_default_log(), "[DEBUG] url exists, granting the read");
  completion({});
}

void QVFileProviderExtension::downloadItemAtURL(const NSURL &url, std::uint64_t readingOptions,
                                                std::uint64_t section,
                                                NSFileProviderErrorCompletion completion) {
  const std::string &path = url.path();
  const auto operation = QVFileProvidingOperation::initWithURL(url, readingOptions);
  operation->setFileProvidingCompletion(
      [extension = self(), path, section, completion = std::move(completion)](const NSError &error) {
        extension->downloadEnded(path, section, error, completion);
      });
  {
    const RecursiveLock lock(_lock);
    auto &stored = _downloadOperationByPath[path];
    if (stored)
      os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: _downloadOperationByPath[path] == nil");
    stored = operation;
  }
  _operationQueue->addOperation(operation);
}

void QVFileProviderExtension::downloadEnded(const std::string &path, std::uint64_t section,
                                            const NSError &error,
                                            const NSFileProviderErrorCompletion &completion) {
  os_log_debug(qvc_default_log(), "[DEBUG] ┳%llx item providing completion; %@", section, error);
  std::shared_ptr<NSOperation> removed;
  {
    const RecursiveLock lock(_lock);
    const auto found = _downloadOperationByPath.find(path);
    if (found == _downloadOperationByPath.end()) {
      os_log_fault(qvc_default_log(), "[CRIT] Assertion failed: self->_downloadOperationByPath[path]");
    } else {
      removed = std::move(found->second);
      _downloadOperationByPath.erase(found);
    }
  }
  completion(qv_fileProviderError(error));
  QVLogSectionEnd(section);
}

std::shared_ptr<NSOperation> QVFileProviderExtension::downloadAtPath(const std::string &path) {
  const RecursiveLock lock(_lock);
  const auto found = _downloadOperationByPath.find(path);
  return found == _downloadOperationByPath.end() ? nullptr : found->second;
}

void QVFileProviderExtension::stopProvidingItemAtURL(const NSURL &url) {
  const std::string &path = url.path();
  os_log_debug(qvc_default_log(), "[DEBUG] stop providing %@", path);
  if (isDownloadForced(url)) return;
  // Its completion removes the entry and tells the framework.
  if (const auto operation = downloadAtPath(path)) return operation->cancel();
  NSError error;
  if (!NSFileManager::defaultManager()->evictUbiquitousItemAtURL(url, &error)) {
    // The error it is that stands where the text says "url".
    os_log_error(qvc_default_log(), "[ERROR] can't evict item at url: %@", error);
  }
}

std::pair<std::int64_t, std::int64_t> QVFileProviderExtension::progressOfProvidingItemAtURL(
    const NSURL &url) {
  const auto download = std::dynamic_pointer_cast<QVFileProvidingOperation>(downloadAtPath(url.path()));
  if (!download) return {0, -1};
  const QVFileProvidingOperation::Progress progress = download->progress();
  return {static_cast<std::int64_t>(progress.completedBytes),
          progress.totalBytes == 0 ? -1 : static_cast<std::int64_t>(progress.totalBytes)};
}

void QVFileProviderExtension::cancelProvidingItemAtURL(const NSURL &url) {
  if (!downloadAtPath(url.path()) || isDownloadForced(url)) return;
  if (const auto operation = downloadAtPath(url.path())) operation->cancel();
}

// Whether a move under way needs the contents at `url`. The list stays locked while the daemon is asked, so
// that what is forced can't change in between.
bool QVFileProviderExtension::isDownloadForced(const NSURL &url) {
  const Lock lock(_itemsForcedDownloadLock);
  for (const std::string &identifier : _itemsForcedDownload) {
    const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
    const NSURL forced = URLForItemWithPersistentIdentifier(identifier);
    if (fileObjectID && fileObjectID->isFolderOrAliasID() && qv_isParentOfURL(forced, url)) {
      os_log(qvc_default_log(),
             "[WARNING] Can't cancel download of %@ which is inside a folder downloading for CZM",
             url.path());
      return true;
    }
    if (fileObjectID && fileObjectID->isDocumentID() && forced && forced.path() == url.path()) {
      os_log(qvc_default_log(), "[WARNING] Can't cancel download of %@ which is downloading for CZM",
             url.path());
      return true;
    }
  }
  return false;
}

void QVFileProviderExtension::_beginForcedDownload(const std::string &identifier) {
  const Lock lock(_itemsForcedDownloadLock);
  _itemsForcedDownload.push_back(identifier);
}

void QVFileProviderExtension::_endForcedDownload(const std::string &identifier) {
  const Lock lock(_itemsForcedDownloadLock);
  const auto found = std::find(_itemsForcedDownload.begin(), _itemsForcedDownload.end(), identifier);
  if (found != _itemsForcedDownload.end()) _itemsForcedDownload.erase(found);
}

void QVFileProviderExtension::itemChangedAtURL(const NSURL &url) {
  os_log_debug(qvc_default_log(), "[DEBUG] Item changed at URL %@", url);
}

// No placeholder is written: the daemon's own stand where the documents do.
void QVFileProviderExtension::providePlaceholderAtURL(const NSURL & /*url*/,
                                                      NSFileProviderErrorCompletion completion) {
  if (completion) completion({});
}

void QVFileProviderExtension::movingItemAtURL_requiresProvidingWithDestinationURL(
    const NSURL &url, const NSURL &destination, NSFileProviderMovingCompletion completion) {
  NSError error;
  const auto capabilities = static_cast<std::uint32_t>(qv_capabilityToMoveToURL(url, destination, &error));
  if (capabilities & QVMoveNeedsContents) return completion(true, {});
  completion(false, error);
}

}  // namespace droxa
