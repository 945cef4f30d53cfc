#pragma once

#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "platform/cloudkit/CKContainer.h"
#include "platform/fileprovider/NSFileProviderExtension.h"
#include "platform/foundation/CGSize.h"
#include "platform/foundation/NSProgress.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVFileObjectID.h"
#include "thumbnails/QVThumbnailOperations.h"

namespace droxa {

using QVKnownContainers = std::map<std::string, std::shared_ptr<const QVContainer>>;
using QVResolvedRecordIDs = std::map<QVFileObjectID, CKRecordID>;

// Fetches the thumbnails of items for the extension: the icons of containers from what is installed, those of
// documents from the cloud, zone by zone in batches of which one is under way at a time. What every item is
// answered, and when, is told where the extension declares it (NSFileProviderExtension.h).
// Thread contract: any thread. The items are looked up, and the batches made, on the caller's thread, which
// waits for the daemon; the rest runs on the threads of the cloud's operations, under the caller's persona.
class QVThumbnailFetching final : public std::enable_shared_from_this<QVThumbnailFetching> {
 public:
  // What is asked about the items: the extension itself.
  explicit QVThumbnailFetching(std::shared_ptr<NSFileProviderExtension> extension);

  // The handler may be empty; the completion may not.
  std::shared_ptr<NSProgress> fetchThumbnailsForItemIdentifiers(
      const std::vector<std::string> &identifiers, CGSize requestedSize,
      NSFileProviderThumbnailHandler perThumbnailCompletionHandlerWithType,
      NSFileProviderErrorCompletion completionHandler);

  // A square of at most 120 x 120: the size to ask of a container.
  static CGSize _properSizeForContainerThumbnail(CGSize size);
  static void _fetchThumbnailForContainerID(
      const std::string &containerID, const std::string &representedByItemWithIdentifer, CGSize size,
      const QVKnownContainers &knownContainers,
      const NSFileProviderThumbnailHandler &perThumbnailCompletionHandler);
  // Hands all of them to the block, as many at a time as one operation may fetch.
  static void batchRecordIDsToFetchThumbnails(
      std::vector<CKRecordID> recordIDs,
      const std::function<void(std::vector<CKRecordID> batch)> &perBatchExecutionBlock);
  // Runs the first operation, and when it has ended the next. The completion gets the error of the last batch
  // that failed, or `previousError`.
  static void launchNewFetchThumbnailOperationFrom(const std::shared_ptr<QVThumbnailOperations> &operations,
                                                   const std::shared_ptr<CKContainer> &inContainer,
                                                   const NSError &previousError,
                                                   const NSFileProviderErrorCompletion &completionHandler);

 private:
  struct Request;

  std::vector<QVFileObjectID> answerWhatNeedsNoCloud(const std::vector<std::string> &identifiers, CGSize size,
                                                     const NSFileProviderThumbnailHandler &handler);
  std::optional<QVResolvedRecordIDs> resolve(const std::vector<QVFileObjectID> &fileObjectIDs,
                                             NSError *error) const;
  void fetch(const QVResolvedRecordIDs &recordIDs, const std::shared_ptr<NSProgress> &progress,
             NSFileProviderThumbnailHandler handler, NSFileProviderErrorCompletion completion);
  std::shared_ptr<CKFetchRecordsOperation> makeOperation(const std::shared_ptr<const Request> &request,
                                                         std::vector<CKRecordID> batch);
  void recordWasFetched(const Request &request, const CKRecordResult &result);
  void downloadIfThumbnailCanBeMadeHere(const std::string &identifier, std::int64_t size);

  const std::shared_ptr<NSFileProviderExtension> extension_;
};

}  // namespace droxa
