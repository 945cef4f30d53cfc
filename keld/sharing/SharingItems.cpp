#include "keld/sharing/SharingItems.h"

#include <algorithm>
#include <sys/stat.h>
#include <utility>

#include "keld/sync/ReplicaBarrier.h"
#include "tessaly/QVErrors.h"
#include "tessaly/QVSharingTopics.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kChildrenAtATime = 1000;
constexpr int kDeepest = 4096;

NSError notShareable(const std::string &path, const char *why) {
  return qvc_error(QVErrorNotShareable, path + ": " + why);
}

bool isUnsent(const ItemRecord &item) {
  return (item.flags & (kUploadedFlag | kExcludedFlag)) == 0;
}

}  // namespace

// --- Finding.

NSError SharingItems::look(SharingOperation &operation, const std::string &path,
                           std::optional<ItemRecord> *found) {
  const auto ask = [&] {
    return host_.read([&](ItemQueries &queries) { *found = queries.byPathBelowReplica(path); });
  };
  if (const NSError error = ask()) return error;
  struct stat status = {};
  const bool isThere = ::lstat((host_.replicaPath + "/" + path).c_str(), &status) == 0;
  const bool isPromised = !isThere && *found && ((*found)->flags & kDatalessFlag) != 0;
  if (*found && (isPromised || (isThere && status.st_ino == (*found)->facts.inode))) return NSError();
  // Another file may have come to that path a moment ago.
  const NSError unseen = operation.await("looking at " + path, [&](SharingOperation::Done done) {
    host_.keeper().lookAt(path, [done = std::move(done)] { done(NSError()); });
  });
  return unseen ? unseen : ask();
}

NSError SharingItems::find(SharingOperation &operation, const NSURL &url, SharingItem *found) {
  if (!url) return qvc_error(QVErrorInvalidArgument, "no URL was given; name the item by its URL");
  const auto path = host_.pathBelowReplica(url);
  if (!path) return qvc_errorNoSuchItem(url.path() + ": it isn't in the drive");
  std::optional<ItemRecord> record;
  if (const NSError error = look(operation, *path, &record)) return error;
  if (!record) return qvc_errorNoSuchItem(url.path());
  const auto engine = host_.engineOf(*record);
  *found = {*record, url.path(), engine, engine->store().byItem(record->id)};
  return checkShareable(*record, url.path());
}

SharingItem SharingItems::described(const ItemRecord &item) const {
  const auto engine = host_.engineOf(item);
  return {item, engine->files().absolute(engine->files().pathOf(item.id)), engine,
          engine->store().byItem(item.id)};
}

std::optional<ItemRecord> SharingItems::item(ItemNumber item) const {
  std::optional<ItemRecord> found;
  (void)host_.read([&](ItemQueries &queries) { found = queries.byID(item); });
  if (found && found->parent == kLimboFolder) found.reset();
  return found;
}

NSError SharingItems::checkShareable(const ItemRecord &item, const std::string &path) const {
  switch (item.zone()) {
    case Zone::shown:
      break;
    case Zone::trashed:
      return notShareable(path, "is in the trash; put it back to share it");
    case Zone::privateStorage:
      return notShareable(path, "is private to an application; move it to the documents to share it");
    case Zone::structure:
      return notShareable(path, "is a container's own folder; share folders that are in it");
  }
  if (IsLink(item.facts.kind))
    return notShareable(path, "is an alias; share the document or folder that it leads to");
  if ((item.flags & kExcludedFlag) != 0)
    return notShareable(path, "is kept on this machine alone; rename it, or move it, to share it");
  return NSError();
}

// --- Getting items into the cloud.

NSError SharingItems::findInCloud(SharingOperation &operation, const NSURL &url, SharingItem *found) {
  NSError error = find(operation, url, found);
  if (error || found->isInCloud()) return error;
  error = upload(operation, *found);
  if (error) return error;
  found->row = found->engine->store().byItem(found->item.id);
  if (found->isInCloud()) return NSError();
  return qvc_error(QVErrorUnsentChanges, found->path + ": the cloud doesn't have it yet; ask again later");
}

std::vector<ItemNumber> SharingItems::unsentBelow(const ItemRecord &item) const {
  std::vector<ItemNumber> unsent;
  (void)host_.read([&](ItemQueries &queries) {
    std::vector<ItemNumber> folders;
    if (item.isFolder()) folders.push_back(item.id);
    while (!folders.empty()) {
      const ItemNumber folder = folders.back();
      folders.pop_back();
      ListingKey key;
      for (;;) {
        const auto children = queries.childrenByName(folder, key, kChildrenAtATime);
        if (children.empty()) break;
        key.atStart = false;
        key.name = children.back().name;
        for (const ItemRecord &child : children) {
          if (child.isFolder()) folders.push_back(child.id);
          if (isUnsent(child)) unsent.push_back(child.id);
        }
      }
    }
  });
  return unsent;
}

std::string SharingItems::problemOfCloud(const SharingItem &item) {
  const std::string problem = item.engine->status().cloudProblem;
  return problem.empty() ? "" : " (" + problem + ")";
}

NSError SharingItems::upload(SharingOperation &operation, const SharingItem &item) {
  const auto isStopped = [&operation] { return static_cast<bool>(operation.stopped()); };
  if (const NSError unseen = WaitUntilReplicaIsSeen(host_.replicaPath, host_.read, isStopped)) return unseen;
  std::vector<ItemNumber> items = unsentBelow(item.item);
  items.push_back(item.item.id);
  std::sort(items.begin(), items.end());
  const std::uint64_t total = items.size();
  std::uint64_t told = total + 1;
  const auto position = [&] {
    const std::uint64_t done = total - std::min(total, item.engine->store().countQueued());
    if (done != std::exchange(told, done)) operation.progress(QVSharingTopicUpload, done, total);
    std::uint64_t bytes = item.engine->status().bytesUploaded;
    for (const AssetUploads::Progress &upload : item.engine->assetUploads().underWay()) bytes += upload.done;
    return done + bytes;
  };
  // Of its own: a wait that timed out isn't left behind either.
  const auto interest = std::make_shared<CKCancellation>();
  const NSError error = operation.await(
      "sending " + item.path + " to the cloud",
      [&](SharingOperation::Done done) { item.engine->whenUploaded(items, std::move(done), interest); },
      position);
  interest->cancel();
  if (!error) {
    operation.progress(QVSharingTopicUpload, total, total);
    return error;
  }
  item.engine->itemsChanged();  // lets go of the wait
  if (CKErrorIsTimeout(error)) return CKErrorMakeTimeout(error.localizedDescription() + problemOfCloud(item));
  return error;
}

// --- Shares, as they are known here.

void SharingItems::forEachUpwards(const ItemRecord &item,
                                  const std::function<bool(const ItemRecord &)> &each) const {
  std::optional<ItemRecord> current = item;
  for (int depth = 0; current && depth < kDeepest; ++depth) {
    if (!each(*current)) return;
    if (current->parent == kReplicaFolder || current->parent == kLimboFolder) return;
    current = this->item(current->parent);
  }
}

std::optional<KnownShare> SharingItems::shareOf(const ItemRecord &item) const {
  const auto engine = host_.engineOf(item);
  const auto row = engine->store().byItem(item.id);
  return row ? engine->store().shareOfRoot(row->record) : std::nullopt;
}

std::optional<KnownShare> SharingItems::nearestShare(const ItemRecord &item) const {
  std::optional<KnownShare> found;
  forEachUpwards(item, [&](const ItemRecord &each) {
    found = shareOf(each);
    return !found.has_value();
  });
  return found;
}

bool SharingItems::isBelow(ItemNumber item, ItemNumber folder) const {
  const auto record = this->item(item);
  if (!record || item == folder) return false;
  bool isFound = false;
  forEachUpwards(*record, [&](const ItemRecord &each) {
    isFound = each.id == folder;
    return !isFound;
  });
  return isFound;
}

}  // namespace droxa::keld
