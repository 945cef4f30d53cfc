#include "keld/sync/LocalExaminer.h"

#include <algorithm>
#include <chrono>

#include "keld/sync/DocumentRecord.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {

constexpr std::uint64_t kChangesAtATime = 500;
constexpr std::chrono::seconds kSpreeWindow{60};
constexpr char kExaminedRank[] = "examinedRank";
constexpr char kHoldsDeletions[] = "holdsDeletions";

bool isSynced(const ItemRecord &item) {
  const bool isPlaced = item.zone() == Zone::shown || item.zone() == Zone::trashed;
  return isPlaced && (item.flags & kExcludedFlag) == 0 && item.parent != kLimboFolder;
}

std::int64_t nowMilliseconds() {
  return std::chrono::duration_cast<std::chrono::milliseconds>(
             std::chrono::system_clock::now().time_since_epoch())
      .count();
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

// How many items died lately, with `more` of this moment.
std::uint64_t LocalExaminer::recentDeaths(std::uint64_t more) {
  const auto now = std::chrono::steady_clock::now();
  recent_.push_back({now, more});
  while (recent_.front().when + kSpreeWindow < now) recent_.pop_front();
  std::uint64_t deaths = 0;
  for (const Deaths &each : recent_) deaths += each.count;
  return deaths;
}

// Counts before the first of them is queued, because what is queued may be sent at once.
void LocalExaminer::guardAgainstSpree(const std::vector<Change> &changes) {
  if (holdsDeletions_) return;
  std::uint64_t deaths = 0;
  const std::uint64_t rank = changes.back().rank;
  for (const Change &change : changes)
    if (change.isDeath && isUnasked(change.item)) ++deaths;
  if (deaths == 0) return;
  if (isReplicaItself_ && !isReplicaItself_()) return holdDeletions();
  const std::uint64_t known = recentDeaths(deaths);
  // What follows belongs to the same event, and is counted again when its turn comes.
  std::uint64_t following = 0;
  std::uint64_t after = rank;
  for (bool more = true; more;) {
    std::vector<Tombstone> next;
    (void)read_([&](ItemQueries &queries) { next = queries.deadAfter(after, kChangesAtATime); });
    for (const Tombstone &death : next)
      if (isUnasked(death.id)) ++following;
    more = next.size() == kChangesAtATime;
    if (more) after = next.back().rank;
  }
  // Those of the window that were carried out aren't among the rows any more.
  const std::uint64_t all =
      store_.countRows() + known - std::min(known, store_.countDeletions(nowMilliseconds()) + deaths);
  const std::uint64_t sum = known + following;
  if (sum < guard_.atLeast || static_cast<double>(sum) <= guard_.share * static_cast<double>(all)) return;
  os_log_error(qvc_default_log(),
               "[ERROR] %llu of %llu items were deleted here at once: nothing is deleted in the cloud until "
               "somebody says that this was meant",
               sum, all);
  holdDeletions();
}

void LocalExaminer::holdDeletions() {
  holdsDeletions_ = true;
  store_.setNumber(kHoldsDeletions, 1);
  store_.holdDeletions(nowMilliseconds());
}

void LocalExaminer::allowDeletions() {
  holdsDeletions_ = false;
  recent_.clear();
  store_.transaction([this] {
    store_.setNumber(kHoldsDeletions, 0);
    store_.releaseHeld();
  });
}

void LocalExaminer::forgetHoldIfNothingIsHeld() {
  if (holdsDeletions_ && store_.countHeld() == 0) allowDeletions();
}

// Whether the cloud has what has died, and nobody is known to have wanted that.
bool LocalExaminer::isUnasked(ItemNumber item) {
  return store_.byItem(item) && !isAllowed(item);
}

bool LocalExaminer::isAllowed(ItemNumber item) {
  return store_.isDeletionAllowed(item, nowMilliseconds());
}

void LocalExaminer::examineDeath(ItemNumber item) {
  const bool isInCloud = store_.byItem(item).has_value();
  // Done in time, it is meant however late it can be sent.
  if (isInCloud && isAllowed(item))
    store_.keepAllowedDeletion(item);
  else
    store_.forgetAllowedDeletion(item);
  if (isInCloud)
    queue(item, true);
  else
    store_.dropQueued(item);
}

void LocalExaminer::queue(ItemNumber item, bool isDeletion) {
  std::int64_t notBefore = 0;
  const bool isUnaskedDeletion = isDeletion && !isAllowed(item);
  if (isUnaskedDeletion) notBefore = nowMilliseconds() + guard_.pause.count();
  store_.enqueue(item, isDeletion, isUnaskedDeletion && holdsDeletions_, notBefore);
  queuedAny_ = true;
}

// --- What lives.

void LocalExaminer::examineLive(const ItemRecord &item) {
  auto row = store_.byItem(item.id);
  const bool isInScope = files_.isInScope(item);
  if (!isSynced(item) || !isInScope) {
    // It left what is synced, or for another zone: for this one, it is gone.
    if (row)
      queue(item.id, true);
    else if (!isInScope)
      store_.dropQueued(item.id);
    return;
  }
  const std::string parent = files_.parentRecord(item);
  if (!row) {
    if (!bind(item, parent)) queue(item.id, false);
    return;
  }
  const bool isShared = store_.shareOfRoot(row->record).has_value();
  if (isShared != ((item.flags & kSharedFlag) != 0)) states_.showShared(item.id, isShared);
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
  if (row.tag.empty() || row.parent != parent || row.name != item.name ||
      !IsSameKind(row.kind, item.facts.kind))
    return false;
  if (IsLink(item.facts.kind)) return row.local.inode == 0 || row.local.inode == item.facts.inode;
  if (row.metadata != item.metadata) return false;
  if ((row.content.mode & 0777) != (item.facts.mode & 0777)) return false;
  return item.facts.kind == NSFileProviderItemKind::folder || hasSyncedContents(item, row);
}

// Whether the file is the one that was synced. A new file with the marker of the synced contents is: that is
// what materialising and evicting leave behind.
bool LocalExaminer::hasSyncedContents(const ItemRecord &item, SyncRow &row) {
  const LocalFile file = LocalFileOf(item.facts);
  if (IsSameContents(file, row.local)) {
    if (!row.isDataless && file.changed != row.local.changed) noticeEviction(item, row);
    return true;
  }
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

// An eviction keeps the file and its dates. Where the process ended in the middle of one, the mark alone
// tells.
void LocalExaminer::noticeEviction(const ItemRecord &item, SyncRow &row) {
  const auto location = files_.locate(item.id, nullptr);
  if (!location) return;
  DocumentLook look = storage_.classify(location->folder.get(), location->name);
  if (look.kind == DocumentClass::evicting &&
      storage_.finishEviction(location->folder.get(), location->name).isDone())
    look = storage_.classify(location->folder.get(), location->name);
  const bool isIts = look.marker && look.marker->recordName == row.record &&
                     look.marker->digest == row.content.digest &&
                     IsSameContents(LocalFileOf(look.facts), row.local);
  const bool isDataless = look.kind == DocumentClass::dataless;
  if (!isIts || (!isDataless && look.kind != DocumentClass::present)) return;
  row.local = LocalFileOf(look.facts);
  row.isDataless = isDataless;
  store_.put(row);
}

// --- Files that stand for records already.

bool LocalExaminer::bind(const ItemRecord &item, const std::string &parent) {
  const bool isDocument = item.facts.kind == NSFileProviderItemKind::document;
  const bool isFolder = item.facts.kind == NSFileProviderItemKind::folder;
  if (!isDocument && !isFolder) {
    const auto place = files_.locate(item.id, nullptr);
    const auto facts = place ? ReadFileFacts(place->folder.get(), place->name, 0) : std::nullopt;
    // Another link is there by now: the keeper tells of that one.
    if (!facts || facts->inode != item.facts.inode) return true;
    const auto row = store_.byName(parent, item.name);
    return row && row->item == 0 && IsLink(row->kind) && bindLink(item, *row);
  }
  const auto location = files_.locate(item.id, nullptr);
  if (!location) return false;
  auto facts = ReadFileFacts(location->folder.get(), location->name, 0);
  auto marker = ReadMarker(location->folder.get(), location->name);
  if (isDocument && !facts && storage_.form() == DatalessForm::promise) {
    const DocumentLook look = storage_.classify(location->folder.get(), location->name);
    if (look.kind == DocumentClass::dataless) facts = look.facts;
    marker = look.marker;
  }
  if (!facts || facts->inode != item.facts.inode) return false;  // another file by now; it is told of yet
  auto row = marker ? store_.byRecord(marker->recordName) : findUnmarked(item, parent);
  if (!row || row->kind != item.facts.kind) return false;
  // A copy that somebody made with the marker on it is another document.
  if (row->item != 0 && row->item != item.id && files_.item(row->item)) return false;
  if (row->item != 0 && row->item != item.id) store_.dropQueued(row->item);  // it hasn't died
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

// A document that bears no marker, but is the very file that was synced at this place.
std::optional<SyncRow> LocalExaminer::findUnmarked(const ItemRecord &item, const std::string &parent) {
  auto row = store_.byName(parent, item.name);
  if (!row || row->item != 0 || row->tag.empty() || item.isFolder()) return std::nullopt;
  if (row->isDataless || !IsSameContents(LocalFileOf(item.facts), row->local)) return std::nullopt;
  return row;
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
