#pragma once

#include <cstdint>
#include <string>

#include "keld/ItemRecord.h"
#include "keld/Sql.h"

namespace droxa::keld {

// Numbers that the daemon keeps across restarts; in memory they lead, each commit writes them down.
struct Counters {
  ItemNumber nextID = 1;
  std::uint64_t rank = 0;
  std::uint64_t tombstoneFloor = 0;  // deaths up to this rank are forgotten
  std::uint64_t documents = 0, folders = 0, aliases = 0;
  bool operator==(const Counters &) const = default;
};

// The changes that are made to the item table, on the one writing connection. Each gives the item the next
// rank where it says so. Thread contract: the keeper's thread, inside a transaction. All throw SqlError.
class ItemEdits {
 public:
  explicit ItemEdits(SqlDatabase &database);

  // Takes the number in `record.id`, or the next one when it is 0; the record's rank becomes the next.
  void insert(ItemRecord &record);
  // Facts, flags and name as in `record`, with the next rank.
  void update(ItemRecord &record);
  // The same without a new rank: nothing that a client sees has changed.
  void updateSilently(const ItemRecord &record);
  void rename(ItemRecord &record, ItemNumber newParent, const std::string &newName);  // keeps the rank
  void remove(const ItemRecord &record, bool leavesTombstone);
  // Removes an item from the feed without removing it from the table: it is no client's business any more.
  void leaveTombstone(const ItemRecord &record);
  // With the next rank.
  void setFlags(ItemRecord &record, std::uint32_t flags);

  void setMeta(const std::string &key, std::uint64_t value);
  void setMetaText(const std::string &key, const std::string &value);

  // Forgets the oldest deaths when there are more than `most`.
  void compactTombstones(std::uint64_t most);

  Counters &counters() { return counters_; }
  void writeCounters();  // what differs from what was written last

 private:
  std::uint64_t nextRank() { return ++counters_.rank; }
  // What is private has no place in the feed, hence no rank.
  std::uint64_t rankFor(const ItemRecord &record) {
    return record.zone() == Zone::privateStorage ? 0 : nextRank();
  }
  void count(const ItemRecord &record, std::int64_t by);

  SqlDatabase &database_;
  Counters counters_, written_;
  std::uint64_t tombstones_ = 0;
  SqlStatement insert_, update_, rename_, remove_, tombstone_, untombstone_, meta_;
};

}  // namespace droxa::keld
