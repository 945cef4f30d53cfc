#include "keld/sync/ContentsService.h"

#include <algorithm>
#include <cerrno>
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

namespace droxa::keld {

namespace {

constexpr std::uint64_t kChildrenAtATime = 1000;

bool isDocument(const ItemRecord &item) {
  return item.facts.kind == NSFileProviderItemKind::document;
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
  if ((options & QVDownloadCurrentVersion) == 0) return startDownload(url, options, std::move(reply));
  find(url, [self = shared_from_this(), url, options, reply = std::move(reply)](const ItemRecord *item,
                                                                                const NSError &problem) {
    if (!item) return reply(nullptr, problem);
    self->engineOf(*item)->fetchNow([self, url, options, reply](const NSError &error) {
      if (error) return reply(nullptr, error);
      self->startDownload(url, options, reply);
    });
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

// --- Pins.

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
