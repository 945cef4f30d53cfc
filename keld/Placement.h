#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "keld/ItemQueries.h"
#include "keld/ItemRecord.h"

namespace droxa::keld {

// Whether a folder of the replica with this name is a container: a reverse-DNS name.
bool IsContainerName(std::string_view name);

// Works out what an item inherits from where it is: its zone, whether it is kept local, and whether another
// shares it. Remembers the last folder, because what is asked about comes folder by folder. Thread contract:
// the keeper's thread.
class Placement {
 public:
  explicit Placement(ItemQueries &queries) : queries_(queries) {}

  // The flags of something called `name` in `parent`; nullopt when it is nothing that is tracked there.
  std::optional<std::uint32_t> flags(ItemNumber parent, std::string_view name, NSFileProviderItemKind kind);
  void forget() { known_ = false; }  // after a folder was moved or removed

 private:
  void load(ItemNumber parent);

  ItemQueries &queries_;
  bool known_ = false;
  ItemNumber parent_ = 0;
  std::optional<ItemRecord> record_;
  bool isContainer_ = false;       // the parent is a container's folder
  bool isTrashDocuments_ = false;  // the parent is the trash's documents folder
};

}  // namespace droxa::keld
