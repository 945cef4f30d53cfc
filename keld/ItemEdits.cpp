#include "keld/ItemEdits.h"

namespace droxa::keld {

namespace {

std::uint64_t metaNumber(SqlDatabase &database, const char *key) {
  return static_cast<std::uint64_t>(
      database.integer("SELECT value FROM meta WHERE key = '" + std::string(key) + "'"));
}

// In three parameters from `first` on. NULL, which takes no room, stands for what isn't there.
void bindMetadata(SqlStatement &statement, int first, const ItemMetadata &metadata) {
  if (metadata.tags.empty())
    statement.bindNull(first);
  else
    statement.bindBlob(first, QVEncodeTagNames(metadata.tags));
  if (metadata.lastUsed == 0)
    statement.bindNull(first + 1);
  else
    statement.bind(first + 1, metadata.lastUsed);
  if (metadata.favoriteRank == 0)
    statement.bindNull(first + 2);
  else
    statement.bind(first + 2, metadata.favoriteRank);
}

}  // namespace

ItemEdits::ItemEdits(SqlDatabase &database)
    : database_(database),
      insert_(database.handle(),
              "INSERT INTO items(parent, name, id, kind, flags, rank, age, size, mode, inode, device, birth, "
              "changed, tags, used, favorite)"
              " VALUES (?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?, ?)"),
      update_(database.handle(),
              "UPDATE items SET kind = ?, flags = ?, rank = ?, age = ?, size = ?, mode = ?, inode = ?, "
              "device = ?,"
              " birth = ?, changed = ?, tags = ?, used = ?, favorite = ? WHERE parent = ? AND name = ?"),
      rename_(database.handle(), "UPDATE items SET parent = ?, name = ? WHERE parent = ? AND name = ?"),
      remove_(database.handle(), "DELETE FROM items WHERE parent = ? AND name = ?"),
      tombstone_(database.handle(), "INSERT INTO tombstones(rank, id, kind) VALUES (?, ?, ?)"),
      untombstone_(database.handle(), "DELETE FROM tombstones WHERE id = ?"),
      meta_(database.handle(),
            "INSERT INTO meta VALUES (?, ?) ON CONFLICT(key) DO UPDATE SET value = excluded.value") {
  counters_.nextID = metaNumber(database, "nextID");
  counters_.rank = metaNumber(database, "rank");
  counters_.tombstoneFloor = metaNumber(database, "tombstoneFloor");
  counters_.documents = metaNumber(database, "documents");
  counters_.folders = metaNumber(database, "folders");
  counters_.aliases = metaNumber(database, "aliases");
  written_ = counters_;
  tombstones_ = static_cast<std::uint64_t>(database.integer("SELECT count(*) FROM tombstones"));
}

// What stands in the structure is no item of its own, and is counted by nobody.
void ItemEdits::count(const ItemRecord &record, std::int64_t by) {
  if (record.zone() == Zone::structure) return;
  std::uint64_t &counter = record.facts.kind == NSFileProviderItemKind::folder  ? counters_.folders
                           : record.facts.kind == NSFileProviderItemKind::alias ? counters_.aliases
                                                                                : counters_.documents;
  counter = static_cast<std::uint64_t>(static_cast<std::int64_t>(counter) + by);
}

void ItemEdits::insert(ItemRecord &record) {
  const bool isRevived = record.id != 0;
  if (!isRevived) record.id = counters_.nextID++;
  record.rank = rankFor(record);
  const FileFacts &facts = record.facts;
  insert_.bind(1, record.parent).bindBlob(2, record.name).bind(3, record.id);
  insert_.bind(4, static_cast<std::int64_t>(facts.kind)).bind(5, static_cast<std::int64_t>(record.flags));
  insert_.bind(6, record.rank).bind(7, -facts.modified).bind(8, facts.size);
  insert_.bind(9, static_cast<std::int64_t>(facts.mode)).bind(10, facts.inode).bind(11, facts.device);
  insert_.bind(12, facts.birth).bind(13, facts.changed);
  bindMetadata(insert_, 14, record.metadata);
  insert_.run();
  if (isRevived) untombstone_.bind(1, record.id).run();
  count(record, 1);
}

void ItemEdits::updateSilently(const ItemRecord &record) {
  const FileFacts &facts = record.facts;
  update_.bind(1, static_cast<std::int64_t>(facts.kind)).bind(2, static_cast<std::int64_t>(record.flags));
  update_.bind(3, record.rank).bind(4, -facts.modified).bind(5, facts.size);
  update_.bind(6, static_cast<std::int64_t>(facts.mode)).bind(7, facts.inode).bind(8, facts.device);
  update_.bind(9, facts.birth).bind(10, facts.changed);
  bindMetadata(update_, 11, record.metadata);
  update_.bind(14, record.parent).bindBlob(15, record.name);
  update_.run();
}

void ItemEdits::update(ItemRecord &record) {
  record.rank = rankFor(record);
  updateSilently(record);
}

void ItemEdits::setFlags(ItemRecord &record, std::uint32_t flags) {
  count(record, -1);
  record.flags = flags;
  count(record, 1);
  update(record);
}

void ItemEdits::rename(ItemRecord &record, ItemNumber newParent, const std::string &newName) {
  rename_.bind(1, newParent).bindBlob(2, newName).bind(3, record.parent).bindBlob(4, record.name);
  rename_.run();
  record.parent = newParent;
  record.name = newName;
}

void ItemEdits::remove(const ItemRecord &record, bool leavesTombstone) {
  remove_.bind(1, record.parent).bindBlob(2, record.name).run();
  if (leavesTombstone) leaveTombstone(record);
  count(record, -1);
}

void ItemEdits::leaveTombstone(const ItemRecord &record) {
  untombstone_.bind(1, record.id).run();
  tombstone_.bind(1, nextRank())
      .bind(2, record.id)
      .bind(3, static_cast<std::int64_t>(record.facts.kind))
      .run();
  ++tombstones_;
}

void ItemEdits::setMeta(const std::string &key, std::uint64_t value) {
  meta_.bindText(1, key).bind(2, value).run();
}

void ItemEdits::setMetaText(const std::string &key, const std::string &value) {
  meta_.bindText(1, key).bindText(2, value).run();
}

void ItemEdits::compactTombstones(std::uint64_t most) {
  if (tombstones_ <= most) return;
  const std::uint64_t surplus =
      tombstones_ - most + most / 4;  // some room, so that it isn't done at each commit
  SqlStatement last(database_.handle(), "SELECT rank FROM tombstones ORDER BY rank LIMIT 1 OFFSET ?");
  last.bind(1, surplus > 0 ? surplus - 1 : 0);
  if (last.step()) {
    counters_.tombstoneFloor = last.number(0);
    last.reset();
    SqlStatement(database_.handle(), "DELETE FROM tombstones WHERE rank <= ?")
        .bind(1, counters_.tombstoneFloor)
        .run();
  }
  tombstones_ = static_cast<std::uint64_t>(database_.integer("SELECT count(*) FROM tombstones"));
}

void ItemEdits::writeCounters() {
  if (counters_ == written_) return;
  setMeta("nextID", counters_.nextID);
  setMeta("rank", counters_.rank);
  setMeta("tombstoneFloor", counters_.tombstoneFloor);
  setMeta("documents", counters_.documents);
  setMeta("folders", counters_.folders);
  setMeta("aliases", counters_.aliases);
  written_ = counters_;
}

}  // namespace droxa::keld
