#pragma once

#include <cstdint>
#include <list>
#include <memory>
#include <string>
#include <unordered_map>

#include "keld/FolderReading.h"
#include "keld/ItemQueries.h"

namespace droxa::keld {

// Opens the replica's folders by their numbers, name by name from the replica down, so that neither a link
// nor the length of a path matters. Keeps the last used ones open. Thread contract: the keeper's thread.
class FolderOpener {
 public:
  // Throws std::system_error when the replica's folder can't be opened.
  FolderOpener(std::string replicaPath, ItemQueries &queries);

  // The folder, open as a path alone, or null with `error` set to an errno: ENOENT or ESTALE when it isn't
  // (or is no longer) where the item table says.
  std::shared_ptr<const OwnedDescriptor> open(ItemNumber folder, int *error);
  // The same with `name` in it, which needn't be in the item table.
  std::shared_ptr<const OwnedDescriptor> openChild(const std::shared_ptr<const OwnedDescriptor> &folder,
                                                   const std::string &name, int *error);
  void forget(ItemNumber folder);
  void forgetAll();

  const std::string &replicaPath() const { return replicaPath_; }
  std::uint64_t replicaDevice() const { return device_; }

 private:
  struct Kept {
    ItemNumber folder;
    std::shared_ptr<const OwnedDescriptor> descriptor;
  };
  void keep(ItemNumber folder, std::shared_ptr<const OwnedDescriptor> descriptor);
  std::shared_ptr<const OwnedDescriptor> kept(ItemNumber folder);

  const std::string replicaPath_;
  ItemQueries &queries_;
  std::shared_ptr<const OwnedDescriptor> replica_;
  std::uint64_t device_ = 0;
  std::list<Kept> order_;  // the last used first
  std::unordered_map<ItemNumber, std::list<Kept>::iterator> byFolder_;
};

}  // namespace droxa::keld
