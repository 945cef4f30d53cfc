#include "keld/sync/ContentsService.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/sync/DownloadTransfer.h"
#include "keld/sync/ReplicaBarrier.h"
#include "platform/dispatch/dispatch.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::size_t kMostFailures = 1000;
constexpr std::uint64_t kChildrenAtATime = 1000;

bool isDocument(const ItemRecord &item) {
  return item.facts.kind == NSFileProviderItemKind::document;
}

bool isSyncedItem(const ItemRecord &item) {
  const bool isPlaced = item.zone() == Zone::shown || item.zone() == Zone::trashed;
  return isPlaced && (item.flags & kExcludedFlag) == 0;
}

}  // namespace

// --- Finding.

std::optional<ItemRecord> ContentsService::known(const std::string &path, NSError *error) {
  std::optional<ItemRecord> found;
  *error = host_.read([&](ItemQueries &queries) { found = queries.byPathBelowReplica(path); });
  return found;
}

void ContentsService::find(const NSURL &url, Found found) {
  const auto path = host_.pathBelowReplica(url);
  if (!path) return found(nullptr, qvc_errorNoSuchItem(url.path()));
  NSError error;
  const auto item = known(*path, &error);
  if (error) return found(nullptr, error);
  // Another file may have come to that path a moment ago.
  struct stat status = {};
  const bool isThere = ::lstat(engine_->files().absolute(*path).c_str(), &status) == 0;
  if (item && isThere && status.st_ino == item->facts.inode) return found(&*item, NSError());
  host_.keeper().lookAt(*path, [self = shared_from_this(), path = *path, url, found = std::move(found)] {
    NSError problem;
    const auto seen = self->known(path, &problem);
    if (seen) return found(&*seen, NSError());
    found(nullptr, problem ? problem : qvc_errorNoSuchItem(url.path()));
  });
}

void ContentsService::forEachBelow(const ItemRecord &item,
                                   const std::function<void(ItemRecord &child)> &each) {
  if (!item.isFolder()) return;
  (void)host_.read([&](ItemQueries &queries) {
    std::vector<ItemNumber> folders{item.id};
    while (!folders.empty()) {
      const ItemNumber folder = folders.back();
      folders.pop_back();
      ListingKey key;
      for (;;) {
        auto children = queries.childrenByName(folder, key, kChildrenAtATime);
        if (children.empty()) break;
        key.atStart = false;
        key.name = children.back().name;
        for (ItemRecord &child : children) {
          if (child.isFolder()) folders.push_back(child.id);
          each(child);
        }
      }
    }
  });
}

std::vector<ItemRecord> ContentsService::documentsBelow(
    const ItemRecord &item, const std::function<bool(const ItemRecord &)> &wanted) {
  std::vector<ItemRecord> documents;
  if (isDocument(item) && wanted(item)) documents.push_back(item);
  forEachBelow(item, [&](ItemRecord &child) {
    if (isDocument(child) && wanted(child)) documents.push_back(std::move(child));
  });
  return documents;
}

// --- Downloads.

void ContentsService::startDownloadAtURL(const NSURL &url, std::uint64_t options, QVTransferReply reply) {
  if ((options & QVDownloadCurrentVersion) == 0) return startDownload(url, options, std::move(reply));
  engine_->fetchNow(
      [self = shared_from_this(), url, options, reply = std::move(reply)](const NSError &error) {
        if (error) return reply(nullptr, error);
        self->startDownload(url, options, reply);
      });
}

void ContentsService::startDownload(const NSURL &url, std::uint64_t options, QVTransferReply reply) {
  const auto priority = (options & QVDownloadForReader) != 0      ? DownloadPriority::reader
                        : (options & QVDownloadInBackground) != 0 ? DownloadPriority::background
                                                                  : DownloadPriority::asked;
  find(url, [self = shared_from_this(), priority, reply = std::move(reply)](const ItemRecord *item,
                                                                            const NSError &error) {
    if (!item) return reply(nullptr, error);
    const bool isFolder = item->isFolder();
    std::vector<std::unique_ptr<Downloads::Interest>> interests;
    // What the table shows of a document may be a moment behind what the sync knows.
    const auto isWanted = [&](const ItemRecord &child) {
      if (!isFolder || (child.flags & kDatalessFlag) != 0) return true;
      if ((child.flags & kUploadedFlag) != 0) return false;
      const auto row = self->engine_->store().byItem(child.id);
      return row && row->isDataless;
    };
    for (const ItemRecord &document : self->documentsBelow(*item, isWanted))
      interests.push_back(self->engine_->downloads()->want(document.id, document.facts.size, priority));
    reply(DownloadTransfer::of(std::move(interests)), NSError());
  });
}

// --- Letting go.

void ContentsService::evictItemAtURL(const NSURL &url, QVContentsResultReply reply) {
  find(url,
       [self = shared_from_this(), reply = std::move(reply)](const ItemRecord *item, const NSError &error) {
         if (!item) return reply({}, error);
         dispatch_async_global([self, asked = *item, reply] {
           QVContentsResult result;
           NSError own;
           for (const ItemRecord &document : self->documentsBelow(
                    asked, [](const ItemRecord &child) { return (child.flags & kDatalessFlag) == 0; })) {
             std::uint64_t bytes = 0;
             const NSError refused = self->evict(document, &bytes);
             if (!refused) {
               ++result.documents;
               result.bytes += bytes;
               continue;
             }
             ++result.refused;
             if (!asked.isFolder()) own = refused;
             if (result.failures.size() < kMostFailures)
               result.failures.push_back(
                   {self->engine_->files().absolute(self->engine_->files().pathOf(document.id)), refused});
           }
           self->engine_->states().flush([reply, result, own] { reply(result, own); });
         });
       });
}

NSError ContentsService::evict(const ItemRecord &document, std::uint64_t *bytes) {
  NSError problem;
  const auto location = engine_->files().locate(document.id, &problem);
  if (!location) return problem ? problem : qvc_errorNoSuchItem(document.name);
  const std::string path = engine_->files().absolute(location->path);
  if (engine_->isPinnedOrBelowPin(document.id)) return qvc_error(QVErrorPinned, path + ": is pinned here");
  const auto row = engine_->store().byItem(document.id);
  const NSError unsent = qvc_error(QVErrorUnsentChanges, path + ": the cloud doesn't have it yet");
  if (!row || row->tag.empty() || !isSyncedItem(location->item)) return unsent;
  if (const auto queued = engine_->store().queued(document.id); queued && !queued->isDeletion) return unsent;
  const DocumentLook look = engine_->storage().classify(location->folder.get(), location->name);
  if (look.kind == DocumentClass::dataless || look.facts.size == 0) return NSError();  // nothing to let go of
  if (!cloudHasContents(*location, *row, look)) return unsent;
  DocumentMarker marker = look.marker ? *look.marker : DocumentMarker();
  marker.recordName = row->record;
  marker.digest = row->content.digest;
  marker.size = row->content.size;
  marker.modified = look.facts.modified;
  const ContentsResult result =
      engine_->storage().evict(location->folder.get(), location->name, look.facts, marker);
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
  engine_->store().transaction([&] {
    auto now = engine_->store().byItem(document.id);
    if (!now || now->content.digest != row->content.digest) return;
    now->isDataless = true;
    now->local = LocalFileOf(result.facts);
    engine_->store().put(*now);
  });
  engine_->states().show({document.id, true, true, LocalFileOf(result.facts), true});
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

void ContentsService::setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) {
  find(url, [self = shared_from_this(), isPinned, reply = std::move(reply)](const ItemRecord *item,
                                                                            const NSError &error) {
    if (!item) return reply(error);
    self->engine_->store().setPinned(item->id, isPinned);
    if (isPinned) {
      for (const ItemRecord &document : self->documentsBelow(
               *item, [](const ItemRecord &child) { return (child.flags & kDatalessFlag) != 0; }))
        self->engine_->downloads()->fetchInBackground(document.id, document.facts.size);
    }
    reply(NSError());
  });
}

// --- What is what.

QVContentsStatus ContentsService::statusOf(const ItemRecord &document) {
  QVContentsStatus status;
  status.size = document.facts.size;
  status.isPinned = engine_->isPinnedOrBelowPin(document.id);
  const auto transferred = engine_->downloads()->transferred(document.id);
  const auto row = engine_->store().byItem(document.id);
  if ((document.flags & kDatalessFlag) != 0)
    status.contents = transferred ? QVContentsState::downloading : QVContentsState::dataless;
  status.transferred = transferred.value_or(0);
  status.error = engine_->downloads()->lastError(document.id);
  if (row) status.checksum = row->content.digest;
  if (!isSyncedItem(document) || !host_.isSignedIn()) return status;
  const auto queued = engine_->store().queued(document.id);
  const bool isClean = row && !row->tag.empty() && !queued && (document.flags & kUploadedFlag) != 0;
  if (isClean) {
    status.upload = QVUploadState::inCloud;
  } else if (engine_->assetUploads().isUnderWay(document.id)) {
    status.upload = QVUploadState::uploading;
    for (const AssetUploads::Progress &upload : engine_->assetUploads().underWay())
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
  status.isPinned = engine_->isPinnedOrBelowPin(folder.id);
  for (const ItemRecord &document : documentsBelow(folder, [](const ItemRecord &) { return true; })) {
    const QVContentsStatus own = statusOf(document);
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
         reply(item->isFolder() ? self->statusBelow(*item) : self->statusOf(*item), NSError());
       });
}

void ContentsService::getTransferStatus(QVTransferStatusReply reply) {
  QVTransferStatus status;
  const SyncEngine::Status engine = engine_->status();
  status.downloads = engine_->downloads()->counts();
  for (const AssetUploads::Progress &upload : engine_->assetUploads().underWay()) {
    ++status.uploads.active;
    status.uploads.bytesLeft += upload.total - std::min(upload.done, upload.total);
  }
  const std::uint64_t queued = engine_->store().countQueued();
  status.uploads.queued = queued - std::min(queued, status.uploads.active);
  status.uploads.done = engine.uploadsDone;
  status.uploads.failed = engine_->store().countFailed();
  status.uploads.bytesDone = engine.bytesUploaded;
  status.uploads.bytesPerSecond = engine.uploadRate;
  status.cloud = engine.cloud;
  status.cloudProblem = engine.cloudProblem;
  status.isCloudReachable = engine.cloudProblem.empty();
  status.heldDeletions = engine_->store().countHeld();
  status.conflicts = engine.conflicts;
  reply(status, NSError());
}

// --- Waiting until it is safe.

void ContentsService::waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) {
  // What was written before this call has to be seen before it can be waited for.
  dispatch_async_global([self = shared_from_this(), url, reply = std::move(reply)] {
    const NSError unseen = WaitUntilReplicaIsSeen(self->host_.replicaPath, self->host_.read);
    if (unseen) return reply(unseen);
    if (!url) return self->engine_->whenUploaded({}, reply);
    self->find(url, [self, reply](const ItemRecord *item, const NSError &error) {
      if (!item) return reply(error);
      std::vector<ItemNumber> items{item->id};
      for (const ItemRecord &document : self->documentsBelow(
               *item, [](const ItemRecord &child) { return (child.flags & kUploadedFlag) == 0; }))
        items.push_back(document.id);
      std::sort(items.begin(), items.end());
      self->engine_->whenUploaded(std::move(items), reply);
    });
  });
}

void ContentsService::allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) {
  find(url,
       [self = shared_from_this(), reply = std::move(reply)](const ItemRecord *item, const NSError &error) {
         if (!item) return reply(error);
         std::vector<ItemNumber> items{item->id};
         self->forEachBelow(*item, [&](ItemRecord &child) { items.push_back(child.id); });
         self->engine_->announceDeletions(items);
         reply(NSError());
       });
}

void ContentsService::confirmDeletions(bool carryOut, QVContentsErrorReply reply) {
  engine_->answerDeletions(carryOut);
  reply(NSError());
}

// --- Moves.

QVMove ContentsService::describeMove(const ItemRecord &item, const NSURL &destination,
                                     const std::string &targetFolder) {
  QVMove move;
  const std::string source = engine_->files().pathOf(item.id);
  const auto container = [](const std::string &path) { return path.substr(0, path.find('/')); };
  const auto target = host_.pathBelowReplica(destination);
  move.isOfContainer = item.zone() == Zone::structure;
  move.isOfAlias = item.facts.kind == NSFileProviderItemKind::alias;
  move.isOfFolder = item.isFolder();
  // Looks at everything below, so only where it makes a difference.
  const auto hasDataless = [&] {
    return !documentsBelow(item, [](const ItemRecord &document) {
              return (document.flags & kDatalessFlag) != 0;
            }).empty();
  };
  move.leavesDrive = !target;
  move.isToReadOnlyPlace = ::access(targetFolder.c_str(), W_OK) != 0;
  if (!target) {
    move.isDataless = hasDataless();
    return move;
  }
  move.isIntoItself = item.isFolder() && target->compare(0, source.size() + 1, source + "/") == 0;
  move.leavesContainer = container(*target) != container(source);
  move.isIntoTrash = container(*target) == QVUbiquitousTrashContainerID;
  move.isIntoLocalPlace =
      qv_isInTessalyPrivateStorages(destination) || qv_wouldBeExcludedFromSync(destination);
  if (move.leavesContainer || move.isIntoLocalPlace) move.isDataless = hasDataless();
  return move;
}

void ContentsService::getMoveCapability(const NSURL &source, const NSURL &destination,
                                        QVMoveCapabilityReply reply) {
  find(source, [self = shared_from_this(), destination, reply = std::move(reply)](const ItemRecord *item,
                                                                                  const NSError &error) {
    if (!item) return reply(0, error);
    const std::string folder = destination.path().substr(0, destination.path().rfind('/'));
    struct stat status = {};
    if (::stat(folder.c_str(), &status) != 0 || !S_ISDIR(status.st_mode)) {
      const int code = errno != 0 ? errno : ENOTDIR;
      return reply(0, NSError::errorWithPOSIXCode(code, folder));
    }
    reply(QVCapabilityOfMove(self->describeMove(*item, destination, folder)), NSError());
  });
}

}  // namespace droxa::keld
