#include "keld/ItemQueries.h"

#include <algorithm>

namespace droxa::keld {

namespace {

#define ITEM_COLUMNS                                                                                  \
  "id, parent, name, kind, flags, rank, age, size, mode, inode, device, birth, changed, tags, used, " \
  "favorite"

std::vector<ItemRecord> readAll(SqlScope &scope) {
  std::vector<ItemRecord> records;
  while (scope->step()) records.push_back(ReadItemRecord(*scope.operator->()));
  return records;
}

std::optional<ItemRecord> readOne(SqlScope &scope) {
  if (!scope->step()) return std::nullopt;
  return ReadItemRecord(*scope.operator->());
}

}  // namespace

ItemRecord ReadItemRecord(const SqlStatement &row) {
  ItemRecord record;
  record.id = row.number(0);
  record.parent = row.number(1);
  record.name = row.bytes(2);
  record.facts.kind = static_cast<NSFileProviderItemKind>(row.integer(3));
  record.flags = static_cast<std::uint32_t>(row.integer(4));
  record.rank = row.number(5);
  record.facts.modified = -row.integer(6);
  record.facts.size = row.number(7);
  record.facts.mode = static_cast<std::uint32_t>(row.integer(8));
  record.facts.inode = row.number(9);
  record.facts.device = row.number(10);
  record.facts.birth = row.integer(11);
  record.facts.changed = row.integer(12);
  if (const std::string_view tags = row.bytes(13); !tags.empty())
    record.metadata.tags = QVDecodeTagNames(tags);
  record.metadata.lastUsed = row.integer(14);
  record.metadata.favoriteRank = row.number(15);
  return record;
}

SqlStatement &ItemQueries::statement(const char *sql) {
  std::unique_ptr<SqlStatement> &slot = statements_[sql];
  if (!slot) slot = std::make_unique<SqlStatement>(database_.handle(), sql);
  return *slot;
}

std::optional<ItemRecord> ItemQueries::byID(ItemNumber id) {
  SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE id = ?"));
  scope->bind(1, id);
  return readOne(scope);
}

std::optional<ItemRecord> ItemQueries::byName(ItemNumber parent, std::string_view name) {
  SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE parent = ? AND name = ?"));
  scope->bind(1, parent).bindBlob(2, name);
  return readOne(scope);
}

std::vector<ItemRecord> ItemQueries::byInode(std::uint64_t inode) {
  SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE inode = ?"));
  scope->bind(1, inode);
  return readAll(scope);
}

std::optional<ItemNumber> ItemQueries::folderByInode(std::uint64_t inode) {
  SqlScope scope(statement("SELECT id FROM items WHERE inode = ? AND kind = 1 AND device = 0"));
  scope->bind(1, inode);
  if (!scope->step()) return std::nullopt;
  return scope->number(0);
}

std::vector<ItemRecord> ItemQueries::childrenByName(ItemNumber parent, const ListingKey &key,
                                                    std::uint64_t limit) {
  if (key.atStart) {
    SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE parent = ? ORDER BY name LIMIT ?"));
    scope->bind(1, parent).bind(2, limit);
    return readAll(scope);
  }
  SqlScope scope(
      statement("SELECT " ITEM_COLUMNS " FROM items WHERE parent = ? AND name > ? ORDER BY name LIMIT ?"));
  scope->bind(1, parent).bindBlob(2, key.name).bind(3, limit);
  return readAll(scope);
}

std::vector<ItemRecord> ItemQueries::childrenByDate(ItemNumber parent, const ListingKey &key,
                                                    std::uint64_t limit) {
  if (key.atStart) {
    SqlScope scope(
        statement("SELECT " ITEM_COLUMNS " FROM items WHERE parent = ? ORDER BY age, name LIMIT ?"));
    scope->bind(1, parent).bind(2, limit);
    return readAll(scope);
  }
  SqlScope scope(
      statement("SELECT " ITEM_COLUMNS
                " FROM items WHERE parent = ? AND (age, name) > (?, ?) ORDER BY age, name LIMIT ?"));
  scope->bind(1, parent).bind(2, key.age).bindBlob(3, key.name).bind(4, limit);
  return readAll(scope);
}

std::vector<ItemRecord> ItemQueries::foldersByName(const ListingKey &key, std::uint64_t limit) {
  if (key.atStart) {
    SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE kind = 1 ORDER BY name, id LIMIT ?"));
    scope->bind(1, limit);
    return readAll(scope);
  }
  SqlScope scope(statement("SELECT " ITEM_COLUMNS
                           " FROM items WHERE kind = 1 AND (name, id) > (?, ?) ORDER BY name, id LIMIT ?"));
  scope->bindBlob(1, key.name).bind(2, key.id).bind(3, limit);
  return readAll(scope);
}

std::vector<ItemRecord> ItemQueries::foldersByDate(const ListingKey &key, std::uint64_t limit) {
  if (key.atStart) {
    SqlScope scope(
        statement("SELECT " ITEM_COLUMNS " FROM items WHERE kind = 1 ORDER BY age, name, id LIMIT ?"));
    scope->bind(1, limit);
    return readAll(scope);
  }
  SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE kind = 1 AND (age, name, id) > (?, ?, ?)"
                           " ORDER BY age, name, id LIMIT ?"));
  scope->bind(1, key.age).bindBlob(2, key.name).bind(3, key.id).bind(4, limit);
  return readAll(scope);
}

bool ItemQueries::hasChildren(ItemNumber parent) {
  SqlScope scope(statement("SELECT 1 FROM items WHERE parent = ? LIMIT 1"));
  scope->bind(1, parent);
  return scope->step();
}

std::optional<ItemRecord> ItemQueries::firstFolderAfter(ItemNumber id) {
  SqlScope scope(
      statement("SELECT " ITEM_COLUMNS " FROM items WHERE kind = 1 AND id > ? ORDER BY id LIMIT 1"));
  scope->bind(1, id);
  return readOne(scope);
}

std::uint64_t ItemQueries::countFoldersAfter(ItemNumber id) {
  SqlScope scope(statement("SELECT count(*) FROM items WHERE kind = 1 AND id > ?"));
  scope->bind(1, id);
  return scope->step() ? scope->number(0) : 0;
}

std::vector<ItemRecord> ItemQueries::changedAfter(std::uint64_t rank, std::uint64_t limit) {
  SqlScope scope(statement("SELECT " ITEM_COLUMNS " FROM items WHERE rank > ? ORDER BY rank LIMIT ?"));
  scope->bind(1, rank).bind(2, limit);
  return readAll(scope);
}

std::vector<Tombstone> ItemQueries::deadAfter(std::uint64_t rank, std::uint64_t limit) {
  SqlScope scope(statement("SELECT rank, id, kind FROM tombstones WHERE rank > ? ORDER BY rank LIMIT ?"));
  scope->bind(1, rank).bind(2, limit);
  std::vector<Tombstone> dead;
  while (scope->step())
    dead.push_back(
        {scope->number(0), scope->number(1), static_cast<NSFileProviderItemKind>(scope->integer(2))});
  return dead;
}

std::vector<std::string> ItemQueries::namesTo(const ItemRecord &item) {
  std::vector<std::string> names{item.name};
  ItemNumber parent = item.parent;
  while (parent != kReplicaFolder) {
    const auto folder = parent == kLimboFolder ? std::nullopt : byID(parent);
    if (!folder) return {};
    names.push_back(folder->name);
    parent = folder->parent;
  }
  std::reverse(names.begin(), names.end());
  return names;
}

std::string ItemQueries::pathBelowReplica(const ItemRecord &item) {
  std::string path;
  for (const std::string &name : namesTo(item)) path += path.empty() ? name : "/" + name;
  return path;
}

std::optional<ItemRecord> ItemQueries::byPathBelowReplica(std::string_view path) {
  ItemNumber parent = kReplicaFolder;
  std::optional<ItemRecord> found;
  while (!path.empty()) {
    const std::size_t slash = path.find('/');
    found = byName(parent, path.substr(0, slash));
    if (!found) return std::nullopt;
    parent = found->id;
    path = slash == std::string_view::npos ? std::string_view() : path.substr(slash + 1);
  }
  return found;
}

std::uint64_t ItemQueries::metaNumber(const std::string &key) {
  SqlScope scope(statement("SELECT value FROM meta WHERE key = ?"));
  scope->bindText(1, key);
  return scope->step() ? scope->number(0) : 0;
}

std::string ItemQueries::metaText(const std::string &key) {
  SqlScope scope(statement("SELECT value FROM meta WHERE key = ?"));
  scope->bindText(1, key);
  return scope->step() ? std::string(scope->bytes(0)) : std::string();
}

std::optional<ItemRecord> RecordOf(ItemQueries &queries, const QVFileObjectID &fileObjectID) {
  auto record = queries.byID(fileObjectID.number());
  if (!record || record->parent == kLimboFolder ||
      FileObjectID(record->id, record->facts.kind) != fileObjectID)
    return std::nullopt;
  return record;
}

}  // namespace droxa::keld
