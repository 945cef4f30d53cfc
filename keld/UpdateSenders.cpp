#include "keld/UpdateSenders.h"

#include <algorithm>
#include <unordered_map>
#include <unordered_set>

#include "tessaly/QVErrors.h"

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
      pushes.push_back({child.id, child.facts.kind, false, false});
      if (child.isFolder()) appendBelow(queries, child.id, pushes);
    }
  }
}

// What becomes of the death of the watched item itself.
enum class OwnDeath : bool {
  isTheLast,   // it is told, and nothing after it
  isLookedAt,  // by who begins the watch: the item may be back
};

// A commit on its way to the watches.
class Publication {
 public:
  Publication(const Commit &commit, ItemQueries &queries)
      : commit_(commit), queries_(queries), ancestry_(commit.changes, *commit.after, queries) {}

  // Appends what the watch wants to know. True when nothing may follow.
  bool appendFor(UpdateWatch watch, OwnDeath ownDeath, std::vector<PendingPush> &pushes);

 private:
  const Commit &commit_;
  ItemQueries &queries_;
  Ancestry ancestry_;
};

bool Publication::appendFor(UpdateWatch watch, OwnDeath ownDeath, std::vector<PendingPush> &pushes) {
  if (watch.isRoot) watch.folder = commit_.after->root();
  const bool wantsUpdates = (watch.options & QVWatchUpdates) != 0;
  const bool wantsDeaths = (watch.options & QVWatchDeaths) != 0;
  const bool isDeep = (watch.options & QVWatchSubtree) != 0;
  for (const ItemChange &change : commit_.changes) {
    if (change.id == watch.folder && change.died) {
      if (ownDeath == OwnDeath::isLookedAt) continue;
      pushes.push_back({change.id, change.kind, true, false});
      if (!watch.isRoot) return true;
      continue;
    }
    const ItemNumber oldParent = shownParent(change, change.oldParent, *commit_.before);
    const ItemNumber newParent = change.died ? 0 : shownParent(change, change.newParent, *commit_.after);
    const bool was = isDeep ? ancestry_.isBelow(oldParent, watch.folder) : oldParent == watch.folder;
    const bool is = isDeep ? ancestry_.isBelow(newParent, watch.folder) : newParent == watch.folder;
    if (!is && !was) continue;
    // One that left is pushed as it is now: its parent tells where it went. Should it die there before its
    // turn, that death is told to others.
    const bool hasLeft = was && !is && wantsDeaths;
    if (change.died ? wantsDeaths : wantsUpdates)
      pushes.push_back({change.id, change.kind, change.died, hasLeft});
    // A folder that came from elsewhere brought its contents along, which themselves haven't changed.
    const bool isNews = isDeep && is && !was && change.oldParent != 0;
    if (isNews && wantsUpdates && change.kind == NSFileProviderItemKind::folder)
      appendBelow(queries_, change.id, pushes);
  }
  return false;
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

std::uint64_t UpdateSenders::lastCommit() const {
  const Lock lock(mutex_);
  return journal_.last();
}

void UpdateSenders::publish(Commit commit, ItemQueries &queries) {
  std::shared_ptr<const Commit> published;
  {
    const Lock lock(mutex_);
    published = journal_.append(std::move(commit));
  }
  std::vector<std::shared_ptr<UpdateSender>> senders = living();
  if (senders.empty()) return;
  // Folders that nobody watches are most of them: direct watches are asked for by the folder alone.
  std::unordered_set<ItemNumber> concerned;
  for (const ItemChange &change : published->changes) {
    concerned.insert({change.id, shownParent(change, change.oldParent, *published->before),
                      shownParent(change, change.newParent, *published->after)});
  }
  std::stable_partition(senders.begin(), senders.end(),
                        [](const auto &sender) { return sender->isBoosted(); });
  Publication publication(*published, queries);
  for (const auto &sender : senders) {
    const auto watch = sender->watch();
    if (!watch || watch->began >= published->number) continue;
    const bool isDeep = (watch->options & QVWatchSubtree) != 0;
    const ItemNumber folder = watch->isRoot ? published->after->root() : watch->folder;
    if (!isDeep && concerned.count(folder) == 0) continue;
    std::vector<PendingPush> pushes;
    const bool last = publication.appendFor(*watch, OwnDeath::isTheLast, pushes);
    if (!pushes.empty()) sender->enqueue(pushes, last);
  }
}

// What is published while earlier commits are looked at is looked at next; the watch stands once nothing is
// left.
NSError UpdateSenders::beginWatch(UpdateSender &sender, UpdateWatch watch, std::uint64_t since,
                                  const Read &read) {
  std::vector<PendingPush> missed;
  watch.began = since;
  for (;;) {
    Commits commits;
    {
      const Lock lock(mutex_);
      auto known = journal_.after(watch.began);
      if (!known)
        return qvc_error(QVErrorChangeTokenExpired, "too much has changed since the sender was made");
      if (known->empty()) {
        sender.beginWatch(watch, missed);
        return NSError();
      }
      commits.swap(*known);
    }
    const NSError error = read([&](ItemQueries &queries) {
      for (const auto &commit : commits)
        (void)Publication(*commit, queries).appendFor(watch, OwnDeath::isLookedAt, missed);
    });
    if (error) return error;
    watch.began = commits.back()->number;
  }
}

}  // namespace droxa::keld
