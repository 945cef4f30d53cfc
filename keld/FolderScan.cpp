// Reconciler's comparison of a whole folder with the item table.

#include <cerrno>
#include <cstring>

#include "keld/Reconciler.h"
#include "tessaly/QVLog.h"

namespace droxa::keld {

namespace {
constexpr std::uint64_t kRowsAtATime = 1000;
}  // namespace

void Reconciler::scan(ItemNumber folder) {
  int error = 0;
  const auto descriptor = opener_.open(folder, &error);
  if (!descriptor) {
    // Gone, or no longer there: the look at its name settles that, and what is to be said of it.
    const auto record = queries_.byID(folder);
    if (record && record->parent != kLimboFolder &&
        (error == ENOENT || error == ESTALE || error == ENOTDIR)) {
      look(record->parent, record->name);
      settle();
    } else if (record) {
      os_log(qvc_default_log(), "[WARNING] can't open %s: %s", queries_.pathBelowReplica(*record),
             std::strerror(error));
      setUnreadable(folder, true);
    }
    return;
  }
  if (folderAppeared_) folderAppeared_(folder, descriptor->get());
  NameList names;
  error = ReadFolderNames(descriptor->get(), &names);
  if (error != 0) {
    const auto record = queries_.byID(folder);
    os_log(qvc_default_log(), "[WARNING] can't read the folder %s: %s",
           record ? queries_.pathBelowReplica(*record) : opener_.replicaPath(), std::strerror(error));
    setUnreadable(folder, true);
    return;
  }
  setUnreadable(folder, false);
  if (showsPromises_) names = documentNames(folder, descriptor->get(), names);
  if (bulkLoading_ && folder != kReplicaFolder && !queries_.hasChildren(folder))
    readUnknownFolder(folder, *descriptor, names);
  else
    compareFolder(folder, *descriptor, names);
  touched_.push_back(folder);
  settle();
}

// Nothing of it is known: every name is new.
void Reconciler::readUnknownFolder(ItemNumber folder, const OwnedDescriptor &descriptor,
                                   const NameList &names) {
  Observation observation;
  observation.folder = folder;
  for (std::size_t index = 0; index < names.size(); ++index) {
    observation.name = names[index];
    observation.facts = readFacts(folder, descriptor, observation.name, std::nullopt);
    if (!observation.facts) continue;
    const auto flags = placement_.flags(folder, observation.name, observation.facts->kind);
    if (flags) insertNew(observation, *flags, 0);
  }
}

// Both sides come sorted by name; what agrees is passed over.
void Reconciler::compareFolder(ItemNumber folder, const OwnedDescriptor &descriptor, const NameList &names) {
  ListingKey key;
  std::vector<ItemRecord> rows;
  std::size_t row = 0, name = 0;
  bool rowsEnded = false;
  const auto fetch = [&] {
    if (row < rows.size() || rowsEnded) return;
    rows = queries_.childrenByName(folder, key, kRowsAtATime);
    row = 0;
    rowsEnded = rows.empty();
    if (rowsEnded) return;
    key.atStart = false;
    key.name = rows.back().name;
  };
  for (;;) {
    fetch();
    const bool haveRow = row < rows.size();
    const bool haveName = name < names.size();
    if (!haveRow && !haveName) break;
    const int order = !haveRow ? 1 : !haveName ? -1 : std::string_view(rows[row].name).compare(names[name]);
    if (order < 0) {
      observe(folder, rows[row++].name, std::nullopt);
    } else if (order > 0) {
      const std::string found(names[name++]);
      auto facts = readFacts(folder, descriptor, found, std::nullopt);
      if (facts) observe(folder, found, facts);
    } else {
      const ItemRecord &known = rows[row++];
      auto facts = readFacts(folder, descriptor, std::string(names[name++]), known);
      if (!facts || !facts->isSameFile(known.facts) || !facts->looksLike(known.facts) ||
          facts->changed != known.facts.changed)
        observe(folder, known.name, facts);
    }
    // Settling changes the rows of this folder, but none behind the key.
    if (observations_.size() >= 5000) settle();
  }
}

void Reconciler::setUnreadable(ItemNumber folder, bool unreadable) {
  if (folder == kReplicaFolder) return;
  auto record = queries_.byID(folder);
  if (!record || record->parent == kLimboFolder || ((record->flags & kUnreadableFlag) != 0) == unreadable)
    return;
  record->flags ^= kUnreadableFlag;
  edits_.updateSilently(*record);
  placement_.forget();
}

}  // namespace droxa::keld
