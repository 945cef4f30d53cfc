#include "keld/FolderOpener.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/sysmacros.h>
#include <system_error>
#include <vector>

namespace droxa::keld {

namespace {
constexpr std::size_t kMostKept = 64;
}  // namespace

FolderOpener::FolderOpener(std::string replicaPath, ItemQueries &queries)
    : replicaPath_(std::move(replicaPath)), queries_(queries) {
  OwnedDescriptor replica(::open(replicaPath_.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC));
  struct stat status;
  if (!replica || ::fstat(replica.get(), &status) != 0)
    throw std::system_error(errno, std::generic_category(), replicaPath_);
  device_ = makedev(major(status.st_dev), minor(status.st_dev));
  replica_ = std::make_shared<const OwnedDescriptor>(std::move(replica));
}

std::shared_ptr<const OwnedDescriptor> FolderOpener::open(ItemNumber folder, int *error) {
  *error = 0;
  std::vector<ItemRecord> down;  // the folders between the nearest open one and the asked one
  std::shared_ptr<const OwnedDescriptor> at;
  for (ItemNumber number = folder; !at;) {
    if (number == kReplicaFolder) {
      at = replica_;
    } else if (!(at = kept(number))) {
      auto record = queries_.byID(number);
      if (!record || !record->isFolder() || record->parent == kLimboFolder) {
        *error = ENOENT;
        return nullptr;
      }
      number = record->parent;
      down.push_back(std::move(*record));
    }
  }
  for (auto record = down.rbegin(); record != down.rend(); ++record) {
    auto next = openChild(at, record->name, error);
    if (!next) return nullptr;
    const auto facts = ReadFolderFacts(next->get(), device_);
    if (!facts || !facts->isSameFile(record->facts)) {
      *error = ESTALE;
      return nullptr;
    }
    keep(record->id, next);
    at = std::move(next);
  }
  return at;
}

std::shared_ptr<const OwnedDescriptor> FolderOpener::openChild(
    const std::shared_ptr<const OwnedDescriptor> &folder, const std::string &name, int *error) {
  OwnedDescriptor child = OpenFolder(folder->get(), name);
  *error = child ? 0 : errno;
  if (!child) return nullptr;
  return std::make_shared<const OwnedDescriptor>(std::move(child));
}

std::shared_ptr<const OwnedDescriptor> FolderOpener::kept(ItemNumber folder) {
  const auto found = byFolder_.find(folder);
  if (found == byFolder_.end()) return nullptr;
  order_.splice(order_.begin(), order_, found->second);
  return found->second->descriptor;
}

void FolderOpener::keep(ItemNumber folder, std::shared_ptr<const OwnedDescriptor> descriptor) {
  order_.push_front({folder, std::move(descriptor)});
  byFolder_[folder] = order_.begin();
  if (order_.size() <= kMostKept) return;
  byFolder_.erase(order_.back().folder);
  order_.pop_back();
}

void FolderOpener::forget(ItemNumber folder) {
  const auto found = byFolder_.find(folder);
  if (found == byFolder_.end()) return;
  order_.erase(found->second);
  byFolder_.erase(found);
}

void FolderOpener::forgetAll() {
  order_.clear();
  byFolder_.clear();
}

}  // namespace droxa::keld
