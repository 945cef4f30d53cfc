#include "keld/Reconciler.h"

#include <algorithm>
#include <cerrno>

#include "keld/contents/DocumentMarker.h"
#include "tessaly/NSURL+Tessaly.h"
#include "tessaly/QVContainer.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

Reconciler::Reconciler(ItemQueries &queries, ItemEdits &edits, FolderOpener &opener)
    : queries_(queries), edits_(edits), opener_(opener), placement_(queries) {}

void Reconciler::setFolderCallbacks(std::function<void(ItemNumber, int)> appeared,
                                    std::function<void(ItemNumber)> vanished) {
  folderAppeared_ = std::move(appeared);
  folderVanished_ = std::move(vanished);
}

std::vector<ItemChange> Reconciler::takeChanges() {
  return std::exchange(changes_, {});
}

std::vector<ItemNumber> Reconciler::takeFoldersToScan() {
  return std::exchange(foldersToScan_, {});
}

// --- Looking.

bool Reconciler::isAlias(ItemNumber folder, const std::string &name) {
  const auto record = queries_.byID(folder);
  if (!record) return false;
  const std::string path = opener_.replicaPath() + "/" + queries_.pathBelowReplica(*record) + "/" + name;
  return qv_isExternalDocumentReference(NSURL::fileURLWithPath(path));
}

std::optional<FileFacts> Reconciler::readFacts(ItemNumber folder, const OwnedDescriptor &descriptor,
                                               const std::string &name,
                                               const std::optional<ItemRecord> &known) {
  auto facts = readFileOrPromise(descriptor.get(), name);
  if (!facts || facts->kind != NSFileProviderItemKind::symbolicLink) return facts;
  // A link's target never changes, so that what the table knows of the same link still holds.
  if (known && known->facts.kind == NSFileProviderItemKind::alias) {
    FileFacts asAlias = *facts;
    asAlias.kind = NSFileProviderItemKind::alias;
    if (asAlias.isSameFile(known->facts)) return asAlias;
  }
  if (known && facts->isSameFile(known->facts)) return facts;
  if (isAlias(folder, name)) facts->kind = NSFileProviderItemKind::alias;
  return facts;
}

void Reconciler::look(ItemNumber folder, const std::string &name) {
  int error = 0;
  const auto descriptor = opener_.open(folder, &error);
  if (!descriptor) return;  // its own folder's hint tells what became of it
  const auto document = documentName(folder, descriptor->get(), name);
  if (!document) return;
  observe(folder, *document, readFacts(folder, *descriptor, *document, queries_.byName(folder, *document)));
}

void Reconciler::observe(ItemNumber folder, const std::string &name, std::optional<FileFacts> facts) {
  observations_.push_back({folder, name, facts, false});
  Observation &observation = observations_.back();
  if (observation.facts && !queries_.byName(folder, name))
    newcomers_.emplace(observation.facts->inode, &observation);
}

// --- Settling.

void Reconciler::settle() {
  // By index: settling may add observations.
  for (std::size_t index = 0; index < observations_.size(); ++index) settleOne(observations_[index]);
  observations_.clear();
  newcomers_.clear();
  touchedFolders();
}

void Reconciler::settleOne(Observation &observation) {
  if (observation.settled) return;
  observation.settled = true;
  if (observation.facts && !placement_.flags(observation.folder, observation.name, observation.facts->kind))
    observation.facts.reset();
  auto record = queries_.byName(observation.folder, observation.name);
  if (!observation.facts) {
    if (record) putIntoLimbo(std::move(*record));
    return;
  }
  if (record && record->facts.isSameFile(*observation.facts)) {
    refresh(std::move(*record), *observation.facts);
    return;
  }
  if (record && keepsIdentity(observation, *record)) {
    refresh(std::move(*record), *observation.facts);
    return;
  }
  // The one that was here may have been claimed meanwhile by the name under which its file lives on.
  if ((record = queries_.byName(observation.folder, observation.name))) putIntoLimbo(std::move(*record));
  adopt(observation);
}

// Another file is at the item's name: is it the item's new contents, or another item?
bool Reconciler::keepsIdentity(const Observation &observation, const ItemRecord &record) {
  if (record.facts.kind != observation.facts->kind || record.isFolder()) return false;
  auto range = newcomers_.equal_range(record.facts.inode);
  for (auto newcomer = range.first; newcomer != range.second; ++newcomer) {
    Observation &other = *newcomer->second;
    if (other.settled || !other.facts->isSameFile(record.facts)) continue;
    if (other.folder == observation.folder && IsBackupName(other.name, observation.name)) continue;
    settleOne(other);
    return queries_.byName(observation.folder, observation.name).has_value();
  }
  return true;
}

void Reconciler::adopt(Observation &observation) {
  const auto flags = placement_.flags(observation.folder, observation.name, observation.facts->kind);
  if (!flags) return;
  if (bulkLoading_) return insertNew(observation, *flags, 0);
  if (auto moved = findMoved(observation)) return move(std::move(*moved), observation, *flags);
  if (takeBackFromBackup(observation, *flags)) return;
  const auto revived = recent_.takeDead(*observation.facts);
  insertNew(observation, *flags, revived && !queries_.byID(*revived) ? *revived : 0);
}

std::optional<ItemRecord> Reconciler::findMoved(const Observation &observation) {
  for (ItemRecord &record : queries_.byInode(observation.facts->inode)) {
    if (!record.facts.isSameFile(*observation.facts)) continue;
    if (record.zone() == Zone::structure && record.parent == kReplicaFolder) continue;
    if (record.parent == kLimboFolder) return std::move(record);
    if (isStillThere(record) || leavesItsName(record, observation)) continue;
    return std::move(record);
  }
  return std::nullopt;
}

bool Reconciler::isStillThere(const ItemRecord &record) {
  int error = 0;
  const auto folder = opener_.open(record.parent, &error);
  if (!folder) return false;
  const auto facts = readFileOrPromise(folder->get(), record.name);
  return facts && facts->inode == record.facts.inode && facts->birth == record.facts.birth;
}

// The file was renamed to its own backup, and there is a new one at its name: the item is the new one.
bool Reconciler::leavesItsName(const ItemRecord &record, const Observation &observation) {
  if (record.parent != observation.folder || record.facts.kind != NSFileProviderItemKind::document ||
      !IsBackupName(observation.name, record.name))
    return false;
  int error = 0;
  const auto folder = opener_.open(record.parent, &error);
  const auto facts = folder ? readFileOrPromise(folder->get(), record.name) : std::nullopt;
  if (!facts || facts->kind != NSFileProviderItemKind::document) return false;
  observe(record.parent, record.name, facts);
  return true;
}

// The same, seen in two steps: the item has followed its file to the backup's name already.
bool Reconciler::takeBackFromBackup(const Observation &observation, std::uint32_t flags) {
  if (observation.facts->kind != NSFileProviderItemKind::document) return false;
  const auto id = recent_.takeBackup(observation.folder, observation.name);
  if (!id) return false;
  const auto record = queries_.byID(*id);
  if (record && (record->parent != observation.folder || !IsBackupName(record->name, observation.name)))
    return false;
  if (!record) {
    insertNew(observation, flags, *id);
    return true;
  }
  const ItemMetadata metadata = record->metadata;
  Observation backup{record->parent, record->name, record->facts, true};
  const std::uint32_t backupFlags = record->flags;
  edits_.remove(*record, false);
  insertNew(observation, flags, *id, metadata);
  insertNew(backup, backupFlags, 0);
  return true;
}

// --- What happens to items.

void Reconciler::insertNew(const Observation &observation, std::uint32_t flags, ItemNumber id,
                           const ItemMetadata &metadata) {
  ItemRecord record;
  record.id = id;
  record.parent = observation.folder;
  record.name = observation.name;
  record.flags = flags;
  record.facts = *observation.facts;
  record.metadata = metadata;
  const bool mayBeMarked = readMetadata(record);
  if (isDataless(record.parent, record.name, record.facts, mayBeMarked)) record.flags |= kDatalessFlag;
  edits_.insert(record);
  changes_.push_back({record.id, record.facts.kind, 0, record.parent, false});
  touched_.push_back(record.parent);
  if (id != 0 && record.isFolder()) foldersToScan_.push_back(id);
}

// A placeholder is never shown as a document whose contents are here, not even before the sync has seen it.
bool Reconciler::isDataless(ItemNumber folder, const std::string &name, const FileFacts &facts,
                            bool mayBeMarked) {
  if (facts.isPromise) return true;
  if (!mayBeMarked || facts.kind != NSFileProviderItemKind::document || facts.size == 0) return false;
  int error = 0;
  const auto descriptor = opener_.open(folder, &error);
  const auto marker = descriptor ? ReadMarker(descriptor->get(), name) : std::nullopt;
  return marker && marker->state == MarkerState::dataless && marker->size == facts.size;
}

Reconciler::Origin Reconciler::originOf(const ItemRecord &record) const {
  if (record.parent != kLimboFolder) return {record.parent, record.name};
  const auto origin = limboOrigins_.find(record.id);
  return origin == limboOrigins_.end() ? Origin() : origin->second;
}

// Between what two owners share: each of its children is somebody else's then, though its flags don't tell.
bool Reconciler::changesOwner(const ItemRecord &folder, ItemNumber from, ItemNumber to) {
  if (!folder.isFolder() || (folder.flags & kOthersFlag) == 0 || from == to) return false;
  const auto containerOf = [this](ItemNumber at) {
    const auto record = queries_.byID(at);
    const std::vector<std::string> names = record ? queries_.namesTo(*record) : std::vector<std::string>();
    return names.empty() ? std::string() : names.front();
  };
  return containerOf(from) != containerOf(to);
}

void Reconciler::move(ItemRecord record, const Observation &observation, std::uint32_t flags) {
  const Origin origin = originOf(record);
  const bool isOtherOwners =
      (flags & kOthersFlag) != 0 && changesOwner(record, origin.parent, observation.folder);
  const bool wasInLimbo = record.parent == kLimboFolder;
  if (origin.parent == observation.folder && IsBackupName(observation.name, origin.name))
    recent_.becameBackup(observation.folder, origin.name, record.id);
  // Its old name may hold another of its names by now, or something else.
  if (!wasInLimbo && observation.facts->links > 1 && !record.isFolder()) {
    int error = 0;
    if (const auto folder = opener_.open(origin.parent, &error))
      observe(origin.parent, origin.name, readFacts(origin.parent, *folder, origin.name, std::nullopt));
  }
  if (!wasInLimbo && record.zone() == Zone::trashed) leftInTrash_.push_back({origin.parent, origin.name});
  limboOrigins_.erase(record.id);
  edits_.rename(record, observation.folder, observation.name);
  const bool wasPrivate = record.zone() == Zone::privateStorage;
  const bool flagsChanged = (record.flags ^ flags) & ~kOwnFlags;
  record.facts = *observation.facts;
  readMetadata(record);
  edits_.setFlags(record, flags | (record.flags & kOwnFlags));
  if (!wasPrivate && record.zone() == Zone::privateStorage) edits_.leaveTombstone(record);
  changes_.push_back({record.id, record.facts.kind, origin.parent, record.parent, false});
  touched_.push_back(origin.parent);
  touched_.push_back(record.parent);
  if (!record.isFolder()) return;
  placement_.forget();
  if (flagsChanged || isOtherOwners) reflagChildren(record);
}

void Reconciler::refresh(ItemRecord record, const FileFacts &facts) {
  const bool looksTheSame = record.facts.looksLike(facts) && record.facts.inode == facts.inode;
  const bool becameAccessible = record.isFolder() && (record.flags & kUnreadableFlag) != 0;
  const bool isIdentical = looksTheSame && record.facts.changed == facts.changed &&
                           record.facts.device == facts.device && record.facts.size == facts.size &&
                           record.facts.mode == facts.mode;
  if (becameAccessible && !isIdentical) foldersToScan_.push_back(record.id);
  // Attributes may be written twice while the clock of times of change stands still.
  const ItemMetadata known = record.metadata;
  const bool mayBeMarked = readMetadata(record);
  if (isIdentical && record.metadata == known) return;
  // Whatever was written here, the cloud doesn't have it yet.
  const bool isWritten =
      !record.isFolder() && (record.facts.size != facts.size || record.facts.modified != facts.modified ||
                             record.facts.inode != facts.inode);
  if (isWritten) record.flags &= ~kUploadedFlag;
  if (record.facts.inode != facts.inode && !record.isFolder()) {
    record.flags &= ~kDatalessFlag;
    if (isDataless(record.parent, record.name, facts, mayBeMarked)) record.flags |= kDatalessFlag;
  }
  record.facts = facts;
  if ((looksTheSame && record.metadata == known) || isUnlistedStructure(record))
    return edits_.updateSilently(record);
  edits_.update(record);
  changes_.push_back({record.id, record.facts.kind, record.parent, record.parent, false});
}

// What a folder's contents inherit has changed with it.
void Reconciler::reflagChildren(const ItemRecord &folder) {
  std::vector<ItemRecord> folders{folder};
  while (!folders.empty()) {
    const ItemRecord parent = std::move(folders.back());
    folders.pop_back();
    ListingKey key;
    for (;;) {
      std::vector<ItemRecord> children = queries_.childrenByName(parent.id, key, 500);
      if (children.empty()) break;
      key.atStart = false;
      key.name = children.back().name;
      for (ItemRecord &child : children) {
        const auto flags = placement_.flags(parent.id, child.name, child.facts.kind);
        const bool wasPrivate = child.zone() == Zone::privateStorage;
        if (!flags) continue;
        edits_.setFlags(child, *flags | (child.flags & kOwnFlags));
        if (!wasPrivate && child.zone() == Zone::privateStorage) edits_.leaveTombstone(child);
        changes_.push_back({child.id, child.facts.kind, parent.id, parent.id, false});
        if (child.isFolder()) folders.push_back(std::move(child));
      }
    }
  }
  placement_.forget();
}

void Reconciler::touch(ItemNumber id) {
  auto record = queries_.byID(id);
  if (!record) return;
  edits_.update(*record);
  changes_.push_back({record->id, record->facts.kind, record->parent, record->parent, false});
}

void Reconciler::setSyncFlags(ItemNumber id, std::uint32_t flags) {
  auto record = queries_.byID(id);
  if (!record || record->parent == kLimboFolder || (record->flags & kSyncFlags) == flags) return;
  edits_.setFlags(*record, (record->flags & ~kSyncFlags) | flags);
  changes_.push_back({record->id, record->facts.kind, record->parent, record->parent, false});
}

void Reconciler::setShared(ItemNumber id, bool isShared) {
  auto record = queries_.byID(id);
  const std::uint32_t flag = isShared ? kSharedFlag : 0U;
  if (!record || record->parent == kLimboFolder || (record->flags & kSharedFlag) == flag) return;
  edits_.setFlags(*record, (record->flags & ~kSharedFlag) | flag);
  changes_.push_back({record->id, record->facts.kind, record->parent, record->parent, false});
}

// --- What is missing.

void Reconciler::putIntoLimbo(ItemRecord record) {
  touched_.push_back(record.parent);
  if (record.zone() == Zone::trashed) leftInTrash_.push_back({record.parent, record.name});
  limboOrigins_[record.id] = {record.parent, record.name};
  recentLimbo_.push_back(record.id);
  edits_.rename(record, kLimboFolder, std::to_string(record.id));
  placement_.forget();
}

void Reconciler::bury(bool onlyRecent) {
  if (onlyRecent) {
    for (const ItemNumber id : std::exchange(recentLimbo_, {})) {
      const auto record = queries_.byID(id);
      if (record && record->parent == kLimboFolder) die(*record, originOf(*record).parent);
      limboOrigins_.erase(id);
    }
    return;
  }
  for (;;) {
    const auto missing = queries_.childrenByName(kLimboFolder, ListingKey(), 500);
    if (missing.empty()) break;
    for (const ItemRecord &record : missing) die(record, originOf(record).parent);
  }
  limboOrigins_.clear();
  recentLimbo_.clear();
}

// The contents die before their folder, so that a death never leaves an item without its parent.
void Reconciler::die(const ItemRecord &record, ItemNumber lastParent) {
  struct Level {
    ItemRecord folder;
    ItemNumber lastParent;
  };
  std::vector<Level> levels;
  if (!record.isFolder()) return dieAlone(record, lastParent);
  levels.push_back({record, lastParent});
  while (!levels.empty()) {
    const ItemNumber folder = levels.back().folder.id;
    const auto children = queries_.childrenByName(folder, ListingKey(), 64);
    bool descends = false;
    for (const ItemRecord &child : children) {
      if (child.isFolder() && queries_.hasChildren(child.id)) {
        levels.push_back({child, folder});
        descends = true;
        break;
      }
      dieAlone(child, folder);
    }
    if (descends || !children.empty()) continue;
    const Level level = std::move(levels.back());
    levels.pop_back();
    dieAlone(level.folder, level.lastParent);
  }
  placement_.forget();
}

void Reconciler::dieAlone(const ItemRecord &record, ItemNumber lastParent) {
  const bool isContainer = record.zone() == Zone::structure && lastParent == kReplicaFolder;
  edits_.remove(record, record.zone() != Zone::privateStorage && !isContainer);
  recent_.died(record);
  changes_.push_back({record.id, record.facts.kind, lastParent, 0, true});
  if (!record.isFolder()) return;
  opener_.forget(record.id);
  if (folderVanished_) folderVanished_(record.id);
}

// A folder's own date changes with its contents, without anybody telling.
void Reconciler::touchedFolders() {
  std::sort(touched_.begin(), touched_.end());
  touched_.erase(std::unique(touched_.begin(), touched_.end()), touched_.end());
  for (const ItemNumber folder : std::exchange(touched_, {})) {
    if (folder == kReplicaFolder || folder == kLimboFolder) continue;
    auto record = queries_.byID(folder);
    if (!record || record->parent == kLimboFolder) continue;
    int error = 0;
    const auto descriptor = opener_.open(folder, &error);
    const auto facts =
        descriptor ? ReadFolderFacts(descriptor->get(), opener_.replicaDevice()) : std::nullopt;
    if (facts && facts->isSameFile(record->facts)) refresh(std::move(*record), *facts);
  }
}

// The containers' folders and the root are no items: their dates are no news.
bool Reconciler::isUnlistedStructure(const ItemRecord &record) {
  if (record.zone() != Zone::structure) return false;
  if (record.parent == kReplicaFolder) return true;
  const auto container = queries_.byID(record.parent);
  return container && container->name == QVUbiquitousDefaultContainerID;
}

}  // namespace droxa::keld
