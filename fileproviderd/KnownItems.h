#pragma once

#include <memory>
#include <optional>
#include <string>
#include <unordered_map>
#include <vector>

#include "fileproviderd/ItemBudget.h"
#include "platform/fileprovider/NSFileProviderRemote.h"

namespace droxa {

// What the host knows of one container's children: the base that changes are told against.
// Thread contract: none of its own; belongs to one follower's queue.
class KnownItems {
 public:
  using Item = std::shared_ptr<const NSFileProviderItem>;

  explicit KnownItems(std::shared_ptr<ItemBudget> budget) : budget_(std::move(budget)) {}
  ~KnownItems() { clear(); }
  KnownItems(const KnownItems &) = delete;
  KnownItems &operator=(const KnownItems &) = delete;

  // Keeps `item`, unless a newer state of it is known. False when there is no room for it: nothing is changed
  // then.
  bool put(const Item &item);
  void remove(const std::string &identifier);
  void clear();
  void swap(KnownItems &other) { items_.swap(other.items_); }
  Item find(const std::string &identifier) const;
  std::size_t size() const { return items_.size(); }
  // What leads from these items to `now`, removals first: a name may have gone over to another item.
  std::vector<FPDChange> changesTo(const KnownItems &now) const;

 private:
  std::shared_ptr<ItemBudget> budget_;
  std::unordered_map<std::string, Item> items_;
};

// The change of one item from `before` (null: not known) to `now`; nullopt when they are the same.
// `added` says what an item that wasn't known is: new, or one that is only not kept.
std::optional<FPDChange> changeOfItem(const KnownItems::Item &before, const NSFileProviderItem &now,
                                      bool added);
FPDChange removalOfItem(const std::string &identifier, const KnownItems::Item &before);
FPDChange relistedChange(const std::string &containerIdentifier);

}  // namespace droxa
