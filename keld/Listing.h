#pragma once

#include <cstdint>
#include <list>
#include <map>
#include <optional>
#include <vector>

#include "keld/ItemPresenter.h"
#include "keld/ItemQueries.h"
#include "platform/foundation/ThreadSafety.h"

namespace droxa::keld {

// What is listed, and how.
struct ListingRequest {
  bool allFolders = false;
  ItemNumber folder = 0;  // unless all folders
  bool byDate = false;
  auto operator<=>(const ListingRequest &) const = default;
};

struct ListingPage {
  std::vector<ItemRecord> records;
  ListingKey last;  // where the next page begins
  bool more = false;
};

// Reads pages of a listing by key: what the table has, merged with the containers' folders that the root
// shows beside its own entries. Thread contract: one thread at a time, inside one read transaction. Throws
// SqlError.
class Listing {
 public:
  Listing(ItemQueries &queries, const ItemPresenter &presenter, ListingRequest request);

  ListingPage page(const ListingKey &after, std::uint64_t limit);
  // The key of the `offset`th entry, by counting.
  ListingKey keyAtOffset(std::uint64_t offset);

 private:
  std::vector<ItemRecord> fetch(const ListingKey &after, std::uint64_t limit);
  bool isListed(const ItemRecord &record) const;
  ListingKey keyOf(const ItemRecord &record) const;
  bool isBefore(const ListingKey &a, const ListingKey &b) const;

  ItemQueries &queries_;
  const ItemPresenter &presenter_;
  const ListingRequest request_;
  std::vector<ItemRecord> containers_;  // the folders that are merged in, in order
};

// Remembers where pages ended, so that an offset leads to a key. The least recently used are forgotten.
// Thread contract: any thread.
class ListingCursors {
 public:
  explicit ListingCursors(std::size_t most = 4096) : most_(most) {}
  std::optional<ListingKey> find(const ListingRequest &request, std::uint64_t offset);
  void remember(const ListingRequest &request, std::uint64_t offset, ListingKey key);
  std::size_t size() const;

 private:
  using Place = std::pair<ListingRequest, std::uint64_t>;
  struct Cursor {
    Place place;
    ListingKey key;
  };
  const std::size_t most_;
  mutable Mutex mutex_;
  std::list<Cursor> order_ GUARDED_BY(mutex_);  // the last used first
  std::map<Place, std::list<Cursor>::iterator> byPlace_ GUARDED_BY(mutex_);
};

}  // namespace droxa::keld
