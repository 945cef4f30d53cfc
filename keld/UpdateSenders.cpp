#include "keld/UpdateSenders.h"

#include <algorithm>
#include <unordered_set>

namespace droxa::keld {

namespace {

// Where an item counts as being: a container's documents folder is a child of the root.
ItemNumber shownParent(const ItemChange &change, ItemNumber parent, const Containers &containers) {
  const ContainerEntry *entry = containers.byDocuments(change.id);
  if (!entry) return parent;
  return containers.isListedInRoot(*entry) ? containers.root() : 0;
}

// Climbs from folder to folder, also through those that died with what they held.
class Ancestry {
 public:
  Ancestry(const std::vector<ItemChange> &changes, const Containers &containers, ItemQueries &queries)
      : containers_(containers), queries_(queries) {
    for (const ItemChange &change : changes)
      if (change.died) parents_[change.id] = change.oldParent;
  }

  bool isBelow(ItemNumber folder, ItemNumber ancestor) {
    while (folder != 0 && folder != kLimboFolder) {
      if (folder == ancestor) return true;
      folder = parentOf(folder);
    }
    return false;
  }

 private:
  ItemNumber parentOf(ItemNumber folder) {
    if (const ContainerEntry *entry = containers_.byDocuments(folder))
      return containers_.isListedInRoot(*entry) ? containers_.root() : 0;
    const auto known = parents_.find(folder);
    if (known != parents_.end()) return known->second;
    const auto record = queries_.byID(folder);
    return parents_[folder] = record ? record->parent : 0;
  }

  const Containers &containers_;
  ItemQueries &queries_;
  std::unordered_map<ItemNumber, ItemNumber> parents_;
};

void appendBelow(ItemQueries &queries, ItemNumber folder, std::vector<PendingPush> &pushes) {
  ListingKey key;
  for (;;) {
    const auto children = queries.childrenByName(folder, key, 500);
    if (children.empty()) return;
    key.atStart = false;
    key.name = children.back().name;
    for (const ItemRecord &child : children) {
      pushes.push_back({child.id, child.facts.kind, false});
      if (child.isFolder()) appendBelow(queries, child.id, pushes);
    }
  }
}

struct Publication {
  const std::vector<ItemChange> &changes;
  const Containers &before;
  const Containers &after;
  ItemQueries &queries;
  Ancestry ancestry;
};

void publishTo(UpdateSender &sender, UpdateWatch watch, Publication &publication) {
  const bool wantsUpdates = (watch.options & QVWatchUpdates) != 0;
  const bool wantsDeaths = (watch.options & QVWatchDeaths) != 0;
  const bool isDeep = (watch.options & QVWatchSubtree) != 0;
  std::vector<PendingPush> pushes;
  bool last = false;
  for (const ItemChange &change : publication.changes) {
    if (change.id == watch.folder && change.died) {
      pushes.push_back({change.id, change.kind, true});
      last = !watch.isRoot;
      if (last) break;
      continue;
    }
    const ItemNumber oldParent = shownParent(change, change.oldParent, publication.before);
    const ItemNumber newParent = change.died ? 0 : shownParent(change, change.newParent, publication.after);
    const bool was =
        isDeep ? publication.ancestry.isBelow(oldParent, watch.folder) : oldParent == watch.folder;
    const bool is =
        isDeep ? publication.ancestry.isBelow(newParent, watch.folder) : newParent == watch.folder;
    if (!is && !was) continue;
    // One that left is pushed as it is now: its parent tells where it went.
    if (change.died ? wantsDeaths : wantsUpdates) pushes.push_back({change.id, change.kind, change.died});
    // A folder that came from elsewhere brought its contents along, which themselves haven't changed.
    const bool isNews = isDeep && is && !was && change.oldParent != 0;
    if (isNews && wantsUpdates && change.kind == NSFileProviderItemKind::folder)
      appendBelow(publication.queries, change.id, pushes);
  }
  if (!pushes.empty()) sender.enqueue(pushes, last);
}

}  // namespace

void UpdateSenders::add(const std::shared_ptr<UpdateSender> &sender) {
  const Lock lock(mutex_);
  senders_.push_back(sender);
}

std::vector<std::shared_ptr<UpdateSender>> UpdateSenders::living() const {
  const Lock lock(mutex_);
  std::vector<std::shared_ptr<UpdateSender>> living;
  std::vector<std::weak_ptr<UpdateSender>> kept;
  for (const auto &weak : senders_) {
    auto sender = weak.lock();
    if (!sender || sender->isInvalidated()) continue;
    kept.push_back(weak);
    living.push_back(std::move(sender));
  }
  senders_.swap(kept);
  return living;
}

std::size_t UpdateSenders::count() const {
  return living().size();
}

void UpdateSenders::publish(const std::vector<ItemChange> &changes, const Containers &before,
                            const Containers &after, ItemQueries &queries) {
  std::vector<std::shared_ptr<UpdateSender>> senders = living();
  if (senders.empty()) return;
  // Folders that nobody watches are most of them: direct watches are asked for by the folder alone.
  std::unordered_set<ItemNumber> concerned;
  for (const ItemChange &change : changes) {
    concerned.insert({change.id, shownParent(change, change.oldParent, before),
                      shownParent(change, change.newParent, after)});
  }
  std::stable_partition(senders.begin(), senders.end(),
                        [](const auto &sender) { return sender->isBoosted(); });
  Publication publication{changes, before, after, queries, Ancestry(changes, after, queries)};
  for (const auto &sender : senders) {
    auto watch = sender->watch();
    if (!watch) continue;
    if (watch->isRoot) watch->folder = after.root();
    const bool isDeep = (watch->options & QVWatchSubtree) != 0;
    if (isDeep || concerned.count(watch->folder) != 0) publishTo(*sender, *watch, publication);
  }
}

}  // namespace droxa::keld
