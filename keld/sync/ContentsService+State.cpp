// What is here and what the cloud has, and letting go of what both have.

#include <algorithm>
#include <cerrno>
#include <fcntl.h>

#include "keld/sync/ContentsService.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/QVErrors.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kMostFailures = 1000;

bool isSyncedItem(const ItemRecord &item) {
  const bool isPlaced = item.zone() == Zone::shown || item.zone() == Zone::trashed;
  return isPlaced && (item.flags & kExcludedFlag) == 0;
}

void addCounts(const QVTransferCounts &more, QVTransferCounts *counts) {
  counts->active += more.active;
  counts->queued += more.queued;
  counts->done += more.done;
  counts->failed += more.failed;
  counts->bytesDone += more.bytesDone;
  counts->bytesLeft += more.bytesLeft;
  counts->bytesPerSecond += more.bytesPerSecond;
}

void addTransfers(SyncEngine &engine, QVTransferStatus *status) {
  const SyncEngine::Status own = engine.status();
  addCounts(engine.downloads()->counts(), &status->downloads);
  QVTransferCounts uploads;
  for (const AssetUploads::Progress &upload : engine.assetUploads().underWay()) {
    ++uploads.active;
    uploads.bytesLeft += upload.total - std::min(upload.done, upload.total);
  }
  const std::uint64_t queued = engine.store().countQueued();
  uploads.queued = queued - std::min(queued, uploads.active);
  uploads.done = own.uploadsDone;
  uploads.failed = engine.store().countFailed();
  uploads.bytesDone = own.bytesUploaded;
  uploads.bytesPerSecond = own.uploadRate;
  addCounts(uploads, &status->uploads);
  // One cloud for all; the first that has something to say of it is heard.
  if (status->cloud.empty()) status->cloud = own.cloud;
  if (status->cloudProblem.empty()) status->cloudProblem = own.cloudProblem;
  status->heldDeletions += engine.store().countHeld();
  status->conflicts += own.conflicts;
}

}  // namespace

// --- Letting go.

void ContentsService::evictItemAtURL(const NSURL &url, QVContentsResultReply reply) {
  find(url, [self = shared_from_this(), reply = std::move(reply)](const ItemRecord *item,
                                                                  const NSError &error) {
    if (!item) return reply({}, error);
    dispatch_async_global([self, asked = *item, reply] {
      QVContentsResult result;
      NSError own;
      const auto engine = self->engineOf(asked);
      for (const ItemRecord &document : self->documentsBelow(
               asked, [](const ItemRecord &child) { return (child.flags & kDatalessFlag) == 0; })) {
        std::uint64_t bytes = 0;
        const NSError refused = evict(*engine, document, &bytes);
        if (!refused) {
          ++result.documents;
          result.bytes += bytes;
          continue;
        }
        ++result.refused;
        if (!asked.isFolder()) own = refused;
        if (result.failures.size() < kMostFailures)
          result.failures.push_back({engine->files().absolute(engine->files().pathOf(document.id)), refused});
      }
      engine->states().flush([reply, result, own] { reply(result, own); });
    });
  });
}

NSError ContentsService::evict(SyncEngine &engine, const ItemRecord &document, std::uint64_t *bytes) {
  NSError problem;
  const auto location = engine.files().locate(document.id, &problem);
  if (!location) return problem ? problem : qvc_errorNoSuchItem(document.name);
  const std::string path = engine.files().absolute(location->path);
  if (engine.isPinnedOrBelowPin(document.id)) return qvc_error(QVErrorPinned, path + ": is pinned here");
  const auto row = engine.store().byItem(document.id);
  const NSError unsent = qvc_error(QVErrorUnsentChanges, path + ": the cloud doesn't have it yet");
  if (!row || row->tag.empty() || !isSyncedItem(location->item)) return unsent;
  if (const auto queued = engine.store().queued(document.id); queued && !queued->isDeletion) return unsent;
  const DocumentLook look = engine.storage().classify(location->folder.get(), location->name);
  if (look.kind == DocumentClass::dataless || look.facts.size == 0) return NSError();  // nothing to let go of
  if (!cloudHasContents(*location, *row, look)) return unsent;
  DocumentMarker marker = look.marker ? *look.marker : DocumentMarker();
  marker.recordName = row->record;
  marker.digest = row->content.digest;
  marker.size = row->content.size;
  marker.modified = look.facts.modified;
  const ContentsResult result =
      engine.storage().evict(location->folder.get(), location->name, look.facts, marker);
  switch (result.outcome) {
    case ContentsOutcome::done:
      break;
    case ContentsOutcome::inUse:
      return qvc_error(QVErrorDocumentInUse, path + ": a program has it open");
    case ContentsOutcome::changedMeanwhile:
      return unsent;
    case ContentsOutcome::gone:
      return qvc_errorNoSuchItem(path);
    default:
      return NSError::errorWithPOSIXCode(result.error != 0 ? result.error : EIO, path);
  }
  *bytes = row->content.size;
  engine.store().transaction([&] {
    auto now = engine.store().byItem(document.id);
    if (!now || now->content.digest != row->content.digest) return;
    now->isDataless = true;
    now->local = LocalFileOf(result.facts);
    engine.store().put(*now);
  });
  engine.states().show({document.id, true, true, LocalFileOf(result.facts), true});
  return NSError();
}

// A file whose dates say that it is as it was sent may have been written with its dates put back: where the
// status change isn't the known one, its contents decide.
bool ContentsService::cloudHasContents(const FileLocation &location, const SyncRow &row,
                                       const DocumentLook &look) {
  if (row.hasNewer() || row.content.digest.empty() || !IsSameContents(LocalFileOf(look.facts), row.local))
    return false;
  if (row.local.changed != 0 && look.facts.changed == row.local.changed) return true;
  const OwnedDescriptor file(
      ::openat(location.folder.get(), location.name.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC | O_NONBLOCK));
  return file && DigestOfFile(file.get()) == row.content.digest;
}

// --- What is what.

QVContentsStatus ContentsService::statusOf(SyncEngine &engine, const ItemRecord &document) {
  QVContentsStatus status;
  status.size = document.facts.size;
  status.isPinned = engine.isPinnedOrBelowPin(document.id);
  const auto transferred = engine.downloads()->transferred(document.id);
  const auto row = engine.store().byItem(document.id);
  if ((document.flags & kDatalessFlag) != 0)
    status.contents = transferred ? QVContentsState::downloading : QVContentsState::dataless;
  status.transferred = transferred.value_or(0);
  status.error = engine.downloads()->lastError(document.id);
  if (row) status.checksum = row->content.digest;
  if (!isSyncedItem(document) || !host_.isSignedIn()) return status;
  const auto queued = engine.store().queued(document.id);
  const bool isClean = row && !row->tag.empty() && !queued && (document.flags & kUploadedFlag) != 0;
  if (isClean) {
    status.upload = QVUploadState::inCloud;
  } else if (engine.assetUploads().isUnderWay(document.id)) {
    status.upload = QVUploadState::uploading;
    for (const AssetUploads::Progress &upload : engine.assetUploads().underWay())
      if (upload.item == document.id) status.transferred = upload.done;
  } else if (queued && queued->error) {
    status.upload = QVUploadState::failed;
    status.error = queued->error;
  } else {
    status.upload = QVUploadState::queued;
  }
  return status;
}

QVContentsStatus ContentsService::statusBelow(const ItemRecord &folder) {
  // From the least safe to the safest.
  const auto danger = [](QVUploadState state) {
    switch (state) {
      case QVUploadState::failed:
        return 4;
      case QVUploadState::queued:
        return 3;
      case QVUploadState::uploading:
        return 2;
      case QVUploadState::local:
        return 1;
      case QVUploadState::inCloud:
        break;
    }
    return 0;
  };
  QVContentsStatus status;
  status.upload = QVUploadState::inCloud;
  const auto engine = engineOf(folder);
  status.isPinned = engine->isPinnedOrBelowPin(folder.id);
  if (const auto queued = engine->store().queued(folder.id)) status.error = queued->error;
  for (const ItemRecord &document : documentsBelow(folder, [](const ItemRecord &) { return true; })) {
    const QVContentsStatus own = statusOf(*engine, document);
    ++status.documents;
    status.size += own.size;
    status.transferred += own.transferred;
    if (own.contents != QVContentsState::present) {
      ++status.dataless;
      if (status.contents != QVContentsState::downloading) status.contents = own.contents;
    }
    const bool isUnsent = own.upload != QVUploadState::inCloud && own.upload != QVUploadState::local;
    if (isUnsent) ++status.unsent;
    if (own.upload == QVUploadState::failed || own.error) ++status.failed;
    if (own.error && !status.error) status.error = own.error;
    if (danger(own.upload) > danger(status.upload)) status.upload = own.upload;
  }
  return status;
}

void ContentsService::getContentsStatusAtURL(const NSURL &url, QVContentsStatusReply reply) {
  find(url,
       [self = shared_from_this(), reply = std::move(reply)](const ItemRecord *item, const NSError &error) {
         if (!item) return reply({}, error);
         reply(item->isFolder() ? self->statusBelow(*item) : self->statusOf(*self->engineOf(*item), *item),
               NSError());
       });
}

void ContentsService::getTransferStatus(QVTransferStatusReply reply) {
  QVTransferStatus status;
  for (const auto &engine : engines()) addTransfers(*engine, &status);
  status.isCloudReachable = status.cloudProblem.empty();
  reply(status, NSError());
}

}  // namespace droxa::keld
