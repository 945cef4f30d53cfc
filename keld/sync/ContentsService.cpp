#include "keld/sync/ContentsService.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "keld/SharedContainer.h"
#include "keld/sync/DownloadTransfer.h"
#include "keld/sync/ReplicaBarrier.h"
#include "keld/sync/SharedAccess.h"
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

// Replies when all of `number` have been answered, with the first error.
QVContentsErrorReply afterAll(std::size_t number, QVContentsErrorReply reply) {
  struct Waiting {
    Mutex mutex;
    std::size_t left GUARDED_BY(mutex) = 0;
    NSError error GUARDED_BY(mutex);
  };
  const auto waiting = std::make_shared<Waiting>();
  {
    const Lock lock(waiting->mutex);
    waiting->left = number;
  }
  return [waiting, reply = std::move(reply)](const NSError &error) {
    NSError outcome;
    {
      const Lock lock(waiting->mutex);
      if (error && !waiting->error) waiting->error = error;
      if (--waiting->left > 0) return;
      outcome = waiting->error;
    }
    reply(outcome);
  };
}

}  // namespace

// --- Finding.

std::vector<std::shared_ptr<SyncEngine>> ContentsService::engines() {
  std::vector<std::shared_ptr<SyncEngine>> engines{drive_};
  for (auto &engine : host_.sharedEngines()) engines.push_back(std::move(engine));
  return engines;
}

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
  const bool isThere = ::lstat(drive_->files().absolute(*path).c_str(), &status) == 0;
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
  const auto priority = (options & QVDownloadForReader) != 0      ? DownloadPriority::reader
                        : (options & QVDownloadInBackground) != 0 ? DownloadPriority::background
                                                                  : DownloadPriority::asked;
  find(url, [self = shared_from_this(), priority, reply = std::move(reply)](const ItemRecord *item,
                                                                            const NSError &error) {
    if (!item) return reply(nullptr, error);
    const bool isFolder = item->isFolder();
    const auto engine = self->engineOf(*item);
    std::vector<std::unique_ptr<Downloads::Interest>> interests;
    // What the table shows of a document may be a moment behind what the sync knows.
    const auto isWanted = [&](const ItemRecord &child) {
      if (!isFolder || (child.flags & kDatalessFlag) != 0) return true;
      if ((child.flags & kUploadedFlag) != 0) return false;
      const auto row = engine->store().byItem(child.id);
      return row && row->isDataless;
    };
    for (const ItemRecord &document : self->documentsBelow(*item, isWanted))
      interests.push_back(engine->downloads()->want(document.id, document.facts.size, priority));
    reply(DownloadTransfer::of(std::move(interests)), NSError());
  });
}

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

void ContentsService::setPinnedAtURL(const NSURL &url, bool isPinned, QVContentsErrorReply reply) {
  find(url, [self = shared_from_this(), isPinned, reply = std::move(reply)](const ItemRecord *item,
                                                                            const NSError &error) {
    if (!item) return reply(error);
    const auto engine = self->engineOf(*item);
    engine->store().setPinned(item->id, isPinned);
    if (isPinned) {
      for (const ItemRecord &document : self->documentsBelow(
               *item, [](const ItemRecord &child) { return (child.flags & kDatalessFlag) != 0; }))
        engine->downloads()->fetchInBackground(document.id, document.facts.size);
    }
    reply(NSError());
  });
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

// --- Waiting until it is safe.

void ContentsService::waitForUploadAtURL(const NSURL &url, QVContentsErrorReply reply) {
  // What was written before this call has to be seen before it can be waited for.
  dispatch_async_global([self = shared_from_this(), url, reply = std::move(reply)] {
    const NSError unseen = WaitUntilReplicaIsSeen(self->host_.replicaPath, self->host_.read);
    if (unseen) return reply(unseen);
    if (!url) {
      const auto engines = self->engines();
      const QVContentsErrorReply each = afterAll(engines.size(), reply);
      for (const auto &engine : engines) engine->whenUploaded({}, each);
      return;
    }
    self->find(url, [self, reply](const ItemRecord *item, const NSError &error) {
      if (!item) return reply(error);
      std::vector<ItemNumber> items{item->id};
      for (const ItemRecord &document : self->documentsBelow(
               *item, [](const ItemRecord &child) { return (child.flags & kUploadedFlag) == 0; }))
        items.push_back(document.id);
      std::sort(items.begin(), items.end());
      self->engineOf(*item)->whenUploaded(std::move(items), reply);
    });
  });
}

void ContentsService::allowDeletionAtURL(const NSURL &url, QVContentsErrorReply reply) {
  find(url,
       [self = shared_from_this(), reply = std::move(reply)](const ItemRecord *item, const NSError &error) {
         if (!item) return reply(error);
         std::vector<ItemNumber> items{item->id};
         self->forEachBelow(*item, [&](ItemRecord &child) { items.push_back(child.id); });
         self->engineOf(*item)->announceDeletions(items);
         reply(NSError());
       });
}

void ContentsService::confirmDeletions(bool carryOut, QVContentsErrorReply reply) {
  for (const auto &engine : engines()) engine->answerDeletions(carryOut);
  reply(NSError());
}

// --- Moves.

// Whether nothing can be put into the folder of what another shares.
bool ContentsService::isReadOnlyFolder(const std::string &path) {
  NSError error;
  const auto folder = known(path, &error);
  if (!folder || (folder->flags & kOthersFlag) == 0) return false;
  const auto engine = engineOf(*folder);
  const auto row = engine->store().byItem(folder->id);
  return row && !SharedAccess(engine->store(), engine->scope()).isWritable(row->record);
}

QVMove ContentsService::describeMove(const ItemRecord &item, const NSURL &destination,
                                     const std::string &targetFolder) {
  QVMove move;
  const std::string source = drive_->files().pathOf(item.id);
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
  move.leavesShare = move.leavesContainer && IsSharedContainer(container(source));
  if (IsSharedContainer(container(*target)))
    move.isToReadOnlyPlace =
        move.isToReadOnlyPlace || isReadOnlyFolder(target->substr(0, target->rfind('/')));
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
