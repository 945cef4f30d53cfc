#include "keld/sync/LocalExaminer.h"

#include <algorithm>

#include "keld/sync/DocumentRecord.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kChangesAtATime = 500;
constexpr char kExaminedRank[] = "examinedRank";
constexpr char kHoldsDeletions[] = "holdsDeletions";

bool isSynced(const ItemRecord &item) {
  const bool isPlaced = item.zone() == Zone::shown || item.zone() == Zone::trashed;
  return isPlaced && (item.flags & kExcludedFlag) == 0 && item.parent != kLimboFolder;
}

}  // namespace

LocalExaminer::LocalExaminer(SyncStore &store, ReplicaFiles &files, const ContentsStorage &storage,
                             ItemStates &states, ReplicaFiles::Read read, DeletionGuard guard)
    : store_(store),
      files_(files),
      storage_(storage),
      states_(states),
      read_(std::move(read)),
      guard_(guard),
      holdsDeletions_(store.number(kHoldsDeletions) != 0) {}

std::vector<LocalExaminer::Change> LocalExaminer::nextChanges(std::uint64_t after) {
  std::vector<Change> changes;
  std::uint64_t through = UINT64_MAX;
  const NSError error = read_([&](ItemQueries &queries) {
    const auto live = queries.changedAfter(after, kChangesAtATime);
    const auto dead = queries.deadAfter(after, kChangesAtATime);
    // A list that was cut off says nothing of what comes after its end.
    if (live.size() == kChangesAtATime) through = live.back().rank;
    if (dead.size() == kChangesAtATime) through = std::min(through, dead.back().rank);
    for (const ItemRecord &record : live) changes.push_back({record.rank, record.id, false, record});
    for (const Tombstone &death : dead) changes.push_back({death.rank, death.id, true, {}});
  });
  if (error) return {};
  changes.erase(std::remove_if(changes.begin(), changes.end(),
                               [through](const Change &change) { return change.rank > through; }),
                changes.end());
  std::sort(changes.begin(), changes.end(), [](const Change &a, const Change &b) { return a.rank < b.rank; });
  return changes;
}

bool LocalExaminer::examine() {
  queuedAny_ = false;
  for (;;) {
    const std::uint64_t after = store_.number(kExaminedRank);
    const std::vector<Change> changes = nextChanges(after);
    if (changes.empty()) break;
    store_.transaction([&] {
      guardAgainstSpree(changes);
      for (const Change &change : changes) {
        if (change.isDeath)
          examineDeath(change.item);
        else
          examineLive(change.record);
      }
      store_.setNumber(kExaminedRank, changes.back().rank);
    });
  }
  states_.flush();
  return queuedAny_;
}

void LocalExaminer::examineItem(ItemNumber item) {
  if (const auto record = files_.item(item))
    examineLive(*record);
  else
    examineDeath(item);
  states_.flush();
}

// --- Deaths.

// Counts before the first of them is queued, because what is queued may be sent at once.
void LocalExaminer::guardAgainstSpree(const std::vector<Change> &changes) {
  if (holdsDeletions_) return;
  std::uint64_t deaths = 0;
  std::uint64_t rank = changes.back().rank;
  for (const Change &change : changes)
    if (change.isDeath && store_.byItem(change.item)) ++deaths;
  if (deaths == 0) return;
  // What follows belongs to the same event.
  for (bool more = true; more;) {
    std::vector<Tombstone> following;
    (void)read_([&](ItemQueries &queries) { following = queries.deadAfter(rank, kChangesAtATime); });
    for (const Tombstone &death : following)
      if (store_.byItem(death.id)) ++deaths;
    more = following.size() == kChangesAtATime;
    if (more) rank = following.back().rank;
  }
  deaths += store_.countDeletions();
  const std::uint64_t all = store_.countRows();
  if (deaths < guard_.atLeast || static_cast<double>(deaths) <= guard_.share * static_cast<double>(all))
    return;
  holdsDeletions_ = true;
  store_.setNumber(kHoldsDeletions, 1);
  os_log_error(qvc_default_log(),
               "[ERROR] %llu of %llu items were deleted here at once: nothing is deleted in the cloud until "
               "somebody says that this was meant",
               deaths, all);
}

void LocalExaminer::allowDeletions() {
  holdsDeletions_ = false;
  store_.transaction([this] {
    store_.setNumber(kHoldsDeletions, 0);
    store_.releaseHeld();
  });
}

void LocalExaminer::examineDeath(ItemNumber item) {
  if (store_.byItem(item))
    queue(item, true);
  else
    store_.dropQueued(item);
}

void LocalExaminer::queue(ItemNumber item, bool isDeletion) {
  store_.enqueue(item, isDeletion, isDeletion && holdsDeletions_);
  queuedAny_ = true;
}

// --- What lives.

void LocalExaminer::examineLive(const ItemRecord &item) {
  auto row = store_.byItem(item.id);
  if (!isSynced(item)) {
    // It left what is synced: for the cloud, it is gone.
    if (row) queue(item.id, true);
    return;
  }
  const std::string parent = files_.parentRecord(item);
  if (!row) {
    if (!bind(item, parent)) queue(item.id, false);
    return;
  }
  if (isClean(item, *row, parent)) {
    store_.dropQueued(item.id);
    const std::uint32_t wanted = (row->isDataless ? kDatalessFlag : 0U) | kUploadedFlag;
    if ((item.flags & kSyncFlags) != wanted)
      states_.show({item.id, row->isDataless, true, LocalFileOf(item.facts), true});
    return;
  }
  queue(item.id, false);
}

bool LocalExaminer::isClean(const ItemRecord &item, SyncRow &row, const std::string &parent) {
  if (row.tag.empty() || row.parent != parent || row.name != item.name || row.kind != item.facts.kind)
    return false;
  const bool isLink = item.facts.kind == NSFileProviderItemKind::symbolicLink ||
                      item.facts.kind == NSFileProviderItemKind::alias;
  if (isLink) return row.local.inode == 0 || row.local.inode == item.facts.inode;
  if ((row.content.mode & 0777) != (item.facts.mode & 0777)) return false;
  return item.facts.kind == NSFileProviderItemKind::folder || hasSyncedContents(item, row);
}

// Whether the file is the one that was synced. A new file with the marker of the synced contents is: that is
// what materialising and evicting leave behind.
bool LocalExaminer::hasSyncedContents(const ItemRecord &item, SyncRow &row) {
  const LocalFile file = LocalFileOf(item.facts);
  if (IsSameContents(file, row.local)) return true;
  const auto location = files_.locate(item.id, nullptr);
  if (!location) return false;
  const DocumentLook look = storage_.classify(location->folder.get(), location->name);
  const bool isIntact = look.kind == DocumentClass::present || look.kind == DocumentClass::dataless;
  if (look.facts.inode != item.facts.inode) return false;
  if (!isIntact || !look.marker || look.marker->recordName != row.record) return false;
  if (look.marker->digest != row.content.digest || look.marker->size != row.content.size) return false;
  row.local = LocalFileOf(look.facts);
  row.isDataless = look.kind == DocumentClass::dataless;
  store_.put(row);
  return true;
}

// --- Files that stand for records already.

bool LocalExaminer::bind(const ItemRecord &item, const std::string &parent) {
  const bool isDocument = item.facts.kind == NSFileProviderItemKind::document;
  const bool isFolder = item.facts.kind == NSFileProviderItemKind::folder;
  if (!isDocument && !isFolder) {
    const auto row = store_.byName(parent, item.name);
    return row && row->item == 0 && row->kind == item.facts.kind && bindLink(item, *row);
  }
  const auto location = files_.locate(item.id, nullptr);
  if (!location) return false;
  const auto facts = ReadFileFacts(location->folder.get(), location->name, 0);
  if (!facts || facts->inode != item.facts.inode) return false;  // another file by now; it is told of yet
  const auto marker = ReadMarker(location->folder.get(), location->name);
  if (!marker) return false;
  auto row = store_.byRecord(marker->recordName);
  if (!row || row->kind != item.facts.kind) return false;
  // A copy that somebody made with the marker on it is another document.
  if (row->item != 0 && row->item != item.id && files_.item(row->item)) return false;
  row->item = item.id;
  store_.put(*row);
  store_.dropQueued(item.id);
  if (!isClean(item, *row, parent)) return false;
  states_.show({item.id, row->isDataless, true, LocalFileOf(item.facts), true});
  if (bound_) bound_(item.id, *row);
  return true;
}

void LocalExaminer::bindTo(const std::string &record, ItemNumber item) {
  auto row = store_.byRecord(record);
  if (!row) return;
  row->item = item;
  store_.put(*row);
  examineItem(item);
}

bool LocalExaminer::bindLink(const ItemRecord &item, SyncRow row) {
  row.item = item.id;
  row.local.inode = item.facts.inode;
  store_.put(row);
  store_.dropQueued(item.id);
  states_.show({item.id, false, true, {}, false});
  return true;
}

}  // namespace droxa::keld
