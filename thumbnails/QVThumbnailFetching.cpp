#include "thumbnails/QVThumbnailFetching.h"

#include <algorithm>
#include <utility>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/NSString+FennickAdditions.h"
#include "additions/QVLogSection.h"
#include "platform/fileprovider/NSFileProviderError.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVDaemonConnection.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa {
namespace {

constexpr double kMaximumContainerThumbnailSide = 120.0;
// What the framework puts the decorations of an application's folder on.
constexpr char kUndecoratedContainerType[] = "com.quorva.fileprovider.qv-undecorated-container";

void Tell(const NSFileProviderThumbnailHandler &handler, const std::string &identifier, const NSData &data,
          const std::optional<std::string> &contentType, const NSError &error) {
  if (handler) handler(identifier, data, contentType, error);
}

void TellNoSuchItem(const NSFileProviderThumbnailHandler &handler, const std::string &identifier) {
  Tell(handler, identifier, {}, std::nullopt, fileProviderErrorForNonExistentItemWithIdentifier(identifier));
}

}  // namespace

QVThumbnailFetching::QVThumbnailFetching(std::shared_ptr<NSFileProviderExtension> extension)
    : extension_(std::move(extension)) {}

std::shared_ptr<NSProgress> QVThumbnailFetching::fetchThumbnailsForItemIdentifiers(
    const std::vector<std::string> &identifiers, CGSize requestedSize,
    NSFileProviderThumbnailHandler perThumbnailCompletionHandlerWithType,
    NSFileProviderErrorCompletion completionHandler) {
  auto progress = NSProgress::progressWithTotalUnitCount(0);
  progress->setCancellable(false);
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┏%llx starting fetch thumbnail for %@", section.tag(),
               identifiers);
  const auto left = answerWhatNeedsNoCloud(identifiers, requestedSize, perThumbnailCompletionHandlerWithType);
  if (left.empty()) {
    os_log_debug(qvc_default_log(), "[DEBUG] no thumbnail left to fetch");
    completionHandler({});
    return progress;
  }
  NSError error;
  const auto recordIDs = resolve(left, &error);
  if (!recordIDs) {
    os_log_error(qvc_default_log(), "[ERROR] can't get the record ids for %@: %@", left, error);
    completionHandler(qv_fileProviderError(error));
    return progress;
  }
  for (const QVFileObjectID &fileObjectID : left) {
    if (recordIDs->contains(fileObjectID)) continue;
    os_log(qvc_default_log(), "[WARNING] Couldn't resolve file objectID %@", fileObjectID);
    TellNoSuchItem(perThumbnailCompletionHandlerWithType, fileObjectID.asString());
  }
  if (recordIDs->empty()) {
    os_log(qvc_default_log(),
           "[WARNING] No thumbnails left to fetch after attempting to resolve content record ids");
    completionHandler({});
    return progress;
  }
  fetch(*recordIDs, progress, std::move(perThumbnailCompletionHandlerWithType), std::move(completionHandler));
  return progress;
}

// Containers, folders, and what nothing is known of; the documents are given back.
std::vector<QVFileObjectID> QVThumbnailFetching::answerWhatNeedsNoCloud(
    const std::vector<std::string> &identifiers, CGSize size, const NSFileProviderThumbnailHandler &handler) {
  std::vector<QVFileObjectID> left;
  std::optional<QVKnownContainers> knownContainers;
  for (const std::string &identifier : identifiers) {
    const NSURL url = extension_->URLForItemWithPersistentIdentifier(identifier);
    if (const auto containerID = qv_containerIDIfIsDocumentsContainerURL(url)) {
      if (!knownContainers) knownContainers = QVContainer::allContainersByContainerID();
      _fetchThumbnailForContainerID(*containerID, identifier, _properSizeForContainerThumbnail(size),
                                    *knownContainers, handler);
      continue;
    }
    const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
    if (!fileObjectID) {
      TellNoSuchItem(handler, identifier);
    } else if (fileObjectID->isFolderOrAliasID()) {
      Tell(handler, identifier, {}, std::nullopt, {});
    } else {
      left.push_back(*fileObjectID);
    }
  }
  return left;
}

CGSize QVThumbnailFetching::_properSizeForContainerThumbnail(CGSize size) {
  if (size.width > kMaximumContainerThumbnailSide) {
    os_log_debug(qvc_default_log(), "[DEBUG] width (%.2f) is greater than max width (%.2f)", size.width,
                 kMaximumContainerThumbnailSide);
    size.width = kMaximumContainerThumbnailSide;
  }
  if (size.height > kMaximumContainerThumbnailSide) {
    os_log_debug(qvc_default_log(), "[DEBUG] height (%.2f) is greater than max height (%.2f)", size.height,
                 kMaximumContainerThumbnailSide);
    size.height = kMaximumContainerThumbnailSide;
  }
  if (size.width < size.height || size.width > size.height) {
    os_log_debug(qvc_default_log(),
                 "[DEBUG] width (%.2f) and height (%.2f) should be equal for container's thumbnail",
                 size.width, size.height);
    size.width = size.height = std::min(size.width, size.height);
  }
  return size;
}

void QVThumbnailFetching::_fetchThumbnailForContainerID(
    const std::string &containerID, const std::string &representedByItemWithIdentifer, CGSize size,
    const QVKnownContainers &knownContainers,
    const NSFileProviderThumbnailHandler &perThumbnailCompletionHandler) {
  const auto known = knownContainers.find(containerID);
  if (known == knownContainers.end()) {
    os_log_error(qvc_default_log(), "[ERROR] can't find container with ID %@", containerID);
    return TellNoSuchItem(perThumbnailCompletionHandler, representedByItemWithIdentifer);
  }
  bool isApplicationIcon = false;
  const NSData data = known->second->bestFittingImageDataForSize(size, &isApplicationIcon);
  if (!data) {
    const std::string sizeText = qv_stringWithSize(size);
    os_log_error(qvc_default_log(), "[ERROR] can't find image with size %@ for %@", sizeText, containerID);
    return Tell(perThumbnailCompletionHandler, representedByItemWithIdentifer, {}, std::nullopt,
                qv_fileProviderError(qvc_errorInvalidParameter("size", sizeText)));
  }
  Tell(perThumbnailCompletionHandler, representedByItemWithIdentifer, data,
       isApplicationIcon ? std::optional<std::string>(kUndecoratedContainerType) : std::nullopt, {});
}

// Waits for the daemon. nullopt: it couldn't be asked, or failed.
std::optional<QVResolvedRecordIDs> QVThumbnailFetching::resolve(
    const std::vector<QVFileObjectID> &fileObjectIDs, NSError *error) const {
  using Result = std::optional<QVResolvedRecordIDs>;
  const std::unique_ptr<QVSyncProxy> proxy = QVDaemonConnection::defaultConnection()->newSyncProxy();
  (*proxy)->resolveFileObjectIDsToContentRecordIDs(
      fileObjectIDs, [&proxy](const QVResolvedRecordIDs &recordIDs, const NSError &failure) {
        proxy->setObjResult(failure ? Result() : Result(recordIDs), failure);
      });
  *error = proxy->error();
  return proxy->result<Result>();
}

}  // namespace droxa
