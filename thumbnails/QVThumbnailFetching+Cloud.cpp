// The documents' part of a request: their records' thumbnails, batch after batch.

#include <future>
#include <utility>

#include "additions/NSError+QVFPAdditions.h"
#include "additions/QVLogSection.h"
#include "additions/QVPersonaAdoption.h"
#include "platform/foundation/ReadFile.h"
#include "platform/quicklook/QLThumbnailStoreRetrievalOperation.h"
#include "tessaly/CKOperationGroup+Tessaly.h"
#include "tessaly/QVCUserDefaults.h"
#include "tessaly/QVContents.h"
#include "tessaly/QVLog.h"
#include "tessaly/QVPersona.h"
#include "tessaly/QVRecordKeys.h"
#include "tessaly/QVStartDownload.h"
#include "tessaly/QVUbiquitousCloudKitContainer.h"
#include "thumbnails/QVThumbnailFetching.h"

namespace droxa {
namespace {

// Far more than a picture of 1024 x 1024 pixels needs; what is larger isn't one.
constexpr std::uint64_t kLargestThumbnail = 16U << 20;

std::optional<std::string> CallersPersona() {
  if (!qvc_block_remember_persona) return std::nullopt;
  bool isDataSeparated = false;
  return qv_currentPersonaIDWithIsDataSeparated(&isDataSeparated);
}

// Where personas are in force, a thread's is made the caller's; where that fails the work is done all the
// same, since its answers are owed.
class UnderPersona {
 public:
  explicit UnderPersona(const std::optional<std::string> &persona) {
    if (qvc_block_remember_persona) adoption_.emplace(persona);
  }

 private:
  std::optional<QVPersonaAdoption> adoption_;
};

std::vector<std::string> Lines(const QVResolvedRecordIDs &recordIDs) {
  std::vector<std::string> lines;
  lines.reserve(recordIDs.size());
  for (const auto &[fileObjectID, recordID] : recordIDs)
    lines.push_back(fileObjectID.asString() + " = " + recordID.description());
  return lines;
}

std::string Description(const CKFetchRecordsOperation &operation) {
  return "<CKFetchRecordsOperation " + operation.operationID.description() + ", " +
         std::to_string(operation.recordIDs.size()) + " records>";
}

NSData ThumbnailOf(const CKRecord &record) {
  const CKAsset *asset = record.get<CKAsset>(kQVRecordKeyThumbnail1024x1024);
  const NSURL url = asset ? asset->fileURL() : NSURL();
  if (!url) return {};
  const FileContents contents = ReadFile(url.path(), kLargestThumbnail);
  return contents.code == 0 ? NSData::dataWithString(contents.bytes) : NSData();
}

std::int64_t SizeOf(const CKRecord &record) {
  const auto *size = record.get<std::int64_t>(kQVRecordKeySize);
  return size ? *size : 0;
}

}  // namespace

// What the callbacks of the operations share. Constant once the first operation is launched.
struct QVThumbnailFetching::Request {
  std::uint64_t section = 0;
  std::map<CKRecordZoneID, std::map<CKRecordID, std::string>> identifiers;
  CKOperationGroup group;
  NSFileProviderThumbnailHandler handler;
  std::optional<std::string> persona;

  std::string identifierOf(const CKRecordID &recordID) const {
    const auto zone = identifiers.find(recordID.zoneID);
    if (zone == identifiers.end()) return {};
    const auto found = zone->second.find(recordID);
    return found == zone->second.end() ? "" : found->second;
  }
};

void QVThumbnailFetching::fetch(const QVResolvedRecordIDs &recordIDs,
                                const std::shared_ptr<NSProgress> &progress,
                                NSFileProviderThumbnailHandler handler,
                                NSFileProviderErrorCompletion completion) {
  const QVLogSection section(false);
  os_log_debug(qvc_default_log(), "[DEBUG] ┣%llx fetching the thumbnails for: %@", section.tag(),
               Lines(recordIDs));
  const auto request = std::make_shared<Request>();
  request->section = section.tag();
  request->group = qv_downloadThumbnailsUserInitiated();
  request->handler = std::move(handler);
  request->persona = CallersPersona();
  for (const auto &[fileObjectID, recordID] : recordIDs)
    request->identifiers[recordID.zoneID][recordID] = fileObjectID.asString();

  NSError error;
  const auto container =
      CKContainer::containerWithIdentifier(QVUbiquitousCloudKitContainerIdentifier, &error);
  if (!container) {
    os_log_error(qvc_default_log(), "[ERROR] can't reach the cloud's container: %@", error);
    return completion(qv_fileProviderError(error));
  }
  container->setSourceApplicationBundleIdentifier(QVDaemonBundleID);

  const auto operations = std::make_shared<QVThumbnailOperations>();
  for (const auto &[zone, identifiers] : request->identifiers) {
    std::vector<CKRecordID> ofZone;
    ofZone.reserve(identifiers.size());
    for (const auto &entry : identifiers) ofZone.push_back(entry.first);
    batchRecordIDsToFetchThumbnails(std::move(ofZone), [&, zoneID = zone](std::vector<CKRecordID> batch) {
      operations->append(makeOperation(request, std::move(batch)), zoneID);
    });
  }
  launchNewFetchThumbnailOperationFrom(operations, container, {},
                                       [persona = request->persona, completion](const NSError &outcome) {
                                         const UnderPersona adopted(persona);
                                         completion(outcome);
                                       });
  progress->setCancellable(true);
  // Reaches what waits for its turn. The batch under way is seen to its end, deliberately.
  progress->setCancellationHandler([operations] { operations->cancelAll(); });
}

std::shared_ptr<CKFetchRecordsOperation> QVThumbnailFetching::makeOperation(
    const std::shared_ptr<const Request> &request, std::vector<CKRecordID> batch) {
  auto operation = std::make_shared<CKFetchRecordsOperation>();
  operation->recordIDs = std::move(batch);
  operation->desiredKeys = {{kQVRecordKeyThumbnail1024x1024, kQVRecordKeySize}};
  operation->largestAssetToFetch = kLargestThumbnail;
  operation->configuration.qualityOfService = CKQualityOfService::utility;
  operation->configuration.discretionaryNetworkBehavior = CKDiscretionaryNetworkBehavior::nonDiscretionary;
  operation->configuration.allowsRetry = false;
  operation->configuration.sourceApplicationBundleIdentifier = QVDaemonBundleID;
  operation->perRecordCompletionBlock = [fetching = shared_from_this(),
                                         request](const CKRecordResult &result) {
    const UnderPersona adopted(request->persona);
    fetching->recordWasFetched(*request, result);
  };
  operation->group = request->group;
  return operation;
}

void QVThumbnailFetching::batchRecordIDsToFetchThumbnails(
    std::vector<CKRecordID> recordIDs,
    const std::function<void(std::vector<CKRecordID> batch)> &perBatchExecutionBlock) {
  const auto limit = static_cast<std::uint32_t>(
      QVCUserDefaults::defaultsForMangledID(std::nullopt).maxRecordCountInFetchRecordsOperation());
  while (!recordIDs.empty()) {
    if (recordIDs.size() < limit) return perBatchExecutionBlock(std::move(recordIDs));
    os_log_debug(qvc_default_log(),
                 "[DEBUG] fetching thumbnails for more than %u item identifiers, batching request", limit);
    const auto end = recordIDs.begin() + static_cast<std::ptrdiff_t>(limit);
    perBatchExecutionBlock({recordIDs.begin(), end});
    recordIDs.erase(recordIDs.begin(), end);
  }
}

void QVThumbnailFetching::launchNewFetchThumbnailOperationFrom(
    const std::shared_ptr<QVThumbnailOperations> &operations, const std::shared_ptr<CKContainer> &inContainer,
    const NSError &previousError, const NSFileProviderErrorCompletion &completionHandler) {
  const auto operation = operations->firstOperation();
  if (!operation) {
    os_log_error(qvc_default_log(), "[ERROR] no new fetch thumbnail operation found, returning.");
    return completionHandler({});
  }
  const auto zone = operations->firstZone();
  if (!zone) {
    os_log_error(qvc_default_log(), "[ERROR] no zone ID found, returning.");
    return completionHandler({});
  }
  operations->removeFirst();
  operation->fetchRecordsCompletionBlock = [=](const auto & /*results*/, const NSError &error) {
    os_log_debug(qvc_default_log(), "[DEBUG] completed fetching thumbnail batch for %@", *zone);
    if (error) {
      os_log_error(qvc_default_log(), "[ERROR] error while fetching thumbnail batch for %@: %@", *zone,
                   error);
    }
    const NSError carried = error ? error : previousError;
    if (!operations->isEmpty()) {
      os_log_debug(qvc_default_log(), "[DEBUG] fetching next thumbnail batch");
      return launchNewFetchThumbnailOperationFrom(operations, inContainer, carried, completionHandler);
    }
    os_log_debug(qvc_default_log(), "[DEBUG] finished fetching all thumbnail batches");
    completionHandler(qv_fileProviderError(carried));
  };
  os_log_debug(qvc_default_log(), "[DEBUG] scheduling operation %@ for zone: %@", Description(*operation),
               *zone);
  const bool isOwn = zone->ownerName == CKCurrentUserDefaultName;
  (isOwn ? inContainer->privateCloudDatabase() : inContainer->sharedCloudDatabase())->addOperation(operation);
}

// On the operation's thread, which waits where a download is started.
void QVThumbnailFetching::recordWasFetched(const Request &request, const CKRecordResult &result) {
  const NSData data = ThumbnailOf(result.record);
  const std::string identifier = request.identifierOf(result.recordID);
  os_log_debug(qvc_default_log(), "[DEBUG] ┳%llx received a thumbnail callback for %@", request.section,
               identifier);
  if (data) {
    os_log_debug(qvc_default_log(), "[DEBUG] received a thumbnail of %lu bytes for %@", data.length(),
                 identifier);
  } else if (result.error) {
    os_log_error(qvc_default_log(), "[ERROR] error when fetching thumbnail for %@: %@", identifier,
                 result.error);
  } else if (const std::int64_t size = SizeOf(result.record); size == 0) {
    os_log_debug(qvc_default_log(), "[DEBUG] empty record for %@", identifier);
  } else {
    os_log_debug(qvc_default_log(), "[DEBUG] no thumbnail found for a non-empty file");
    downloadIfThumbnailCanBeMadeHere(identifier, size);
  }
  if (request.handler) request.handler(identifier, data, std::nullopt, qv_fileProviderError(result.error));
}

// A small document is fetched as a whole, so that the desktop makes its thumbnail.
void QVThumbnailFetching::downloadIfThumbnailCanBeMadeHere(const std::string &identifier, std::int64_t size) {
  if (size > QVRemoteUserDefaults::sharedDefaults().minFileSizeForThumbnailTransfer()) return;
  const auto item = extension_->itemForIdentifier(identifier, nullptr);
  if (!item || !QLThumbnailStoreRetrievalOperation::canMostRecentClientsGenerateThumbnailsForUTI(
                   item->fields().typeIdentifier)) {
    return;
  }
  const NSURL url = extension_->URLForItemWithPersistentIdentifier(identifier);
  os_log_debug(qvc_default_log(),
               "[DEBUG] downloading file at %@ because quicklook can generate its thumbnail", url.path());
  if (!url) return;
  // Told however the start ends, the daemon's death included.
  const auto started = std::make_shared<std::promise<void>>();
  QVStartDownloadForItemsWithOptions(
      {url}, QVDownloadForThumbnail, [started](const NSURL &of, const NSError &error) {
        if (error) {
          os_log_error(qvc_default_log(), "[ERROR] can't start downloading %@: %@", of, error);
        }
        started->set_value();
      });
  started->get_future().wait();
}

}  // namespace droxa
