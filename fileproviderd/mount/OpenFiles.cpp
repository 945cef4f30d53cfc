#include "fileproviderd/mount/OpenFiles.h"

namespace droxa {

void OpenFiles::add(const OpenFilePointer &file) {
  const Lock held(lock_);
  files_.emplace(file->node, file);
}

void OpenFiles::remove(const OpenFilePointer &file) {
  const Lock held(lock_);
  const auto [first, last] = files_.equal_range(file->node);
  for (auto one = first; one != last; ++one) {
    if (one->second != file) continue;
    files_.erase(one);
    return;
  }
}

SharedDescriptor OpenFiles::anyOf(NodeId node) const {
  const Lock held(lock_);
  const auto found = files_.find(node);
  return found == files_.end() ? nullptr : found->second->file();
}

std::size_t OpenFiles::size() const {
  const Lock held(lock_);
  return files_.size();
}

}  // namespace droxa
