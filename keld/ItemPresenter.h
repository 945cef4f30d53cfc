#pragma once

#include <memory>

#include "keld/ContainerList.h"
#include "keld/ItemRecord.h"
#include "tessaly/QVQueryItem.h"

namespace droxa::keld {

// Makes what clients see of a row.
// Thread contract: immutable.
class ItemPresenter {
 public:
  explicit ItemPresenter(std::shared_ptr<const Containers> containers) : containers_(std::move(containers)) {}

  std::shared_ptr<const QVQueryItem> item(const ItemRecord &record) const;
  static std::shared_ptr<const QVQueryItem> deadItem(ItemNumber id, NSFileProviderItemKind kind);

  // The name under which it is listed: a container's documents folder bears the container's.
  const std::string &shownName(const ItemRecord &record) const;
  const Containers &containers() const { return *containers_; }

 private:
  std::string parentIdentifier(const ItemRecord &record) const;
  const std::shared_ptr<const Containers> containers_;
};

}  // namespace droxa::keld
