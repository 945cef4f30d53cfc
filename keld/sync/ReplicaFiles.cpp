#include "keld/sync/ReplicaFiles.h"

#include <cerrno>
#include <fcntl.h>

#include "keld/sync/DocumentRecord.h"
#include "tessaly/QVContainer.h"

namespace droxa::keld {

namespace {
constexpr int kDeepest = 4096;
}  // namespace

ReplicaFiles::ReplicaFiles(std::string replicaPath, Read read, SyncStore &store, SyncScope scope)
    : replicaPath_(std::move(replicaPath)), read_(std::move(read)), store_(store), scope_(std::move(scope)) {}

bool ReplicaFiles::isInScope(const ItemRecord &item, ItemQueries &queries) const {
  const bool isShared = (item.flags & kOthersFlag) != 0;
  if (isShared != scope_.isShared()) return false;
  if (!isShared) return true;
  const std::vector<std::string> names = queries.namesTo(item);
  return !names.empty() && names.front() == scope_.container;
}

bool ReplicaFiles::isInScope(const ItemRecord &item) const {
  const bool isShared = (item.flags & kOthersFlag) != 0;
  bool isIn = isShared == scope_.isShared();
  if (isIn && isShared) (void)read_([&](ItemQueries &queries) { isIn = isInScope(item, queries); });
  return isIn;
}

std::optional<ItemRecord> ReplicaFiles::item(ItemNumber item) const {
  std::optional<ItemRecord> found;
  (void)read_([&](ItemQueries &queries) {
    found = queries.byID(item);
    const bool isHere = found && found->parent != kLimboFolder && isInScope(*found, queries);
    if (!isHere) found.reset();
  });
  return found;
}

bool ReplicaFiles::itemAtPath(const std::string &path, ItemRecord *item) const {
  bool found = false;
  (void)read_([&](ItemQueries &queries) {
    const auto record = queries.byPathBelowReplica(path);
    found = record.has_value();
    if (record) *item = *record;
  });
  return found;
}

std::string ReplicaFiles::pathOf(ItemNumber item) const {
  std::string path;
  (void)read_([&](ItemQueries &queries) {
    if (const auto record = queries.byID(item)) path = queries.pathBelowReplica(*record);
  });
  return path;
}

std::string ReplicaFiles::pathInScope(ItemNumber item) const {
  std::string path;
  (void)read_([&](ItemQueries &queries) {
    const auto record = queries.byID(item);
    if (record && isInScope(*record, queries)) path = queries.pathBelowReplica(*record);
  });
  return path;
}

std::optional<FileLocation> ReplicaFiles::locate(ItemNumber item, NSError *error) const {
  FileLocation location;
  bool found = false;
  const NSError problem = read_([&](ItemQueries &queries) {
    const auto record = queries.byID(item);
    if (!record || record->parent == kLimboFolder) return;
    location.item = *record;
    location.path = queries.pathBelowReplica(*record);
    found = !location.path.empty();
  });
  if (problem || !found) {
    if (error) *error = problem;
    return std::nullopt;
  }
  const std::size_t slash = location.path.rfind('/');
  location.name = location.path.substr(slash + 1);
  int code = 0;
  location.folder = openFolder(slash == std::string::npos ? "" : location.path.substr(0, slash), &code);
  if (location.folder) return location;
  if (error) *error = NSError::errorWithPOSIXCode(code, absolute(location.path));
  return std::nullopt;
}

OwnedDescriptor ReplicaFiles::openFolder(const std::string &path, int *error) const {
  OwnedDescriptor folder(::open(replicaPath_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  for (std::size_t at = 0; folder && at < path.size();) {
    const std::size_t slash = std::min(path.find('/', at), path.size());
    folder = OpenFolder(folder.get(), path.substr(at, slash - at));
    at = slash + 1;
  }
  if (!folder) *error = errno;
  return folder;
}

std::optional<std::string> ReplicaFiles::folderPath(const std::string &parentRecord) const {
  std::string below;
  std::string record = parentRecord;
  for (int depth = 0; depth < kDeepest; ++depth) {
    const auto container = ContainerOfRecord(record);
    if (container && !scope_.hasContainer(*container)) return std::nullopt;
    if (container)
      return *container + "/" + QVDocumentsFolderName(*container) + (below.empty() ? "" : "/") + below;
    const auto row = store_.byRecord(record);
    if (!row || row->kind != NSFileProviderItemKind::folder) return std::nullopt;
    if (row->item != 0) {
      const std::string path = pathInScope(row->item);
      if (!path.empty()) return below.empty() ? path : path + "/" + below;
    }
    below = below.empty() ? row->name : row->name + "/" + below;
    record = row->parent;
  }
  return std::nullopt;  // a cycle
}

std::optional<std::string> ReplicaFiles::path(const SyncRow &row) const {
  if (row.item != 0) {
    std::string known = pathInScope(row.item);
    if (!known.empty()) return known;
  }
  const auto folder = folderPath(row.parent);
  if (!folder) return std::nullopt;
  return *folder + "/" + row.name;
}

std::string ReplicaFiles::parentRecord(const ItemRecord &item) const {
  std::string container;
  (void)read_([&](ItemQueries &queries) {
    const auto parent = queries.byID(item.parent);
    if (!parent || parent->zone() != Zone::structure) return;
    const auto owner = queries.byID(parent->parent);
    if (owner) container = owner->name;
  });
  if (!container.empty()) return ContainerRecord(container);
  const auto row = store_.byItem(item.parent);
  return row ? row->record : std::string();
}

LocalFile LocalFileOf(const FileFacts &facts) {
  return {facts.inode, facts.size, facts.modified, facts.changed};
}

bool IsSameContents(const LocalFile &a, const LocalFile &b) {
  return a.inode == b.inode && a.size == b.size && a.modified == b.modified;
}

}  // namespace droxa::keld
