#include "fileproviderd/KnownItems.h"

namespace droxa {

bool KnownItems::put(const Item &item) {
  const auto found = items_.find(item->itemIdentifier());
  if (found != items_.end()) {
    if (item->fields().changeRank >= found->second->fields().changeRank) found->second = item;
    return true;
  }
  if (!budget_->take()) return false;
  items_.emplace(item->itemIdentifier(), item);
  return true;
}

void KnownItems::remove(const std::string &identifier) {
  budget_->giveBack(items_.erase(identifier));
}

void KnownItems::clear() {
  budget_->giveBack(items_.size());
  items_.clear();
}

KnownItems::Item KnownItems::find(const std::string &identifier) const {
  const auto found = items_.find(identifier);
  return found == items_.end() ? nullptr : found->second;
}

std::vector<FPDChange> KnownItems::changesTo(const KnownItems &now) const {
  std::vector<FPDChange> changes;
  for (const auto &[identifier, item] : items_)
    if (!now.items_.contains(identifier)) changes.push_back(removalOfItem(identifier, item));
  for (const auto &[identifier, item] : now.items_)
    if (auto change = changeOfItem(find(identifier), *item, true)) changes.push_back(std::move(*change));
  return changes;
}

std::optional<FPDChange> changeOfItem(const KnownItems::Item &before, const NSFileProviderItem &now,
                                      bool added) {
  FPDChange change;
  change.identifier = now.itemIdentifier();
  change.item = now.fields();
  if (!before) {
    change.kind = added ? FPDChange::Kind::added : FPDChange::Kind::changed;
  } else if (before->fields() == now.fields()) {
    return std::nullopt;
  } else if (before->fields().filename != now.fields().filename) {
    change.kind = FPDChange::Kind::renamed;
    change.oldName = before->fields().filename;
  }
  return change;
}

FPDChange removalOfItem(const std::string &identifier, const KnownItems::Item &before) {
  FPDChange change;
  change.kind = FPDChange::Kind::removed;
  change.identifier = identifier;
  if (before) change.oldName = before->fields().filename;
  return change;
}

FPDChange relistedChange(const std::string &containerIdentifier) {
  FPDChange change;
  change.kind = FPDChange::Kind::relisted;
  change.identifier = containerIdentifier;
  return change;
}

}  // namespace droxa
