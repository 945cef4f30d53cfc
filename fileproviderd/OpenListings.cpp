#include "fileproviderd/OpenListings.h"

#include <vector>

namespace droxa {

void OpenListings::add(const std::string &identifier, const std::shared_ptr<RelayedEnumerator> &enumerator) {
  Lock held(lock_);
  std::erase_if(enumerators_, [](const auto &entry) { return entry.second.expired(); });
  enumerators_.emplace(identifier, enumerator);
}

void OpenListings::signal(const std::string &identifier) {
  std::vector<std::shared_ptr<RelayedEnumerator>> told;
  {
    Lock held(lock_);
    const auto [first, last] = enumerators_.equal_range(identifier);
    for (auto entry = first; entry != last; ++entry)
      if (auto enumerator = entry->second.lock()) told.push_back(std::move(enumerator));
  }
  for (const auto &enumerator : told) enumerator->containerWasSignalled();
}

void OpenListings::signalAll() {
  std::vector<std::shared_ptr<RelayedEnumerator>> told;
  {
    Lock held(lock_);
    for (const auto &[identifier, weak] : enumerators_)
      if (auto enumerator = weak.lock()) told.push_back(std::move(enumerator));
  }
  for (const auto &enumerator : told) enumerator->containerWasSignalled();
}

}  // namespace droxa
