#include "keld/KeldSession.h"

#include <algorithm>

#include "keld/Listing.h"
#include "keld/WorkingSetFeed.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVNotifications.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kLongestPage = 1000;

NSError checkLimit(std::uint64_t limit) {
  if (limit >= 1 && limit <= kLongestPage) return NSError();
  return qvc_error(QVErrorInvalidArgument,
                   "limit " + std::to_string(limit) + " isn't between 1 and " + std::to_string(kLongestPage));
}

std::string named(const std::optional<QVFileObjectID> &folder) {
  return folder ? folder->asString() : "the root";
}

}  // namespace

void KeldSession::end() {
  std::vector<std::weak_ptr<UpdateSender>> senders;
  std::vector<std::uint64_t> subscriptions;
  {
    const Lock lock(mutex_);
    ended_ = true;
    senders.swap(senders_);
    subscriptions.swap(subscriptions_);
  }
  daemon_->sharing().queue().end(sharing_);
  for (const auto &weak : senders)
    if (const auto sender = weak.lock()) sender->invalidate();
  for (const std::uint64_t subscription : subscriptions) daemon_->notifications().unsubscribe(subscription);
}

NSError KeldSession::checkListing(std::uint64_t limit) const {
  const NSError error = daemon_->checkSignedIn();
  return error ? error : checkLimit(limit);
}

// --- Listings.

void KeldSession::enumerateItemsInFolder(const std::optional<QVFileObjectID> &folder, std::int64_t sortOrder,
                                         std::uint64_t offset, std::uint64_t limit,
                                         QVItemsCompletion completion) {
  if (const NSError error = checkListing(limit)) return completion({}, 0, error);
  const bool byDate = sortOrder == static_cast<std::int64_t>(QVSortOrder::byDate);
  if (folder && folder->isDocumentID()) return completion({}, 0, qvc_errorNoSuchItem(named(folder)));
  const ListingRequest request{false, folder ? folder->number() : daemon_->containers()->root(), byDate};
  daemon_->keeper().whenScanned(request.folder, [self = shared_from_this(), request, offset, limit,
                                                 completion = std::move(completion)] {
    self->listPage(request, offset, limit, completion);
  });
}

void KeldSession::enumerateAllFoldersWithSortOrder(std::int64_t sortOrder, std::uint64_t offset,
                                                   std::uint64_t limit, QVItemsCompletion completion) {
  if (const NSError error = checkListing(limit)) return completion({}, 0, error);
  listPage({true, 0, sortOrder == static_cast<std::int64_t>(QVSortOrder::byDate)}, offset, limit, completion);
}

void KeldSession::listPage(ListingRequest request, std::uint64_t offset, std::uint64_t limit,
                           const QVItemsCompletion &completion) {
  QVQueryItems items;
  std::uint64_t nextOffset = 0;
  NSError refused;
  const NSError error = daemon_->read([&](ItemQueries &queries, const ItemPresenter &presenter) {
    if (!request.allFolders) {
      const auto folder = queries.byID(request.folder);
      const std::string name = QVFileObjectID::folderOrAliasID(request.folder).asString();
      if (!folder || !folder->isFolder() || folder->parent == kLimboFolder)
        refused = qvc_errorNoSuchItem(name);
      else if (folder->flags & kUnreadableFlag)
        refused = qvc_error(QVErrorUnreadable,
                            "the folder " + queries.pathBelowReplica(*folder) + " can't be read");
      if (refused) return;
    }
    Listing listing(queries, presenter, request);
    const auto known = daemon_->cursors().find(request, offset);
    const std::optional<ListingKey> key = known ? known : listing.keyAtOffset(offset);
    if (!key) return;
    const ListingPage page = listing.page(*key, limit);
    items.reserve(page.records.size());
    for (const ItemRecord &record : page.records) items.push_back(presenter.item(record));
    if (!page.more) return;
    nextOffset = offset + page.records.size();
    daemon_->cursors().remember(request, nextOffset, page.last);
  });
  const NSError &problem = error ? error : refused;
  if (problem) return completion({}, 0, problem);
  completion(items, nextOffset, NSError());
}

// --- The feed.

void KeldSession::currentNotifRankWithReply(QVRankReply reply) {
  if (const NSError error = daemon_->checkSignedIn()) return reply(0, error);
  reply(daemon_->keeper().counters().rank, NSError());
}

void KeldSession::enumerateWorkingSetChangesFromChangeToken(const NSData &token, std::uint64_t limit,
                                                            QVWorkingSetCompletion completion) {
  if (const NSError error = checkListing(limit)) return completion({}, {}, NSData(), error);
  WorkingSetBatch batch;
  NSError error = daemon_->read([&](ItemQueries &queries, const ItemPresenter &presenter) {
    batch = ReadWorkingSet(queries, presenter, token, limit);
  });
  if (!error && batch.isExpired)
    error = qvc_error(QVErrorChangeTokenExpired,
                      "the change token " + token.description() + " isn't of this database (any more)");
  if (error) return completion({}, {}, NSData(), error);
  completion(batch.updated, batch.deleted, batch.token, NSError());
}

// --- Pushes.

void KeldSession::getItemUpdateSenderWithReceiver(std::shared_ptr<QVItemNotificationReceiving> receiver,
                                                  QVSenderReply reply) {
  if (!receiver) return reply(nullptr, {}, qvc_error(QVErrorInvalidArgument, "a sender needs a receiver"));
  const auto sender =
      std::make_shared<UpdateSender>(daemon_, std::move(receiver), daemon_->senders().lastCommit());
  bool ended = false;
  {
    const Lock lock(mutex_);
    ended = ended_;
    senders_.erase(
        std::remove_if(senders_.begin(), senders_.end(), [](const auto &weak) { return weak.expired(); }),
        senders_.end());
    if (!ended) senders_.push_back(sender);
  }
  if (ended) return reply(nullptr, {}, qvc_error(QVErrorShuttingDown, "the connection has ended"));
  daemon_->senders().add(sender);
  reply(sender, {}, NSError());
}

void KeldSession::subscribeToNotifications(std::shared_ptr<QVDaemonNotificationReceiving> receiver,
                                           QVErrorReply reply) {
  if (!receiver) return reply(qvc_error(QVErrorInvalidArgument, "a subscription needs a receiver"));
  const std::uint64_t subscription = daemon_->notifications().subscribe(std::move(receiver));
  bool ended = false;
  {
    const Lock lock(mutex_);
    ended = ended_;
    if (!ended) subscriptions_.push_back(subscription);
  }
  if (ended) daemon_->notifications().unsubscribe(subscription);
  reply(NSError());
}

// --- Lookup.

void KeldSession::getURLForItemIdentifier(const std::string &identifier, QVURLReply reply) {
  if (identifier == NSFileProviderRootContainerItemIdentifier) {
    const ItemNumber root = daemon_->containers()->root();
    return getURLForFileObjectID(QVFileObjectID::folderOrAliasID(root), std::move(reply));
  }
  const auto fileObjectID = QVFileObjectID::fileObjectIDWithString(identifier);
  if (!fileObjectID)
    return reply(NSURL(),
                 qvc_error(QVErrorInvalidArgument, "\"" + identifier + "\" isn't an item identifier"));
  getURLForFileObjectID(*fileObjectID, std::move(reply));
}

void KeldSession::getURLForFileObjectID(const QVFileObjectID &fileObjectID, QVURLReply reply) {
  std::string path;
  const NSError error = daemon_->read([&](ItemQueries &queries, const ItemPresenter &) {
    if (const auto record = RecordOf(queries, fileObjectID)) path = queries.pathBelowReplica(*record);
  });
  if (error) return reply(NSURL(), error);
  if (path.empty()) return reply(NSURL(), qvc_errorNoSuchItem(fileObjectID.asString()));
  reply(NSURL::fileURLWithPath(daemon_->replicaPath() + "/" + path), NSError());
}

KeldSession::Found KeldSession::findAtPath(const std::string &path) {
  Found found;
  found.error = daemon_->read([&](ItemQueries &queries, const ItemPresenter &presenter) {
    const auto record = queries.byPathBelowReplica(path);
    if (record && record->parent != kReplicaFolder) found.item = presenter.item(*record);
  });
  return found;
}

void KeldSession::getQueryItemForURL(const NSURL &url, bool fakeFSEvent, QVItemReply reply) {
  const auto path = daemon_->pathBelowReplica(url);
  if (!path) return reply(nullptr, qvc_errorNoSuchItem(url.path()));
  if (!fakeFSEvent) {
    const Found known = findAtPath(*path);
    if (known.item || known.error) return reply(known.item, known.error);
  }
  // What isn't known may be so new that the keeper hasn't seen it.
  daemon_->keeper().lookAt(*path, [self = shared_from_this(), path = *path, url, reply = std::move(reply)] {
    const Found found = self->findAtPath(path);
    if (found.item || found.error) return reply(found.item, found.error);
    reply(nullptr, qvc_errorNoSuchItem(url.path()));
  });
}

void KeldSession::getContainerItem(const std::string &containerID, bool forceScan, QVItemReply reply) {
  const auto containers = daemon_->containers();
  const ContainerEntry *entry = containers->byID(containerID);
  if (!entry || entry->documents == 0) return reply(nullptr, qvc_errorNoSuchItem(containerID));
  const NSURL documents = NSURL::fileURLWithPath(daemon_->replicaPath() + "/" + containerID + "/" +
                                                 QVDocumentsFolderName(containerID));
  getQueryItemForURL(documents, forceScan, std::move(reply));
}

void KeldSession::getContainers(QVContainersReply reply) {
  const auto containers = daemon_->containers();
  std::vector<QVContainerDescription> descriptions;
  for (const ContainerEntry &entry : containers->entries()) {
    QVContainerDescription description;
    description.containerID = entry.containerID;
    description.url = NSURL::fileURLWithPath(daemon_->replicaPath() + "/" + entry.containerID);
    description.documentsURL =
        description.url.URLByAppendingPathComponent(QVDocumentsFolderName(entry.containerID));
    if (entry.documents != 0 && entry.documents != containers->root())
      description.documentsID = QVFileObjectID::folderOrAliasID(entry.documents);
    descriptions.push_back(std::move(description));
  }
  reply(descriptions, NSError());
}

// --- What the user notes on items.

void KeldSession::setMetadataAtURL(const NSURL &url, const QVItemMetadataChange &change, QVErrorReply reply) {
  const auto path = daemon_->pathBelowReplica(url);
  if (!path) return reply(qvc_errorNoSuchItem(url.path()));
  QVItemMetadataChange kept = change;
  if (kept.tags)
    if (const NSError error = QVNormalizeTagNames(&*kept.tags)) return reply(error);
  // What it stays when the keeper has stopped.
  const auto outcome =
      std::make_shared<NSError>(qvc_error(QVErrorShuttingDown, "the daemon is shutting down"));
  daemon_->keeper().perform(
      [path = *path, url, kept, outcome](Reconciler &reconciler, ItemQueries &queries, ItemEdits &) {
        LookAtPath(path, reconciler, queries);
        const auto record = queries.byPathBelowReplica(path);
        const bool isItem = record && record->parent != kReplicaFolder;
        *outcome = isItem ? reconciler.applyMetadata(record->id, kept) : qvc_errorNoSuchItem(url.path());
      },
      [outcome, reply = std::move(reply)] { reply(*outcome); });
}

// --- Account and status.

void KeldSession::getAccount(QVAccountReply reply) {
  reply(daemon_->account().account(), NSError());
}

void KeldSession::signIn(const std::string &name, QVAccountReply reply) {
  const NSError error = daemon_->account().signIn(name);
  if (error) return reply(std::nullopt, error);
  daemon_->accountChanged();
  daemon_->notifications().post(QVAccountTokenDidChangeNotification);
  reply(daemon_->account().account(), NSError());
}

void KeldSession::signOut(QVErrorReply reply) {
  const NSError error = daemon_->account().signOut();
  if (!error) {
    daemon_->accountChanged();
    daemon_->notifications().post(QVAccountTokenDidChangeNotification);
  }
  reply(error);
}

void KeldSession::getStatus(QVStatusReply reply) {
  reply(daemon_->status(), NSError());
}

}  // namespace droxa::keld
