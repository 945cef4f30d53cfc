#include "fileproviderd/mount/BusyNames.h"

namespace droxa {

BusyNames::Guard::Guard(BusyNames &busy, std::vector<Name> names) : busy_(busy), names_(std::move(names)) {
  const Lock held(busy_.lock_);
  for (const Name &name : names_) busy_.names_.insert(name);
}

BusyNames::Guard::~Guard() {
  const Lock held(busy_.lock_);
  for (const Name &name : names_) busy_.names_.erase(busy_.names_.find(name));
}

bool BusyNames::contains(NodeId folder, const std::string &name) const {
  const Lock held(lock_);
  return names_.contains({folder, name});
}

}  // namespace droxa
