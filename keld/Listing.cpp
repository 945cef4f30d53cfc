#include "keld/Listing.h"

#include <algorithm>
#include <tuple>

namespace droxa::keld {

Listing::Listing(ItemQueries &queries, const ItemPresenter &presenter, ListingRequest request)
    : queries_(queries), presenter_(presenter), request_(request) {
  const Containers &containers = presenter_.containers();
  if (!request_.allFolders && request_.folder != containers.root()) return;
  for (const ContainerEntry &entry : containers.entries()) {
    if (!containers.isListedInRoot(entry)) continue;
    if (auto record = queries_.byID(entry.documents)) containers_.push_back(std::move(*record));
  }
  std::sort(containers_.begin(), containers_.end(),
            [this](const ItemRecord &a, const ItemRecord &b) { return isBefore(keyOf(a), keyOf(b)); });
}

ListingKey Listing::keyOf(const ItemRecord &record) const {
  ListingKey key;
  key.atStart = false;
  if (request_.byDate) key.age = -record.facts.modified;
  key.name = presenter_.shownName(record);
  if (request_.allFolders) key.id = record.id;
  return key;
}

bool Listing::isBefore(const ListingKey &a, const ListingKey &b) const {
  if (a.atStart != b.atStart) return a.atStart;
  return std::tie(a.age, a.name, a.id) < std::tie(b.age, b.name, b.id);
}

std::vector<ItemRecord> Listing::fetch(const ListingKey &after, std::uint64_t limit) {
  if (request_.allFolders)
    return request_.byDate ? queries_.foldersByDate(after, limit) : queries_.foldersByName(after, limit);
  return request_.byDate ? queries_.childrenByDate(request_.folder, after, limit)
                         : queries_.childrenByName(request_.folder, after, limit);
}

// All folders: the containers' own come from their list, under the names that they are shown with.
bool Listing::isListed(const ItemRecord &record) const {
  if (!request_.allFolders) return true;
  return record.zone() == Zone::shown || record.zone() == Zone::trashed;
}

ListingPage Listing::page(const ListingKey &after, std::uint64_t limit) {
  ListingPage page;
  page.last = after;
  auto container = std::find_if(containers_.begin(), containers_.end(),
                                [&](const ItemRecord &record) { return isBefore(after, keyOf(record)); });
  const std::uint64_t wanted = limit + 1;  // one more tells whether there is a next page
  ListingKey position = after;
  bool ended = false;
  std::vector<ItemRecord> records;
  while (records.size() < wanted && !ended) {
    const std::uint64_t batch = wanted - records.size();
    std::vector<ItemRecord> fetched = fetch(position, batch);
    ended = fetched.size() < batch;
    for (ItemRecord &record : fetched) {
      ListingKey key = keyOf(record);
      if (request_.allFolders) key.name = record.name;  // as the index has it
      position = key;
      if (!isListed(record)) continue;
      while (container != containers_.end() && isBefore(keyOf(*container), key))
        records.push_back(*container++);
      records.push_back(std::move(record));
    }
  }
  while (ended && container != containers_.end()) records.push_back(*container++);
  page.more = records.size() > limit;
  if (page.more) records.resize(static_cast<std::size_t>(limit));
  page.records = std::move(records);
  if (!page.records.empty()) page.last = keyOf(page.records.back());
  return page;
}

ListingKey Listing::keyAtOffset(std::uint64_t offset) {
  ListingKey key;
  while (offset > 0) {
    const ListingPage skipped = page(key, std::min<std::uint64_t>(offset, 1000));
    if (skipped.records.empty()) break;
    key = skipped.last;
    offset -= skipped.records.size();
    if (!skipped.more) break;
  }
  return key;
}

std::optional<ListingKey> ListingCursors::find(const ListingRequest &request, std::uint64_t offset) {
  if (offset == 0) return ListingKey();
  const Lock lock(mutex_);
  const auto found = byPlace_.find({request, offset});
  if (found == byPlace_.end()) return std::nullopt;
  order_.splice(order_.begin(), order_, found->second);
  return found->second->key;
}

void ListingCursors::remember(const ListingRequest &request, std::uint64_t offset, ListingKey key) {
  const Lock lock(mutex_);
  const Place place{request, offset};
  if (const auto found = byPlace_.find(place); found != byPlace_.end()) {
    found->second->key = std::move(key);
    order_.splice(order_.begin(), order_, found->second);
    return;
  }
  order_.push_front({place, std::move(key)});
  byPlace_[place] = order_.begin();
  if (order_.size() <= most_) return;
  byPlace_.erase(order_.back().place);
  order_.pop_back();
}

std::size_t ListingCursors::size() const {
  const Lock lock(mutex_);
  return order_.size();
}

}  // namespace droxa::keld
