#pragma once

#include <memory>
#include <string>
#include <unordered_map>

#include "keld/ContainerList.h"
#include "keld/ItemQueries.h"
#include "keld/ItemRecord.h"
#include "tessaly/QVQueryItem.h"

namespace droxa::keld {

// Makes what clients see of a row. What a folder's contents inherit is found out once a folder, so make one
// for each read. Thread contract: one thread at a time, as the queries.
class ItemPresenter {
 public:
  ItemPresenter(std::shared_ptr<const Containers> containers, ItemQueries &queries)
      : containers_(std::move(containers)), queries_(queries) {}

  std::shared_ptr<const QVQueryItem> item(const ItemRecord &record) const;
  static std::shared_ptr<const QVQueryItem> deadItem(ItemNumber id, NSFileProviderItemKind kind);

  // The name under which it is listed: a container's documents folder bears the container's.
  const std::string &shownName(const ItemRecord &record) const;
  const Containers &containers() const { return *containers_; }

 private:
  std::string parentIdentifier(const ItemRecord &record) const;
  // Whether the folder, or one that it is below, is the root of a share.
  bool isInShared(ItemNumber folder) const;
  const std::shared_ptr<const Containers> containers_;
  ItemQueries &queries_;
  mutable std::unordered_map<ItemNumber, bool> shared_;  // the folders looked at so far
};

}  // namespace droxa::keld
