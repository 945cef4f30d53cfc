#include "fileproviderd/mount/FolderDescriptors.h"

namespace droxa {

SharedDescriptor FolderDescriptors::find(NodeId node) {
  const Lock held(lock_);
  const auto found = byNode_.find(node);
  if (found == byNode_.end()) return nullptr;
  entries_.splice(entries_.begin(), entries_, found->second);
  return found->second->second;
}

SharedDescriptor FolderDescriptors::keep(NodeId node, Descriptor folder) {
  auto shared = std::make_shared<const Descriptor>(std::move(folder));
  const Lock held(lock_);
  if (const auto found = byNode_.find(node); found != byNode_.end()) {
    found->second->second = shared;
    return shared;
  }
  entries_.emplace_front(node, shared);
  byNode_[node] = entries_.begin();
  if (entries_.size() > most_) {
    byNode_.erase(entries_.back().first);
    entries_.pop_back();
  }
  return shared;
}

void FolderDescriptors::drop(NodeId node) {
  const Lock held(lock_);
  const auto found = byNode_.find(node);
  if (found == byNode_.end()) return;
  entries_.erase(found->second);
  byNode_.erase(found);
}

}  // namespace droxa
