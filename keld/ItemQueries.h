#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "keld/ItemRecord.h"
#include "keld/Sql.h"

namespace droxa::keld {

// A listing's order, and where in it a page ends: what comes next is greater than this key.
struct ListingKey {
  std::int64_t age = INT64_MIN;  // by date only: the negated date
  std::string name;
  ItemNumber id = 0;  // all folders only, where names repeat
  bool atStart = true;
  bool operator==(const ListingKey &) const = default;
};

struct Tombstone {
  std::uint64_t rank = 0;
  ItemNumber id = 0;
  NSFileProviderItemKind kind = NSFileProviderItemKind::document;
};

// The questions that are asked of the item table, on one connection. Statements are prepared on first use.
// Thread contract: one thread at a time, as the connection. All throw SqlError.
class ItemQueries {
 public:
  explicit ItemQueries(SqlDatabase &database) : database_(database) {}

  std::optional<ItemRecord> byID(ItemNumber id);
  std::optional<ItemRecord> byName(ItemNumber parent, std::string_view name);
  std::vector<ItemRecord> byInode(std::uint64_t inode);
  std::optional<ItemNumber> folderByInode(std::uint64_t inode);

  // The folder's children after `key`, in order, at most `limit`.
  std::vector<ItemRecord> childrenByName(ItemNumber parent, const ListingKey &key, std::uint64_t limit);
  std::vector<ItemRecord> childrenByDate(ItemNumber parent, const ListingKey &key, std::uint64_t limit);
  std::vector<ItemRecord> foldersByName(const ListingKey &key, std::uint64_t limit);
  std::vector<ItemRecord> foldersByDate(const ListingKey &key, std::uint64_t limit);
  bool hasChildren(ItemNumber parent);

  std::optional<ItemRecord> firstFolderAfter(ItemNumber id);
  std::uint64_t countFoldersAfter(ItemNumber id);

  std::vector<ItemRecord> changedAfter(std::uint64_t rank, std::uint64_t limit);
  std::vector<Tombstone> deadAfter(std::uint64_t rank, std::uint64_t limit);

  // The names from the replica down to the item, the container's first; empty when the item or a folder above
  // it is gone.
  std::vector<std::string> namesTo(const ItemRecord &item);
  std::string pathBelowReplica(const ItemRecord &item);  // joined by '/'; "" likewise
  std::optional<ItemRecord> byPathBelowReplica(std::string_view path);

  std::uint64_t metaNumber(const std::string &key);
  std::string metaText(const std::string &key);  // "" when there is none

  SqlDatabase &database() { return database_; }

 private:
  SqlStatement &statement(const char *sql);

  SqlDatabase &database_;
  std::map<const char *, std::unique_ptr<SqlStatement>> statements_;  // by the literal's address
};

// The item of that number, if it is of that kind too, and its file isn't missing.
std::optional<ItemRecord> RecordOf(ItemQueries &queries, const QVFileObjectID &fileObjectID);

// Reads the columns that every query of items selects, in their order.
ItemRecord ReadItemRecord(const SqlStatement &row);

}  // namespace droxa::keld
